// Whether the machine will go on at its next power-on time.
#pragma once

#include <string>

#include "store/task_list.h"

// A sentence when a power-on time is enabled and the machine's clock is not armed, else nothing.
std::string alarmFault(const TaskList &list);
