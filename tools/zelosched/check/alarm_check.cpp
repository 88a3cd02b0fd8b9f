#include "check/alarm_check.h"

#include <algorithm>
#include <fstream>

#include "store/power_room.h"
#include "terminal/number.h"

namespace {

constexpr char kWakeAlarm[] = "/sys/class/rtc/rtc0/wakealarm";

bool isPowerOn(const ZELO_SCHED_TASK *task) {
  return isPower(*task) && isEnabled(*task) && directionOf(*task) == "on";
}

}  // namespace

Alarm readAlarm() {
  std::ifstream file(kWakeAlarm);
  Alarm alarm;
  alarm.isThere = static_cast<bool>(file);
  std::string text;
  alarm.isArmed = std::getline(file, text) && !text.empty();
  if (alarm.isArmed) alarm.wakesAt = parseNumber(text);
  return alarm;
}

std::string alarmFault(const TaskList &list) {
  if (std::none_of(list.tasks().begin(), list.tasks().end(), isPowerOn)) return "";
  const Alarm alarm = readAlarm();
  if (!alarm.isThere) {
    return "the machine has no clock that could be armed: it will not go on by itself";
  }
  if (alarm.isArmed) return "";
  return "the machine's clock is not armed for the next power-on time (the system log says why)";
}
