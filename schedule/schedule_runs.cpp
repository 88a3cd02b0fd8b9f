#include "schedule_runs.h"

#include <algorithm>
#include <chrono>
#include <tuple>

#include "schedule_cron.h"
#include "schedule_days.h"
#include "schedule_due.h"

namespace {

constexpr unsigned kMostDaysBetween = 9 * 366;  // 29 February comes after eight years at the latest

uint32_t weekdayOf(const ZELO_SCHED_DATE &day) {
  const std::chrono::year_month_day date(std::chrono::year(static_cast<int>(day.year)),
                                         std::chrono::month(day.month), std::chrono::day(day.day));
  return std::chrono::weekday(std::chrono::sys_days(date)).c_encoding();
}

uint32_t daysOfMonth(const ZELO_SCHED_DATE &day) {
  constexpr uint32_t kFebruary = 2;
  constexpr uint32_t kDays[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool isLeap = day.year % 4 == 0 && (day.year % 100 != 0 || day.year % 400 == 0);
  return kDays[day.month - 1] + (isLeap && day.month == kFebruary ? 1 : 0);
}

// No run is before this day. The day and the month of the start date may be out of range.
ZELO_SCHED_DATE firstDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &after) {
  ZELO_SCHED_DATE first = {};
  first.year = task.StartMonth > kMonthsOfYear ? task.StartYear + 1 : task.StartYear;
  first.month = task.StartMonth > kMonthsOfYear ? 1 : std::max(task.StartMonth, 1U);
  first.day = 1;
  return schedCompareDays(first, after) <= 0 ? after : first;
}

bool isLater(const ZELO_SCHED_DATE &a, const ZELO_SCHED_DATE &b) {
  return std::tie(a.year, a.month, a.day, a.hour, a.minute) >
         std::tie(b.year, b.month, b.day, b.hour, b.minute);
}

}  // namespace

SchedRuns::SchedRuns(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &after)
    : task_(&task),
      after_(after),
      hours_(schedHoursOf(task)),
      day_(after),
      daysLeft_(task.StartYear <= kLastYear && schedIsCronLineReadable(task) ? kMostDaysBetween
                                                                             : 0) {
  if (daysLeft_ > 0) {
    day_ = firstDay(task, after);
    day_.weekday = weekdayOf(day_);
  }
}

bool SchedRuns::isRunDay() const {
  return schedIsCronDay(*task_, day_) && schedIsDueDay(*task_, day_);
}

bool SchedRuns::isRunLeft() const {
  const bool isOver =
      task_->Type == ZELO_SCHED_TYPE_ONCE && schedCompareDays(day_, schedStartDay(*task_)) > 0;
  return daysLeft_ > 0 && !isOver;
}

void SchedRuns::goToNextDay() {
  --daysLeft_;
  hour_ = 0;
  day_.weekday = (day_.weekday + 1) % kDaysOfWeek;
  if (++day_.day <= daysOfMonth(day_)) {
    return;
  }
  day_.day = 1;
  if (++day_.month > kMonthsOfYear) {
    day_.month = 1;
    ++day_.year;
  }
}

bool SchedRuns::next(ZELO_SCHED_DATE *run) {
  for (; isRunLeft(); goToNextDay()) {
    if (!isRunDay()) {
      continue;
    }
    daysLeft_ = kMostDaysBetween;
    while (hour_ < hours_.count) {
      *run = day_;
      run->hour = hours_.hours[hour_++];
      run->minute = task_->RunMin;
      if (isLater(*run, after_)) {
        return true;
      }
    }
  }
  return false;
}
