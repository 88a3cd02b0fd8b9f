// The faults of a task.
//
// One field that cron cannot read makes some cron daemons ignore the whole of /etc/crontab, and
// with it every other task; other faults concern the task itself alone.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <ctime>
#include <string>
#include <vector>

// A longer command is stored cut off to so many bytes.
inline constexpr size_t kMostCommandBytes = 12287;

// A sentence for each fault, which says what is wrong, and mostly what to write instead. None: the
// task is fit to be saved.
std::vector<std::string> harmsOf(const ZELO_SCHED_TASK &task);

// Those of harmsOf that make a crontab line unreadable for cron. None for a power time: the
// platform refuses them.
std::vector<std::string> unreadableFieldsOf(const ZELO_SCHED_TASK &task);

// A sentence when a task that runs once has no run after `now`, else nothing.
std::string pastSchedule(const ZELO_SCHED_TASK &task, time_t now);

// Whether both run at the same times.
bool isSameSchedule(const ZELO_SCHED_TASK &a, const ZELO_SCHED_TASK &b);
