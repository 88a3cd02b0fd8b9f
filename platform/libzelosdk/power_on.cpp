// Switching the machine on: the alarm of its real-time clock.
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

// A week, and another one for a time zone that skips a day of the calendar.
constexpr int kDaysAhead = 14;
// Yesterday too: a time that the change to summer time skips before midnight comes after it.
constexpr int kDaysBefore = 1;
constexpr int kNoon = 12;
constexpr int kUnknownSummerTime = -1;

bool localTime(time_t moment, tm *local) noexcept {
  return localtime_r(&moment, local) != nullptr;
}

bool shows(time_t moment, const tm &day, const ZELO_AUTOPOWER &entry) noexcept {
  tm local{};
  return localTime(moment, &local) && local.tm_mday == day.tm_mday && local.tm_hour == entry.hour &&
         local.tm_min == entry.minute;
}

time_t moment(const tm &day, const ZELO_AUTOPOWER &entry, int summerTime) noexcept {
  tm fields{};
  fields.tm_year = day.tm_year;
  fields.tm_mon = day.tm_mon;
  fields.tm_mday = day.tm_mday;
  fields.tm_hour = entry.hour;
  fields.tm_min = entry.minute;
  fields.tm_isdst = summerTime;
  return mktime(&fields);
}

// The time is read as summer time and as standard time. One of them fits on most days, both when
// the clock goes back, none when it goes forward.
time_t momentOf(const tm &day, const ZELO_AUTOPOWER &entry) noexcept {
  const time_t summer = moment(day, entry, 1);
  const time_t standard = moment(day, entry, 0);
  const bool summerFits = shows(summer, day, entry);
  const bool standardFits = shows(standard, day, entry);
  if (summerFits == standardFits) {
    return summerFits ? std::min(summer, standard) : std::max(summer, standard);
  }
  return summerFits ? summer : standard;
}

// The date so many days after the other, by way of noon, which no change of the clock skips.
bool dayAfter(const tm &today, int days, tm *day) noexcept {
  tm fields{};
  fields.tm_year = today.tm_year;
  fields.tm_mon = today.tm_mon;
  fields.tm_mday = today.tm_mday + days;
  fields.tm_hour = kNoon;
  fields.tm_isdst = kUnknownSummerTime;
  return localTime(mktime(&fields), day);
}

// 0, with the first moment after now in *next if there is one, or -1.
int nextMoment(const std::vector<ZELO_AUTOPOWER> &entries, std::optional<time_t> *next) {
  tzset();  // the appliance's zone may have been changed since the process began
  const time_t now = time(nullptr);
  tm today{};
  if (!localTime(now, &today)) {
    return fail(QLIBC_ERR_SYSTEM);
  }
  for (int days = -kDaysBefore; days <= kDaysAhead; ++days) {
    tm day{};
    if (!dayAfter(today, days, &day)) {
      return fail(QLIBC_ERR_SYSTEM);
    }
    for (const ZELO_AUTOPOWER &entry : entries) {
      if (entry.enabled == 0 || (entry.weekdays >> day.tm_wday & 1) == 0) {
        continue;
      }
      const time_t moment = momentOf(day, entry);
      if (moment > now && (!*next || moment < **next)) {
        *next = moment;
      }
    }
  }
  return 0;
}

// The kernel takes each write as a whole.
int writeAlarm(const std::string &text) {
  Descriptor file(open(kWakeAlarm, O_WRONLY | O_TRUNC | O_CLOEXEC));
  if (!file.valid()) {
    return fail(QLIBC_ERR_OPEN);
  }
  if (write(file.get(), text.data(), text.size()) != static_cast<ssize_t>(text.size()) ||
      !file.close()) {
    return fail(QLIBC_ERR_IO);
  }
  return 0;
}

// The kernel shows no number when no alarm is set. A file that cannot be read counts as armed.
bool isArmed() {
  const Descriptor file(open(kWakeAlarm, O_RDONLY | O_CLOEXEC));
  std::string contents;
  return !file.valid() || !readAll(file.get(), kMostAlarmBytes, &contents) ||
         std::strtoll(contents.c_str(), nullptr, kDecimal) != 0;
}

// Written only when an alarm is armed: the file of a machine that cannot be woken is read-only.
int disarm() {
  return QLIBCFileExist(kWakeAlarm) == 0 || !isArmed() ? 0 : writeAlarm(kDisarmed);
}

// The kernel refuses a time while another alarm is armed.
int arm(time_t moment) {
  return writeAlarm(kDisarmed) < 0 ? -1 : writeAlarm(std::to_string(moment) + '\n');
}

int setPowerOn() {
  std::vector<ZELO_AUTOPOWER> entries;
  std::optional<time_t> next;
  if (readPowerList(ZELO_AUTOPOWER_ON, &entries) < 0 || nextMoment(entries, &next) < 0) {
    return -1;
  }
  return next ? arm(*next) : disarm();
}

}  // namespace
}  // namespace zelo

int ZELOAutoPoweronSet(void) {
  return zelo::atBoundary(-1, [] { return zelo::setPowerOn(); });
}
