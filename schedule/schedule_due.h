// Whether a task that cron has started is to run: cron starts one before its start date too, and
// one that runs once in every year.
#ifndef SCHEDULE_DUE_H
#define SCHEDULE_DUE_H

#include <zelosched.h>

// Whether the task may run on that day: the start date, or a later one that the type names.
bool schedIsDueDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &day);

// Whether it is due in that minute.
bool schedIsDue(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &now);

#endif
