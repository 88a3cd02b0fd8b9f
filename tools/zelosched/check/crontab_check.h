// Whether /etc/crontab says what the stored tasks say.
#pragma once

#include <zelosched.h>

#include <string>
#include <vector>

// What cron starts at a power-off time.
inline constexpr char kPowerOffProgram[] = "/usr/zelo/bin/zelo_poweroff_feasible_check";

// A sentence for each way in which the crontab and the enabled tasks differ; none when they agree.
std::vector<std::string> crontabDifferences(const std::vector<const ZELO_SCHED_TASK *> &tasks);
