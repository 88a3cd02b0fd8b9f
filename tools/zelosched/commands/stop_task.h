// Stopping what a task has under way, for several sub-commands.
#pragma once

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>

#include "store/task_list.h"

inline constexpr std::chrono::seconds kUsualGrace(10);

// Ends the runs of the task that wait or go on, and tells of each. How many there were. Throws
// Failure.
size_t stopTask(int64_t id, const std::string &title, std::chrono::seconds grace = kUsualGrace);

// "It is running, and goes on" and the like, for a task that was disabled or removed. Nothing when
// nothing of it is under way.
void tellOfRunsOf(const TaskRecord &task, FILE *to = stdout);

// Ends those that wait for their turn: a removed task must not begin to run. Told too.
void cancelWaitingOf(const TaskRecord &task, FILE *to = stdout);
