// Starting a run of a task now, whatever its times say. Each throws Failure.
#pragma once

#include <zelosched.h>

// A task that is disabled by now is passed over without a word, or not.
enum class Disabled { kRunsToo = 0, kIsSkipped = 1 };  // as ZELOSchedTaskRun takes it

// The run prints to this descriptor, and gets none of ours.
void startRun(const ZELO_SCHED_TASK &task, int output, Disabled disabled = Disabled::kRunsToo);

// What it prints leads nowhere: a run that nobody waits for must not hold the caller's pipe open.
void startRunUnseen(const ZELO_SCHED_TASK &task, Disabled disabled = Disabled::kRunsToo);
