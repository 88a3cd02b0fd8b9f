// Days, and which of them a task's schedule names.
#ifndef SCHEDULE_DAYS_H
#define SCHEDULE_DAYS_H

#include <zelosched.h>

#include <cstdint>

constexpr uint32_t kDaysOfWeek = 7;
constexpr uint32_t kMostDaysOfMonth = 31;
constexpr uint32_t kMonthsOfYear = 12;

// By year, month and day: -1 when `a` is earlier, 0 when they are the same day, 1 when it is later.
int schedCompareDays(const ZELO_SCHED_DATE &a, const ZELO_SCHED_DATE &b);

// The start date, without its weekday. It need not exist.
ZELO_SCHED_DATE schedStartDay(const ZELO_SCHED_TASK &task);

// A day is off only where its character of the week is '0'. The days beyond the end of a text of
// fewer than seven characters are on, whatever the bytes there are.
bool schedIsWeekdayOn(const ZELO_SCHED_TASK &task, uint32_t weekday);

// A bit for each day that is on, the lowest for Sunday.
unsigned schedWeekdayMaskOf(const ZELO_SCHED_TASK &task);

// Whether the day of the start date, or its month, is part of the crontab line.
bool schedHasDayOfMonth(const ZELO_SCHED_TASK &task);
bool schedHasMonth(const ZELO_SCHED_TASK &task);

// Whether cron starts the task on that day. A crontab line has no year: cron starts a task before
// its start date too, and one that runs once on its day of every year.
bool schedIsCronDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &day);

#endif
