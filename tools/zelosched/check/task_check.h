// What would do harm if it were saved.
//
// One field that cron cannot read makes some cron daemons pass over the whole of /etc/crontab, and
// with it every other task; other faults only make the task itself never run.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <ctime>
#include <string>
#include <vector>

// Of a longer command only so many bytes survive being stored.
inline constexpr size_t kMostCommandBytes = 12287;

// A sentence for each fault, which says what is wrong and what to write instead. None: the task is
// fit to be saved.
std::vector<std::string> harmsOf(const ZELO_SCHED_TASK &task);

// Those of harmsOf that stand in a crontab line which cron could not read; a power time has none
// that the platform would not have refused.
std::vector<std::string> unreadableFieldsOf(const ZELO_SCHED_TASK &task);

// A sentence when a task that runs once has no run after `now`, else nothing.
std::string pastSchedule(const ZELO_SCHED_TASK &task, time_t now);

// They run at the same times, whoever runs what.
bool isSameSchedule(const ZELO_SCHED_TASK &a, const ZELO_SCHED_TASK &b);
