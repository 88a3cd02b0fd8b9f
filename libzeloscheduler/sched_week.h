// The days of the week of a task.
#ifndef SCHED_WEEK_H
#define SCHED_WEEK_H

#include <zelosched.h>

#include <cstdint>
#include <cstring>

constexpr uint32_t kDaysOfWeek = 7;

// Every character but '0' turns its day on, and so does the end of a text of fewer than seven: the
// days behind it are on as well. What lies there is left over from other tasks and says nothing.
inline bool schedIsDayOn(const char (&szWeek)[sizeof(ZELO_SCHED_TASK::Week)], uint32_t weekday) {
  constexpr char kDayOff = '0';
  return weekday >= strnlen(szWeek, sizeof(szWeek)) || szWeek[weekday] != kDayOff;
}

#endif
