// Findings about runs.
#pragma once

#include "check/finding.h"
#include "store/task_list.h"

// Tasks whose last run failed or gave up, missed runs, and runs under way.
Findings checkRuns(const TaskList &list);

// About a run that failed, gave up or was missed, which can be acknowledged.
bool isAboutPastRun(const Finding &finding);
