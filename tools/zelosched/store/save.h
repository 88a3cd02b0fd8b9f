// Changing the store. Whoever changes it holds a ChangeLock from reading on. What would do harm is
// refused before anything is written; what was written is compared with the crontab afterwards,
// since the library reports a crontab that it could not rewrite in the log alone.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "store/task_list.h"

// Throws Failure, with every fault in a sentence, for a task that would do harm.
void requireHarmless(const ZELO_SCHED_TASK &task);

// Each throws Failure. The task's id is the new one afterwards: that of a power time is made of its
// content and changes with it.
void createTask(ZELO_SCHED_TASK *task);
void editTask(ZELO_SCHED_TASK *task);
void removeTask(const ZELO_SCHED_TASK &task);

// createTask without the look at the crontab afterwards, for who tells in between that the task is
// saved and which id it has.
void saveNewTask(ZELO_SCHED_TASK *task);

// The steps of these alone, for several changes that are checked before the first of them and after
// the last.
void storeNew(ZELO_SCHED_TASK *task);
void storeChanged(ZELO_SCHED_TASK *task);
void storeRemoved(const ZELO_SCHED_TASK &task);

// An enabled task with a field that cron cannot read. Each change writes the lines of all tasks,
// and for such a one cron may pass over all of them.
bool isUnreadable(const ZELO_SCHED_TASK &task);

// A sentence on such a task; nothing when there is none.
std::string unreadableTask(const TaskList &list);

// There is no such task, or the one that is to be changed is one. Throws Failure.
void requireReadableTasks(std::optional<int64_t> changedId = std::nullopt);

// A task's line, which is added where the stored task had none.
bool hasCronLine(const ZELO_SCHED_TASK &task);

// So many more lines leave the crontab short enough for cron. Throws Failure.
void requireCronRoom(size_t lines);

// In which way the crontab is not in step with the store, where no task is kept out of it; nothing
// when it is.
std::string crontabFault(const TaskList &list);

// It is in step. Throws Failure.
void requireCrontabInStep();

// What the application allows by hand, unless the administrator insists. Throws Failure.
void requirePermission(const ZELO_SCHED_TASK &task, int32_t flag, const char *what, bool insists);
