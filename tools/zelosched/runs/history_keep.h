// The sweep: adds to the history what keepers could not write, and what other programs have run.
#pragma once

#include "store/task_list.h"

// Copies the runs of the status database into the history, each once; ends there those whose
// process is gone; records changes of the tasks; and starts a new keeper for each run whose keeper
// was killed. Creates no history where there is nothing to keep. Throws Failure.
void sweepRuns();
// The same by a list that the caller has read.
void sweepRuns(const TaskList &list);

// The sweep, with the other periodic work: records that the machine is up (missed.h), sends the
// outstanding notices, and drops what is too old. Reports what failed; returns the exit status.
int keepHistory();

// Sends the notices of runs whose end the sweep recorded, and of missed times. Throws Failure.
void tellOfRuns();

// Whether this user has the rights to read the status database and the history.
bool mayReadAllRuns();
