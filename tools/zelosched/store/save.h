// Changing the store, under a ChangeLock that is taken before reading. Faults are refused before
// anything is written. Afterwards the tasks are compared with the crontab, since the library
// reports a crontab that it could not rewrite in the log alone.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "store/task_list.h"

// Throws Failure, with a sentence for each fault, for a task that has some.
void requireHarmless(const ZELO_SCHED_TASK &task);

// Each throws Failure. The task's id is the new one afterwards: that of a power time is made of its
// content and changes with it.
void createTask(ZELO_SCHED_TASK *task);
void editTask(ZELO_SCHED_TASK *task);
void removeTask(const ZELO_SCHED_TASK &task);

// createTask without the check of the crontab afterwards, for a caller that prints the id first.
void saveNewTask(ZELO_SCHED_TASK *task);

// The change alone, for callers that check before the first and after the last of several changes.
void storeNew(ZELO_SCHED_TASK *task);
void storeChanged(ZELO_SCHED_TASK *task);
void storeRemoved(const ZELO_SCHED_TASK &task);

// Whether it is an enabled task with a field that cron cannot read. Each change writes the lines of
// all tasks, and for such a line cron may ignore all of them.
bool isUnreadable(const ZELO_SCHED_TASK &task);

// A sentence on such a task; nothing when there is none.
std::string unreadableTask(const TaskList &list);

// Throws Failure when there is such a task, unless the one that is to be changed is one.
void requireReadableTasks(std::optional<int64_t> changedId = std::nullopt);

// Whether the task has a crontab line: it is enabled, and no power time.
bool hasCronLine(const ZELO_SCHED_TASK &task);

// Throws Failure unless the crontab is short enough for cron with so many more lines.
void requireCronRoom(size_t lines);

// How the crontab differs from the tasks; empty when it does not, or when an unreadable task keeps
// it from being written.
std::string crontabFault(const TaskList &list);

// Throws Failure when crontabFault() finds a difference.
void requireCrontabInStep();

// Throws Failure for what the application does not allow by hand, unless the administrator insists.
void requirePermission(const ZELO_SCHED_TASK &task, int32_t flag, const char *what, bool insists);
