#include "schedule_days.h"

#include <cstring>
#include <tuple>

int schedCompareDays(const ZELO_SCHED_DATE &a, const ZELO_SCHED_DATE &b) {
  const auto first = std::tie(a.year, a.month, a.day);
  const auto second = std::tie(b.year, b.month, b.day);
  return first < second ? -1 : second < first ? 1 : 0;
}

ZELO_SCHED_DATE schedStartDay(const ZELO_SCHED_TASK &task) {
  ZELO_SCHED_DATE day = {};
  day.year = task.StartYear;
  day.month = task.StartMonth;
  day.day = task.StartDay;
  return day;
}

bool schedIsWeekdayOn(const ZELO_SCHED_TASK &task, uint32_t weekday) {
  constexpr char kDayOff = '0';
  return weekday >= strnlen(task.Week, sizeof(task.Week)) || task.Week[weekday] != kDayOff;
}

unsigned schedWeekdayMaskOf(const ZELO_SCHED_TASK &task) {
  unsigned mask = 0;
  for (uint32_t day = 0; day < kDaysOfWeek; ++day) {
    mask |= schedIsWeekdayOn(task, day) ? 1U << day : 0;
  }
  return mask;
}

bool schedHasDayOfMonth(const ZELO_SCHED_TASK &task) {
  return schedHasMonth(task) || task.Type == ZELO_SCHED_TYPE_MONTHLY;
}

bool schedHasMonth(const ZELO_SCHED_TASK &task) {
  return task.Type == ZELO_SCHED_TYPE_ONCE || task.Type == ZELO_SCHED_TYPE_YEARLY;
}

bool schedIsCronDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &day) {
  if (task.Type == ZELO_SCHED_TYPE_WEEKLY) {
    return schedIsWeekdayOn(task, day.weekday);
  }
  return (!schedHasDayOfMonth(task) || day.day == task.StartDay) &&
         (!schedHasMonth(task) || day.month == task.StartMonth);
}
