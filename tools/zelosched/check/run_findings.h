// What became of the runs.
#pragma once

#include "check/finding.h"
#include "store/task_list.h"

// Whose last run failed or gave up, which were missed, and which go on, and for how long.
Findings checkRuns(const TaskList &list);

// Of a run that is over or did not happen, which can be acknowledged.
bool isAboutPastRun(const Finding &finding);
