// Normalising dates, and the time that is shown as a task's next run. The schedule library
// computes when a task runs; here are the cases in which the interface requires another time to be
// shown.
#include <zelosched.h>

#include <cstring>
#include <ctime>

#include "sched_report.h"
#include "sched_text.h"
#include "sched_trigger_clock.h"
#include "schedule_days.h"
#include "schedule_due.h"
#include "schedule_hours.h"

namespace {

constexpr uint32_t kFirstYear = 1900;  // of struct tm
constexpr uint32_t kTen = 10;
constexpr uint32_t kHourFactor = 100;  // a time of day is hour * 100 + minute
constexpr char kNever[] = "N/A";

struct TriggerText {
  char text[64];  // five numbers of up to ten digits, and four characters between them
};

// Appends the number, with at least that many digits, and returns the new end. snprintf would take
// longer than all the rest of this unit.
char *appendNumber(char *end, uint32_t number, int digits) {
  if (number >= kTen || digits > 1) {
    end = appendNumber(end, number / kTen, digits - 1);
  }
  *end = static_cast<char>('0' + number % kTen);
  return end + 1;
}

TriggerText written(const ZELO_SCHED_DATE &date) {
  constexpr int kYearDigits = 4;
  constexpr int kDigits = 2;
  TriggerText result = {};
  char *end = appendNumber(result.text, date.year, kYearDigits);
  *end++ = '-';
  end = appendNumber(end, date.month, kDigits);
  *end++ = '-';
  end = appendNumber(end, date.day, kDigits);
  *end++ = ' ';
  end = appendNumber(end, date.hour, kDigits);
  *end++ = ':';
  end = appendNumber(end, date.minute, kDigits);
  *end = '\0';
  return result;
}

enum class Today { kFound, kOver, kFailed };

// The first run of today after the current minute; one of this minute has been started already.
Today ZELOSchedTDayNextRunTime(const ZELO_SCHED_TASK *pTask, const ZELO_SCHED_DATE &now,
                               TriggerText *result) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", Today::kFailed);
  const uint32_t nowHM = now.hour * kHourFactor + now.minute;
  for (const uint32_t hour : schedHoursOf(*pTask)) {
    const uint64_t runHM = uint64_t{hour} * kHourFactor + pTask->RunMin;
    if (runHM > nowHM) {
      ZELO_SCHED_DATE date = now;
      date.hour = static_cast<uint32_t>(runHM / kHourFactor);
      date.minute = static_cast<uint32_t>(runHM % kHourFactor);
      *result = written(date);
      return Today::kFound;
    }
  }
  return Today::kOver;
}

// Without any day of the week the result is 8, which is then shown.
uint32_t daysToNextWeekday(const ZELO_SCHED_TASK &task, uint32_t weekday) {
  uint32_t days = 1;
  while (days <= kDaysOfWeek && !schedIsWeekdayOn(task, (weekday + days) % kDaysOfWeek)) {
    ++days;
  }
  return days;
}

// The next day that fits the task, before it is normalised.
ZELO_SCHED_DATE nextDay(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &now) {
  ZELO_SCHED_DATE date = now;
  switch (task.Type) {
    case ZELO_SCHED_TYPE_DAILY:
      date.day += 1;
      return date;
    case ZELO_SCHED_TYPE_WEEKLY:
      date.day += daysToNextWeekday(task, now.weekday);
      return date;
    case ZELO_SCHED_TYPE_MONTHLY:
      date.month += task.StartDay <= now.day ? 1 : 0;
      date.day = task.StartDay;
      return date;
    case ZELO_SCHED_TYPE_YEARLY:
      date.year +=
          task.StartMonth < now.month || (task.StartMonth == now.month && task.StartDay <= now.day)
              ? 1
              : 0;
      date.month = task.StartMonth;
      date.day = task.StartDay;
      return date;
    default:
      date = {};
      date.hour = now.hour;
      date.minute = now.minute;
      return date;
  }
}

int ZELOSchedNextRunEstimate(const ZELO_SCHED_TASK &task, SchedTriggerClock *clock,
                             TriggerText *result) {
  if (task.Type == ZELO_SCHED_TYPE_ONCE) {
    copyText(result->text, kNever);
    return 0;
  }
  ZELO_SCHED_DATE date = nextDay(task, clock->now());
  if (clock->normalize(&date) < 0) {
    SCHED_LOG_CALLEE("date normalization failed. ");
    return -1;
  }
  date.hour = task.RunHour;
  date.minute = task.RunMin;
  *result = written(date);
  return 0;
}

// The start date of the other types is ignored, though they do not run before it.
bool isStartShown(const ZELO_SCHED_TASK &task) {
  return schedHasDayOfMonth(task);
}

// An unknown type counts as weekly.
bool isShownToday(const ZELO_SCHED_TASK &task, const ZELO_SCHED_DATE &now) {
  if (isStartShown(task)) {
    return schedIsDueDay(task, now);
  }
  return task.Type == ZELO_SCHED_TYPE_DAILY || schedIsWeekdayOn(task, now.weekday);
}

int triggerText(const ZELO_SCHED_TASK &task, SchedTriggerClock *clock, TriggerText *result) {
  if (clock->read() < 0) {
    SCHED_LOG_CALLEE("get date failed. ");
    return -1;
  }
  const ZELO_SCHED_DATE &now = clock->now();
  ZELO_SCHED_DATE start = schedStartDay(task);
  if (isStartShown(task) && schedCompareDays(now, start) < 0) {
    start.hour = task.RunHour;
    start.minute = task.RunMin;
    *result = written(start);
    return 0;
  }
  if (isShownToday(task, now)) {
    const Today today = ZELOSchedTDayNextRunTime(&task, now, result);
    if (today == Today::kFailed) {
      SCHED_LOG_CALLEE("ZELOSchedTDayNextRunTime failed. ");
      return -1;
    }
    if (today == Today::kFound) {
      return 0;
    }
  }
  return ZELOSchedNextRunEstimate(task, clock, result);
}

}  // namespace

int ZELOSchedDateNormalize(ZELO_SCHED_DATE *pDate) {
  SCHED_CHECK_ARG(pDate != nullptr, "((void *)0) != pDate", -1);
  struct tm fields = {};
  fields.tm_year = static_cast<int>(pDate->year - kFirstYear);
  fields.tm_mon = static_cast<int>(pDate->month - 1);
  fields.tm_mday = static_cast<int>(pDate->day);
  fields.tm_hour = static_cast<int>(pDate->hour);
  fields.tm_min = static_cast<int>(pDate->minute);
  fields.tm_isdst = 0;  // standard time, not "unknown": see the header on summer time
  fields.tm_wday = -1;  // stays so when mktime fails; its result -1 is also a valid time
  const time_t seconds = mktime(&fields);
  if (fields.tm_wday < 0) {
    SCHED_LOG_ERRNO("mktime failed. ");
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  // localtime would check the time zone for a change, which mktime has just done.
  struct tm local = {};
  if (localtime_r(&seconds, &local) == nullptr) {
    SCHED_LOG_ERRNO("localtime failed. ");
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  pDate->year = static_cast<uint32_t>(local.tm_year) + kFirstYear;
  pDate->month = static_cast<uint32_t>(local.tm_mon + 1);
  pDate->day = static_cast<uint32_t>(local.tm_mday);
  pDate->weekday = static_cast<uint32_t>(local.tm_wday);
  pDate->hour = static_cast<uint32_t>(local.tm_hour);
  pDate->minute = static_cast<uint32_t>(local.tm_min);
  return 0;
}

int SchedTriggerClock::read() {
  if (isRead_) {
    return 0;
  }
  if (ZELOSchedDateGet(&now_) < 0) {
    return -1;
  }
  isRead_ = true;
  return 0;
}

int SchedTriggerClock::normalize(ZELO_SCHED_DATE *pDate) {
  if (isNormalized_ && memcmp(pDate, &given_, sizeof(given_)) == 0) {
    *pDate = normalized_;
    return 0;
  }
  const ZELO_SCHED_DATE given = *pDate;
  if (ZELOSchedDateNormalize(pDate) < 0) {
    return -1;
  }
  given_ = given;
  normalized_ = *pDate;
  isNormalized_ = true;
  return 0;
}

int schedNextTriggerTime(ZELO_SCHED_TASK *pTask, SchedTriggerClock *clock) {
  TriggerText result = {};
  if (triggerText(*pTask, clock, &result) < 0) {
    SCHED_LOG_CALLEE("get trigger date failed. [%ld] ", static_cast<long>(pTask->ID));
    return -1;
  }
  copyText(pTask->NextTriggerTime, result.text);
  return 0;
}

int ZELOSchedNextTriggerTime(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SchedTriggerClock clock;
  return schedNextTriggerTime(pTask, &clock);
}
