/*
 * Switching the machine on: the alarm of its real-time clock.
 */
#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string>
#include <vector>

#include "power_schedule.h"
#include "read_file.h"
#include "support.h"

namespace zelo {
namespace {

constexpr char kWakeAlarm[] = "/sys/class/rtc/rtc0/wakealarm";
constexpr char kDisarmed[] = "0\n";
constexpr size_t kMostAlarmBytes = 32;
constexpr int kDecimal = 10;

/* A week, and another one for a weekday that the calendar of a place skips. */
constexpr int kDaysAhead = 14;
/* A time that summer time skips at the end of a day comes after midnight. */
constexpr int kDaysBefore = 1;
constexpr int kNoon = 12;
constexpr int kUnknownSummerTime = -1;

bool LocalTime(time_t moment, tm *local) noexcept {
  return localtime_r(&moment, local) != nullptr;
}

bool Shows(time_t moment, const tm &day, const ZELO_AUTOPOWER &entry) noexcept {
  tm local{};
  return LocalTime(moment, &local) && local.tm_mday == day.tm_mday && local.tm_hour == entry.hour &&
         local.tm_min == entry.minute;
}

time_t Moment(const tm &day, const ZELO_AUTOPOWER &entry, int summer_time) noexcept {
  tm fields{};
  fields.tm_year = day.tm_year;
  fields.tm_mon = day.tm_mon;
  fields.tm_mday = day.tm_mday;
  fields.tm_hour = entry.hour;
  fields.tm_min = entry.minute;
  fields.tm_isdst = summer_time;
  return mktime(&fields);
}

/* Read as summer time and as standard time, at most one of the two is right on
 * most days, both where the clocks go back, none where they go forward. */
time_t MomentOf(const tm &day, const ZELO_AUTOPOWER &entry) noexcept {
  const time_t summer = Moment(day, entry, 1);
  const time_t standard = Moment(day, entry, 0);
  const bool summer_fits = Shows(summer, day, entry);
  const bool standard_fits = Shows(standard, day, entry);
  if (summer_fits == standard_fits) {
    return summer_fits ? std::min(summer, standard) : std::max(summer, standard);
  }
  return summer_fits ? summer : standard;
}

/* The date that lies so many days after the other; noon is on every clock. */
bool DayAfter(const tm &today, int days, tm *day) noexcept {
  tm fields{};
  fields.tm_year = today.tm_year;
  fields.tm_mon = today.tm_mon;
  fields.tm_mday = today.tm_mday + days;
  fields.tm_hour = kNoon;
  fields.tm_isdst = kUnknownSummerTime;
  return LocalTime(mktime(&fields), day);
}

/* 0, with the first moment after now or without one, or -1. */
int NextMoment(const std::vector<ZELO_AUTOPOWER> &entries, std::optional<time_t> *next) {
  tzset(); /* the appliance's zone may have been changed since the process began */
  const time_t now = time(nullptr);
  tm today{};
  if (!LocalTime(now, &today)) {
    return Fail(QLIBC_ERR_SYSTEM);
  }
  for (int days = -kDaysBefore; days <= kDaysAhead; ++days) {
    tm day{};
    if (!DayAfter(today, days, &day)) {
      return Fail(QLIBC_ERR_SYSTEM);
    }
    for (const ZELO_AUTOPOWER &entry : entries) {
      if (entry.enabled == 0 || (entry.weekdays >> day.tm_wday & 1) == 0) {
        continue;
      }
      const time_t moment = MomentOf(day, entry);
      if (moment > now && (!*next || moment < **next)) {
        *next = moment;
      }
    }
  }
  return 0;
}

/* The kernel takes each write as a whole. */
int WriteAlarm(const std::string &text) {
  Descriptor file(open(kWakeAlarm, O_WRONLY | O_TRUNC | O_CLOEXEC));
  if (!file.valid()) {
    return Fail(QLIBC_ERR_OPEN);
  }
  if (write(file.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size()) ||
      !file.Close()) {
    return Fail(QLIBC_ERR_IO);
  }
  return 0;
}

/* The kernel shows no number when no alarm is armed. One that cannot be read is
 * taken for armed. */
bool IsArmed() {
  const Descriptor file(open(kWakeAlarm, O_RDONLY | O_CLOEXEC));
  std::string contents;
  return !file.valid() || !ReadAll(file.get(), kMostAlarmBytes, &contents) ||
         std::strtoll(contents.c_str(), nullptr, kDecimal) != 0;
}

/* Only an alarm that is armed is written to: a machine that cannot be woken at
 * all, with its clock read-only, has nothing to disarm. */
int Disarm() {
  return QLIBCFileExist(kWakeAlarm) == 0 || !IsArmed() ? 0 : WriteAlarm(kDisarmed);
}

/* The kernel refuses a time while another one is armed. */
int Arm(time_t moment) {
  return WriteAlarm(kDisarmed) < 0 ? -1 : WriteAlarm(std::to_string(moment) + '\n');
}

int SetPowerOn() {
  std::vector<ZELO_AUTOPOWER> entries;
  std::optional<time_t> next;
  if (ReadPowerList(ZELO_AUTOPOWER_ON, &entries) < 0 || NextMoment(entries, &next) < 0) {
    return -1;
  }
  return next ? Arm(*next) : Disarm();
}

}  // namespace
}  // namespace zelo

int ZELOAutoPoweronSet(void) {
  return zelo::AtBoundary(-1, [] { return zelo::SetPowerOn(); });
}
