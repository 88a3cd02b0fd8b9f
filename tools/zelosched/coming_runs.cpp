#include "coming_runs.h"

#include <algorithm>
#include <cstdio>
#include <tuple>

#include "sched_run_hours.h"
#include "sched_week.h"

namespace {

using std::chrono::days;
using std::chrono::sys_days;
using std::chrono::year_month_day;

constexpr days kSearched{366 * 9};  // 29 February comes after eight years at the latest
constexpr uint32_t kLastYear = 9999;
constexpr int kFirstYear = 1900;  // of struct tm

const char *const kWeekdays[] = {"Sunday",   "Monday", "Tuesday", "Wednesday",
                                 "Thursday", "Friday", "Saturday"};

struct Date {
  uint32_t year;
  uint32_t month;
  uint32_t day;
  auto operator<=>(const Date &) const = default;
};

Date dateOf(sys_days day) {
  const year_month_day date(day);
  return {static_cast<uint32_t>(int{date.year()}), unsigned{date.month()}, unsigned{date.day()}};
}

Date startOf(const ZELO_SCHED_TASK &task) {
  return {task.StartYear, task.StartMonth, task.StartDay};
}

unsigned weekdayOf(sys_days day) {
  return std::chrono::weekday(day).c_encoding();
}

// Both the crontab line and the check at the start of a run must let it pass.
bool isDayOf(const ZELO_SCHED_TASK &task, sys_days day) {
  const Date date = dateOf(day);
  const Date start = startOf(task);
  if (date < start) return false;
  switch (task.Type) {
    case ZELO_SCHED_TYPE_ONCE:
      return date == start;
    case ZELO_SCHED_TYPE_DAILY:
      return true;
    case ZELO_SCHED_TYPE_WEEKLY:
      return schedIsDayOn(task.Week, weekdayOf(day));
    case ZELO_SCHED_TYPE_MONTHLY:
      return date.day == start.day;
    case ZELO_SCHED_TYPE_YEARLY:
      return date.month == start.month && date.day == start.day;
    default:
      return date == start;
  }
}

std::vector<int> hoursOf(const ZELO_SCHED_TASK &task) {
  std::vector<int> hours;
  anyRunHour(task, [&](uint32_t hour) {
    if (hour <= kLastHourOfDay) hours.push_back(static_cast<int>(hour));
    return false;
  });
  return hours;
}

// Nothing before the start date needs a look. Of one without a month, that begins with the year.
sys_days firstDay(const ZELO_SCHED_TASK &task, sys_days day) {
  const bool isDate = task.StartMonth <= 12 && task.StartYear >= 1;
  if (!isDate || task.StartYear > kLastYear) return day;
  const year_month_day month(std::chrono::year(static_cast<int>(task.StartYear)),
                             std::chrono::month(std::max(task.StartMonth, 1U)),
                             std::chrono::day(1));
  return std::max(day, sys_days(month));
}

// Gives every run after `after` to `take`, until that says no or nothing was found for years.
template <class Take>
void forEachRun(const ZELO_SCHED_TASK &task, const LocalMinute &after, Take take) {
  const std::vector<int> hours = hoursOf(task);
  if (hours.empty() || task.RunMin > 59 || task.StartYear > kLastYear) return;
  sys_days lastFound = firstDay(task, after.day);
  for (sys_days day = lastFound; day - lastFound <= kSearched; day += days(1)) {
    if (!isDayOf(task, day)) continue;
    for (const int hour : hours) {
      const LocalMinute run{day, hour, static_cast<int>(task.RunMin)};
      if (run <= after || !momentOf(run)) continue;
      if (!take(run)) return;
      lastFound = day;
    }
    if (task.Type == ZELO_SCHED_TYPE_ONCE) return;
  }
}

}  // namespace

LocalMinute localMinute(time_t moment) {
  tm fields{};
  localtime_r(&moment, &fields);
  const year_month_day date(std::chrono::year(fields.tm_year + kFirstYear),
                            std::chrono::month(static_cast<unsigned>(fields.tm_mon + 1)),
                            std::chrono::day(static_cast<unsigned>(fields.tm_mday)));
  return {sys_days(date), fields.tm_hour, fields.tm_min};
}

std::optional<time_t> momentOf(const LocalMinute &minute) {
  const Date date = dateOf(minute.day);
  tm fields{};
  fields.tm_year = static_cast<int>(date.year) - kFirstYear;
  fields.tm_mon = static_cast<int>(date.month) - 1;
  fields.tm_mday = static_cast<int>(date.day);
  fields.tm_hour = minute.hour;
  fields.tm_min = minute.minute;
  fields.tm_isdst = -1;
  tm first = fields;
  first.tm_isdst = 1;  // summer time is what ends when a minute comes twice
  for (tm tried : {first, fields}) {
    const time_t moment = mktime(&tried);
    if (localMinute(moment) == minute) return moment;
  }
  return std::nullopt;
}

std::string dayText(const LocalMinute &minute) {
  const Date date = dateOf(minute.day);
  char text[32];
  std::snprintf(text, sizeof text, "%04u-%02u-%02u", date.year, date.month, date.day);
  return text;
}

std::string timeText(const LocalMinute &minute) {
  char text[32];
  std::snprintf(text, sizeof text, "%02d:%02d", minute.hour, minute.minute);
  return text;
}

std::string minuteText(const LocalMinute &minute) {
  return dayText(minute) + " " + timeText(minute);
}

const char *weekdayName(const LocalMinute &minute) {
  return kWeekdays[weekdayOf(minute.day)];
}

std::vector<LocalMinute> comingRuns(const ZELO_SCHED_TASK &task, const LocalMinute &after,
                                    size_t count, const std::optional<LocalMinute> &last) {
  std::vector<LocalMinute> runs;
  if (count == 0) return runs;
  forEachRun(task, after, [&](const LocalMinute &run) {
    if (last && run > *last) return false;
    runs.push_back(run);
    return runs.size() < count;
  });
  return runs;
}

std::vector<LocalMinute> runsBetween(const ZELO_SCHED_TASK &task, const LocalMinute &after,
                                     const LocalMinute &last) {
  std::vector<LocalMinute> runs;
  forEachRun(task, after, [&](const LocalMinute &run) {
    if (run > last) return false;
    runs.push_back(run);
    return true;
  });
  return runs;
}

std::optional<LocalMinute> nextRun(const ZELO_SCHED_TASK &task, const LocalMinute &after) {
  if (task.State != ZELO_SCHED_STATE_ENABLED) return std::nullopt;
  const std::vector<LocalMinute> runs = comingRuns(task, after, 1);
  if (runs.empty()) return std::nullopt;
  return runs.front();
}
