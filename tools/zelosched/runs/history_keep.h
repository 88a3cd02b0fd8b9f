// The sweep: what keepers could not write into the history, and what other programs have run.
#pragma once

#include "store/task_list.h"

// Carries the runs of the status database over into the history, each once; ends there those whose
// process is gone; notes what became of the tasks; and has a new keeper for each run whose keeper
// was killed. Makes no history where there is nothing to keep. Throws Failure.
void sweepRuns();
// The same by a list that the caller has read.
void sweepRuns(const TaskList &list);

// That, with all that is done from time to time: notes that the machine is up (missed.h), tells of
// the runs that nobody has told of, and drops what is too old. What failed is said; the exit
// status.
int keepHistory();

// Tells of the runs that have ended and that nobody has told of: those that the sweep found. Throws
// Failure.
void tellOfRuns();

// This user has the rights to read the status database and the history.
bool mayReadAllRuns();
