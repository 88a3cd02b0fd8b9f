// What cron gives the programs that it starts, so that a run by hand tells how the night will be.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

// "NAME=value": ours, with cron's own variables, the locale and time zone of the machine, and what
// /etc/crontab sets in the place of ours. (Of the others none reaches a command.)
std::vector<std::string> environmentOfCron();

// Gives this process the limits of cron's. Without a cron that runs they stay as they are. It
// allocates nothing: a process that was forked may call it.
void takeLimitsOfCron(int64_t cron);

// Its process; 0 when it does not run.
int64_t cronProcess();
