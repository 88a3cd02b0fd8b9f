// Which fields of a task's crontab line cron can read. Debian's cron passes over the whole of
// /etc/crontab for one that it cannot, and then starts nothing at all. A day that its month never
// has is none of them: cron reads it, and it never comes.
#ifndef SCHED_CRON_FIELDS_H
#define SCHED_CRON_FIELDS_H

#include <zelosched.h>

#include <cstdint>

#include "sched_run_hours.h"
#include "sched_week.h"

inline bool schedIsMinuteReadable(const ZELO_SCHED_TASK &task) {
  constexpr uint32_t kLastMinuteOfHour = 59;
  return task.RunMin <= kLastMinuteOfHour;
}

inline bool schedAreHoursReadable(const ZELO_SCHED_TASK &task) {
  return !anyRunHour(task, [](uint32_t hour) { return hour > kLastHourOfDay; });
}

inline bool schedIsDayReadable(const ZELO_SCHED_TASK &task) {
  constexpr uint32_t kMostDays = 31;
  const bool hasDay = task.Type == ZELO_SCHED_TYPE_ONCE || task.Type == ZELO_SCHED_TYPE_MONTHLY ||
                      task.Type == ZELO_SCHED_TYPE_YEARLY;
  return !hasDay || (task.StartDay >= 1 && task.StartDay <= kMostDays);
}

inline bool schedIsMonthReadable(const ZELO_SCHED_TASK &task) {
  constexpr uint32_t kMonths = 12;
  const bool hasMonth = task.Type == ZELO_SCHED_TYPE_ONCE || task.Type == ZELO_SCHED_TYPE_YEARLY;
  return !hasMonth || (task.StartMonth >= 1 && task.StartMonth <= kMonths);
}

inline bool schedAreWeekdaysReadable(const ZELO_SCHED_TASK &task) {
  if (task.Type != ZELO_SCHED_TYPE_WEEKLY) {
    return true;
  }
  uint32_t day = 0;
  while (day < kDaysOfWeek && !schedIsDayOn(task.Week, day)) {
    ++day;
  }
  return day < kDaysOfWeek;
}

inline bool schedIsCronLineReadable(const ZELO_SCHED_TASK &task) {
  return schedIsMinuteReadable(task) && schedAreHoursReadable(task) && schedIsDayReadable(task) &&
         schedIsMonthReadable(task) && schedAreWeekdaysReadable(task);
}

#endif
