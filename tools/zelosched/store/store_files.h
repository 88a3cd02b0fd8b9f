// Where the tasks are kept, and the program that cron starts for them.
#pragma once

#include <sched_shared_names.h>

inline constexpr char kWorkingCopy[] = "/tmp/scheduled_tasks";
inline constexpr const auto &kPersistentCopy = kSchedPersistentStore;
inline constexpr const auto &kLastGoodCopy = kSchedLastGoodStore;

inline constexpr char kTaskProgram[] = "/tmp/zeloschedtask";
