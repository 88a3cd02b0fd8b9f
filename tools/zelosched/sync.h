// Writing the tasks out again.
#pragma once

// The crontab, and the alarm of the machine's clock, unless a task has a field that cron cannot
// read. Throws Failure.
void synchronise();
