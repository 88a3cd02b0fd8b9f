// What became of the runs.
#pragma once

#include "check/finding.h"
#include "store/task_list.h"

Findings checkRunsInProgress(const TaskList &list);
Findings checkMissedRuns(const TaskList &list);
