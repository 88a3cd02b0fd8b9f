// Whether the machine lets tasks run: cron, the program that it starts, and the names in /tmp.
#pragma once

#include "check/finding.h"

Findings checkCron();
Findings checkProgram();
Findings checkTmp();
Findings checkSharedNames();

// Whether each line of /etc/zelosched.conf can be read.
Findings checkSettings();

// Whether somebody keeps changes of tasks waiting. It takes up to two seconds when one does.
Findings checkTurns();
