#include "runs/coming_runs.h"

#include <cstdio>

#include "runs/time_units.h"

namespace {

using std::chrono::sys_days;
using std::chrono::year_month_day;

constexpr int kFirstYear = 1900;  // of struct tm

const char *const kWeekdays[] = {"Sunday",   "Monday", "Tuesday", "Wednesday",
                                 "Thursday", "Friday", "Saturday"};

struct Date {
  uint32_t year;
  uint32_t month;
  uint32_t day;
};

Date dateOf(sys_days day) {
  const year_month_day date(day);
  return {static_cast<uint32_t>(int{date.year()}), unsigned{date.month()}, unsigned{date.day()}};
}

unsigned weekdayOf(sys_days day) {
  return std::chrono::weekday(day).c_encoding();
}

ZELO_SCHED_DATE libraryDate(const LocalMinute &minute) {
  const Date date = dateOf(minute.day);
  return {date.year,
          date.month,
          date.day,
          weekdayOf(minute.day),
          static_cast<uint32_t>(minute.hour),
          static_cast<uint32_t>(minute.minute)};
}

LocalMinute minuteOf(const ZELO_SCHED_DATE &date) {
  const year_month_day day(std::chrono::year(static_cast<int>(date.year)),
                           std::chrono::month(date.month), std::chrono::day(date.day));
  return {sys_days(day), static_cast<int>(date.hour), static_cast<int>(date.minute)};
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

// The minute has the UTC offset of a day before it or of a day after it; where both give a moment,
// the former gives the earlier one. mktime() needs tm_isdst = 1 to find that one, and is slow with
// it in a time zone without summer time.
std::optional<time_t> momentOf(const LocalMinute &minute) {
  const time_t inUtc =
      minute.day.time_since_epoch().count() * kDay + minute.hour * kHour + minute.minute * kMinute;
  for (const time_t near : {inUtc - kDay, inUtc + kDay}) {
    tm fields{};
    localtime_r(&near, &fields);
    const time_t moment = inUtc - fields.tm_gmtoff;
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

ComingRuns::ComingRuns(const ZELO_SCHED_TASK &task, const LocalMinute &after)
    : runs_(task, libraryDate(after)) {}

std::optional<LocalMinute> ComingRuns::next() {
  constexpr auto kLast = static_cast<uint32_t>(int{std::chrono::year::max()});
  for (ZELO_SCHED_DATE date; runs_.next(&date) && date.year <= kLast;) {
    const LocalMinute run = minuteOf(date);
    if (momentOf(run)) return run;
  }
  return std::nullopt;
}

std::vector<LocalMinute> runsBetween(const ZELO_SCHED_TASK &task, const LocalMinute &after,
                                     const LocalMinute &last) {
  std::vector<LocalMinute> found;
  ComingRuns runs(task, after);
  for (auto run = runs.next(); run && *run <= last; run = runs.next()) found.push_back(*run);
  return found;
}

std::optional<LocalMinute> nextRun(const ZELO_SCHED_TASK &task, const LocalMinute &after) {
  if (task.State != ZELO_SCHED_STATE_ENABLED) return std::nullopt;
  return ComingRuns(task, after).next();
}
