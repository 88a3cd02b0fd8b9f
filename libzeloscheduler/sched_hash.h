// Filling a task from its hash form on behalf of another unit, which the log lines then name.
#ifndef SCHED_HASH_H
#define SCHED_HASH_H

#include <zelocore.h>
#include <zelosched.h>

#include "sched_report.h"

int schedFillTaskFromHash(ZELO_SCHED_TASK *pTask, PSZHASH pHash, SchedSourceLocation location);

#endif
