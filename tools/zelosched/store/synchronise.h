// Writing the tasks out again.
#pragma once

// Writes the crontab, unless a task has a field that cron cannot read, and arms the alarm in any
// case. Throws Failure.
void synchronise();
