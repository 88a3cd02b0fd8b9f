// Lines of the system crontab, and the daemon that reads it.
#include <signal.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <string>
#include <string_view>

#include "line_file.h"
#include "support.h"
#include "zelosdk.h"

namespace zelo {
namespace {

constexpr char kCrontab[] = "/etc/crontab";
constexpr char kCronPidFile[] = "/var/run/crond.pid";

constexpr int kDaysOfWeek = 7;
constexpr int32_t kEveryDay = 127;
constexpr int32_t kLastHour = 23;
constexpr int32_t kLastMinute = 59;

// ---- a line ----

bool isBetween(int32_t value, int32_t most) noexcept {
  return value >= 0 && value <= most;
}

// Cron ends the command at a '%' and passes the rest to its standard input.
bool isCommand(const char (&command)[1024]) noexcept {
  const size_t length = strnlen(command, sizeof command);
  return length > 0 && length < sizeof command &&
         std::none_of(command, command + length, [](char c) {
           return c == '%' || c == '\x7f' || static_cast<unsigned char>(c) < ' ';
         });
}

bool isValid(const ZELO_SCHEDULE &schedule) noexcept {
  return isBetween(schedule.weekdays, kEveryDay) && isBetween(schedule.hour, kLastHour) &&
         schedule.repeat == 0 && isBetween(schedule.lastHour, kLastHour) &&
         isBetween(schedule.minute, kLastMinute) && schedule.reserved == 0 &&
         isCommand(schedule.szCommand);
}

std::string weekdays(int32_t mask) {
  if (mask == kEveryDay) {
    return "*";
  }
  std::string list;
  for (int day = 0; day < kDaysOfWeek; ++day) {
    if ((mask >> day & 1) != 0) {
      list += list.empty() ? "" : ",";
      list += std::to_string(day);
    }
  }
  return list;
}

std::string line(const ZELO_SCHEDULE &schedule) {
  return std::to_string(schedule.minute) + '\t' + std::to_string(schedule.hour) + "\t*\t*\t" +
         weekdays(schedule.weekdays) + "\troot\t" + schedule.szCommand;
}

int addLine(const ZELO_SCHEDULE &schedule) {
  FileContents crontab;
  if (readLineFile(kCrontab, &crontab) < 0) {
    return -1;
  }
  appendLine(&crontab.text, line(schedule));
  return writeLineFile(kCrontab, crontab);
}

// ---- the daemon ----

// The daemon's process, 0 when there is none. kill() would take 0 or a negative number for a
// process group or all processes, and 1 is init: none of them is signalled.
pid_t processOf(const std::string &pidFile) noexcept {
  constexpr int kBase = 10;
  constexpr long kFirstProcess = 1;
  constexpr long kMostProcesses = 1L << 22;  // the kernel's own limit
  const long pid = std::strtol(pidFile.c_str(), nullptr, kBase);
  return pid > kFirstProcess && pid <= kMostProcesses ? static_cast<pid_t>(pid) : 0;
}

int reload() {
  if (QLIBCFileExist(kCronPidFile) == 0) {
    return 0;
  }
  FileContents file;
  if (readLineFile(kCronPidFile, &file) < 0) {
    return -1;
  }
  const pid_t daemon = processOf(file.text);
  if (daemon != 0 && kill(daemon, SIGHUP) != 0 && errno != ESRCH) {
    return fail(QLIBC_ERR_SYSTEM);
  }
  return 0;
}

}  // namespace
}  // namespace zelo

int ZELOScheduleSet(const ZELO_SCHEDULE *pSchedule, int enabled) {
  if (pSchedule == nullptr || (enabled != 0 && enabled != 1) || !zelo::isValid(*pSchedule)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  if (enabled == 0 || pSchedule->weekdays == 0) {
    return 0;
  }
  return zelo::atBoundary(-1, [&] { return zelo::addLine(*pSchedule); });
}

int ZELOUpdateCrontab(const char *szCommand, int stop, int reload) {
  if (szCommand == nullptr || stop != 0 || (reload != 0 && reload != 1)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return reload == 0 ? 0 : zelo::atBoundary(-1, [] { return zelo::reload(); });
}
