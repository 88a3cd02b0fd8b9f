// The environment and the limits that cron gives to programs, for runs by hand.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

// "NAME=value": our environment, with cron's own variables, the machine's locale and time zone, and
// the settings of /etc/crontab in place of ours. (The library passes only some on to a command.)
std::vector<std::string> environmentOfCron();

// Sets the resource limits of this process to those of cron's; 0 changes nothing. It allocates
// nothing, so that a forked child may call it.
void takeLimitsOfCron(int64_t cron);

// The process of cron; 0 when it does not run.
int64_t cronProcess();
