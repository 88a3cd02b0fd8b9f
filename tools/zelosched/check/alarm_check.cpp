#include "check/alarm_check.h"

#include <algorithm>
#include <fstream>

#include "store/power_room.h"

namespace {

constexpr char kWakeAlarm[] = "/sys/class/rtc/rtc0/wakealarm";

bool isPowerOn(const ZELO_SCHED_TASK *task) {
  return isPower(*task) && isEnabled(*task) && directionOf(*task) == "on";
}

}  // namespace

std::string alarmFault(const TaskList &list) {
  if (std::none_of(list.tasks().begin(), list.tasks().end(), isPowerOn)) return "";
  std::ifstream file(kWakeAlarm);
  if (!file) return "the machine has no clock that could be armed: it will not go on by itself";
  std::string alarm;
  if (std::getline(file, alarm) && !alarm.empty()) return "";
  return "the machine's clock is not armed for the next power-on time (the system log says why)";
}
