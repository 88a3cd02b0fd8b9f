// Whether the machine will switch itself on at its next power-on time.
#pragma once

#include <ctime>
#include <optional>
#include <string>

#include "store/task_list.h"

// The alarm of the real-time clock.
struct Alarm {
  bool isThere = false;
  bool isArmed = false;
  std::optional<time_t> wakesAt;
};
Alarm readAlarm();

// A sentence when a power-on time is enabled and the alarm is not armed, else nothing.
std::string alarmFault(const TaskList &list);
