// Starting a run of a task now, whatever its times say. Each throws Failure.
#pragma once

#include <zelosched.h>

// A task that is disabled by now is passed over without a word, or not.
enum class Disabled { kRunsToo = 0, kIsSkipped = 1 };  // as ZELOSchedTaskRun takes it

// The run has our standard streams.
void startRun(const ZELO_SCHED_TASK &task, Disabled disabled = Disabled::kRunsToo);

// A run that nobody waits for must not hold the caller's pipe open, nor write to a terminal on
// which somebody is at other work by then. Its standard streams lead nowhere.
void startRunUnseen(const ZELO_SCHED_TASK &task, Disabled disabled = Disabled::kRunsToo);
