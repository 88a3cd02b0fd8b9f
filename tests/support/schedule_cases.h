// The table of schedules that several tests share: those of the crontab lines, of the check whether
// a run is due, of the time shown as the next run, of the coming runs, and of the check whether
// cron can read the line.
//
// The clock does not change to or from summer time in any of them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tasks.h"

namespace support {

inline constexpr char kNever[] = "N/A";

struct Day {
  uint32_t year = 2012, month = 1, day = 1;
};

struct Schedule {
  int32_t type = ZELO_SCHED_TYPE_DAILY;
  std::string_view week = "1111111";  // copied with the bytes behind a zero byte
  Day start{};
  uint32_t hour = 8, minute = 30;
  uint32_t repeat = 0, last = 0;
};

// The expected results in one minute.
struct Moment {
  const char *now;
  bool isDue;
  const char *shown;           // by ZELOSchedNextTriggerTime
  const char *next = nullptr;  // when cron starts the task and it is due; the same where null
};

struct ScheduleCase {
  std::string what;
  Schedule schedule;
  std::string fields;  // of the crontab line, with blanks between them
  bool isReadable;     // by cron
  std::vector<Moment> moments;
};

const std::vector<ScheduleCase> &scheduleCases();

// Enabled, with the id 1.
Task taskOf(const Schedule &schedule);

// With tabs, user and command.
std::string lineOf(const ScheduleCase &each);

// When the next run comes.
std::string nextOf(const Moment &moment);

// A schedule of a type without a name cannot be stored.
bool isStorable(const Schedule &schedule);

// The hours of its line, up to 23.
std::vector<uint32_t> hoursOf(const ScheduleCase &each);

}  // namespace support
