// Schedules as people say them.
//
// Throws UsageError for what cannot be read, and Failure for a start date that does not exist.
// Other numbers out of range are left to task_check.
#pragma once

#include <zelosched.h>

#include <string>

// Each sets the type and what goes with it: "2026-12-24T18:30" (or a blank for the T), "08:30",
// "mon,wed,fri 08:30" (ranges as mon-fri, or "weekdays", "weekend", "all"), "15 08:30",
// "02-29 08:30". What belongs to other types is set back to its default.
void setOnce(ZELO_SCHED_TASK *task, const std::string &text);
void setDaily(ZELO_SCHED_TASK *task, const std::string &text);
void setWeekly(ZELO_SCHED_TASK *task, const std::string &text);
void setMonthly(ZELO_SCHED_TASK *task, const std::string &text);
void setYearly(ZELO_SCHED_TASK *task, const std::string &text);

// "2h", "2" or "off".
void setEvery(ZELO_SCHED_TASK *task, const std::string &text);
// "18" or "18:00".
void setUntil(ZELO_SCHED_TASK *task, const std::string &text);
// "2026-12-24": no run before that day.
void setStart(ZELO_SCHED_TASK *task, const std::string &text);

// "weekly on Mon, Wed and Fri at 08:30, every 2 hours until 18"
std::string scheduleInWords(const ZELO_SCHED_TASK &task);

// "mon-fri 08:00 every 2h until 18", "2026-12-24 18:30", "monthly 15 08:30".
std::string scheduleInBrief(const ZELO_SCHED_TASK &task);
