// Tasks whose time passed while the machine was off.
#pragma once

#include <cstdint>
#include <ctime>
#include <vector>

#include "store/task_list.h"

// How long a missed task is told of.
inline constexpr int64_t kMissedRemembered = int64_t{7} * 24 * 60 * 60;  // seconds

struct MissedTask {
  const TaskRecord *task;
  time_t due;  // the latest of its times that passed
};

// Notes that the machine is up. The first call after a boot also notes the enabled tasks that were
// due since the last call before it: right then the tasks are those that the machine went off with,
// and one that is added later has missed nothing. Power times are no tasks that could be made up
// for. As long as the tasks are missing from /tmp it notes nothing at all, so that the first call
// with them finds what they missed. Throws Failure.
void markMachineUp();

// The tasks could not be put back into /tmp, or nobody tried so far.
bool areTasksLost();

// The tasks of the list that were due since that moment while the machine was off, are enabled and
// have that time still, and did not run afterwards; by the time when they were due. Throws Failure.
std::vector<MissedTask> missedTasks(const TaskList &list, time_t since);

// It was made up for. Throws Failure.
void forgetMissed(const TaskRecord &task);
