// Starting a run of a task now, whatever its times say and also when it is disabled. Each throws
// Failure.
#pragma once

#include <zelosched.h>

// The run has our standard streams.
void startRun(const ZELO_SCHED_TASK &task);

// A run that nobody waits for must not hold the caller's pipe open, nor write to a terminal on
// which somebody is at other work by then. Its standard streams lead nowhere.
void startRunUnseen(const ZELO_SCHED_TASK &task);
