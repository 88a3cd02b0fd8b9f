// Filling a task from its hash form; log lines name the source location of the caller.
#ifndef SCHED_HASH_H
#define SCHED_HASH_H

#include <zelocore.h>
#include <zelosched.h>

#include "sched_report.h"

int schedFillTaskFromHash(ZELO_SCHED_TASK *pTask, PSZHASH pHash, SchedSourceLocation location);

#endif
