// Whether the machine lets tasks run: cron, the program that it starts, and the names in /tmp.
#pragma once

#include "check/finding.h"

Findings checkCron();
Findings checkProgram();
Findings checkTmp();
Findings checkSharedNames();

// Whether each line of /etc/zelosched.conf can be read.
Findings checkSettings();

// Whether a process keeps changes of tasks waiting. Takes two seconds for each lock that it holds.
Findings checkTurns();
