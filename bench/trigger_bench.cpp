// The next trigger time of each type of task, today and on a later day, compared with the C
// library calls that it takes.
#include <benchmark/benchmark.h>
#include <zelosched.h>

#include <cstring>
#include <ctime>
#include <string>

#include "support/row.h"

namespace {

ZELO_SCHED_TASK task;

void nextTriggerTime() {
  orDie(ZELOSchedNextTriggerTime(&task) == 0, "ZELOSchedNextTriggerTime");
}

void readClock() {
  const time_t now = time(nullptr);
  benchmark::DoNotOptimize(localtime(&now));
}

void readClockAndNormalize() {
  const time_t now = time(nullptr);
  tm fields = *localtime(&now);
  fields.tm_mday += 1;
  fields.tm_isdst = 0;
  benchmark::DoNotOptimize(mktime(&fields));
}

// At 23:59 the run is still ahead today; at 00:00 it is over.
void setUpTask(int type, bool isToday) {
  const time_t now = time(nullptr);
  const tm today = *localtime(&now);
  task = {};
  task.Type = type;
  memcpy(task.Week, "1111111", sizeof("1111111"));
  task.StartYear = static_cast<uint32_t>(today.tm_year) + 1900;
  task.StartMonth = static_cast<uint32_t>(today.tm_mon) + 1;
  task.StartDay = static_cast<uint32_t>(today.tm_mday);
  task.RunHour = isToday ? 23 : 0;
  task.RunMin = isToday ? 59 : 0;
}

struct Type {
  const char *szName;
  int32_t number;
};
constexpr Type kTypes[] = {{"once", ZELO_SCHED_TYPE_ONCE},
                           {"daily", ZELO_SCHED_TYPE_DAILY},
                           {"weekly", ZELO_SCHED_TYPE_WEEKLY},
                           {"monthly", ZELO_SCHED_TYPE_MONTHLY},
                           {"yearly", ZELO_SCHED_TYPE_YEARLY}};

Work trigger(const Type &type, bool isToday) {
  return {nextTriggerTime, [type, isToday] { setUpTask(type.number, isToday); }};
}

}  // namespace

void makeRows() {
  constexpr double kMost = 1.5;
  constexpr double kMostNormalized = 1.1;
  constexpr char kClock[] = "time, localtime";
  constexpr char kNormalized[] = "time, localtime, mktime";
  Row(kClock, Work{readClock});
  Row(kNormalized, Work{readClockAndNormalize});
  for (const Type &type : kTypes) {
    const std::string name = std::string("ZELOSchedNextTriggerTime, ") + type.szName;
    const bool isNormalized = type.number != ZELO_SCHED_TYPE_ONCE;
    Row(name + ", today", trigger(type, true)).atMost(kMost, kClock);
    Row later(name + ", later", trigger(type, false));
    if (isNormalized) {
      later.atMost(kMostNormalized, kNormalized);
    } else {
      later.atMost(kMost, kClock);
    }
  }
}
