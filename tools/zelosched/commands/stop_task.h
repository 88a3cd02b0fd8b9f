// Stopping the runs of a task, for several sub-commands.
#pragma once

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>

#include "store/task_list.h"

inline constexpr std::chrono::seconds kUsualGrace(10);

// Ends the runs of the task that wait or are under way, and reports each. Returns how many there
// were. Throws Failure.
size_t stopTask(int64_t id, const std::string &title, std::chrono::seconds grace = kUsualGrace);

// Reports each run of a disabled or removed task that waits or is under way.
void tellOfRunsOf(const TaskRecord &task, FILE *to = stdout);

// Cancels and reports the runs that wait for their turn: a removed task must not start.
void cancelWaitingOf(const TaskRecord &task, FILE *to = stdout);
