#include "schedule_cron.h"

#include <charconv>
#include <cstdint>
#include <cstring>
#include <limits>

#include "schedule_days.h"
#include "schedule_hours.h"

namespace {

// Each writes a zero-terminated text at `end` and returns its new end.
char *append(char *end, const char *text) {
  return stpcpy(end, text);
}

template <class Number>
char *append(char *end, Number number) {
  constexpr int kMostCharacters = std::numeric_limits<Number>::digits10 + 2;
  end = std::to_chars(end, end + kMostCharacters, number).ptr;
  *end = '\0';
  return end;
}

// The numbers of a list are written as signed ones.
char *appendItem(char *end, bool isFirst, uint32_t number) {
  return append(append(end, isFirst ? "" : ","), static_cast<int32_t>(number));
}

char *appendHours(char *end, const ZELO_SCHED_TASK &task) {
  if (task.RepeatHour == 0) {
    return append(end, task.RunHour);
  }
  const SchedHours hours = schedHoursOf(task);
  for (const uint32_t &hour : hours) {
    end = appendItem(end, &hour == hours.begin(), hour);
  }
  return end;
}

char *appendDays(char *end, const ZELO_SCHED_TASK &task) {
  constexpr char kAny[] = "*";
  end = schedHasDayOfMonth(task) ? append(end, task.StartDay) : append(end, kAny);
  end = append(end, "\t");
  end = schedHasMonth(task) ? append(end, task.StartMonth) : append(end, kAny);
  end = append(end, "\t");
  const bool isWeekly = task.Type == ZELO_SCHED_TYPE_WEEKLY;
  return append(end, isWeekly ? schedWeekdayListOf(task).text : kAny);
}

}  // namespace

SchedCronLine schedCronLineOf(const ZELO_SCHED_TASK &task) {
  SchedCronLine line = {};
  char *end = append(line.text, task.RunMin);
  end = append(end, "\t");
  end = appendHours(end, task);
  end = append(end, "\t");
  end = appendDays(end, task);
  end = append(end, "\troot\t");
  end = append(end, kSchedCronProgram);
  end = append(end, " --run id=");
  append(end, task.ID);
  return line;
}

SchedWeekdayList schedWeekdayListOf(const ZELO_SCHED_TASK &task) {
  SchedWeekdayList list = {};
  char *end = list.text;
  for (uint32_t day = 0; day < kDaysOfWeek; ++day) {
    if (schedIsWeekdayOn(task, day)) {
      end = appendItem(end, end == list.text, day);
    }
  }
  return list;
}

bool schedIsMinuteReadable(const ZELO_SCHED_TASK &task) {
  return task.RunMin <= kLastMinuteOfHour;
}

// Of the hours only the first may be out of range.
bool schedAreHoursReadable(const ZELO_SCHED_TASK &task) {
  return task.RunHour <= kLastHourOfDay;
}

bool schedIsDayReadable(const ZELO_SCHED_TASK &task) {
  return !schedHasDayOfMonth(task) || (task.StartDay >= 1 && task.StartDay <= kMostDaysOfMonth);
}

bool schedIsMonthReadable(const ZELO_SCHED_TASK &task) {
  return !schedHasMonth(task) || (task.StartMonth >= 1 && task.StartMonth <= kMonthsOfYear);
}

bool schedAreWeekdaysReadable(const ZELO_SCHED_TASK &task) {
  return task.Type != ZELO_SCHED_TYPE_WEEKLY || schedWeekdayMaskOf(task) != 0;
}

bool schedIsCronLineReadable(const ZELO_SCHED_TASK &task) {
  return schedIsMinuteReadable(task) && schedAreHoursReadable(task) && schedIsDayReadable(task) &&
         schedIsMonthReadable(task) && schedAreWeekdaysReadable(task);
}
