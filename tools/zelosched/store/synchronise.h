// Writing the tasks out again.
#pragma once

// The crontab, unless a task has a field that cron cannot read; and in any case the alarm of the
// machine's clock. Throws Failure.
void synchronise();
