// Whether the stored tasks are fit to run, and cron knows of them.
#pragma once

#include "check/finding.h"
#include "store/task_list.h"

Findings checkTasksAreReadable(const TaskList &list);
Findings checkTaskFields(const TaskList &list);
Findings checkCrontab(const TaskList &list);
Findings checkCrontabLength();

// What power times need beside cron: an armed alarm, and the program that switches off.
Findings checkPower(const TaskList &list);
