// The calls to the platform that the power backend makes, in order, each of which a test can make
// fail. They are passed on otherwise.
//
//   powerCalls();   "ConfGet 0", "ConfSet 1 2" (list, count), "PoweronSet", "SetLine FILE KEY",
//                   "UpdateCrontab COMMAND 0 1",
//                   "ScheduleSet WEEKDAYS HOUR 0 LASTHOUR MINUTE 0 COMMAND 1"
//   failPowerCall("ConfGet 1", {.from = 2, .code = 0x0900});   what begins so; from and times count
//                                                              these calls, result is -1 by default
//   giveList(kOn, entries);   what a ConfGet gives from now on, also what the platform would refuse
//   takeAnyList();            a ConfSet succeeds and stores nothing; lastList() has what it got
//   resetPowerCalls();        all is passed on again
//
// A test program that uses this names support/power_calls.cpp among its SOURCES.
#pragma once

#include <string>
#include <vector>

#include "failing_calls.h"
#include "power.h"

namespace support {

std::vector<std::string> powerCalls();
void failPowerCall(const std::string &beginning, const FailPlan &plan = {});
void giveList(int list, const Entries &entries);
void takeAnyList();
Entries lastList();
void resetPowerCalls();

}  // namespace support
