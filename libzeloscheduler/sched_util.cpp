// The clock, dates and times as texts, and the seed of the random waits.
#include <unistd.h>
#include <zelosched.h>

#include <cstdlib>
#include <cstring>
#include <ctime>

#include "sched_report.h"
#include "sched_text.h"
#include "schedule_days.h"

namespace {

constexpr int kFirstYearOfTm = 1900;

// Whether the text has only digits and that separator.
bool consistsOf(const char *szText, char separator) {
  for (; *szText != '\0'; ++szText) {
    if ((*szText < '0' || *szText > '9') && *szText != separator) {
      return false;
    }
  }
  return true;
}

bool hasLength(const char *szText, size_t shortest, size_t longest) {
  const size_t length = strnlen(szText, longest + 1);
  return length >= shortest && length <= longest;
}

uint32_t number(const char *szText) {
  return static_cast<uint32_t>(strtoul(szText, nullptr, kDecimal));
}

bool parseDate(const char *szDate, ZELO_SCHED_DATE *pDate) {
  constexpr size_t kShortest = 8;
  constexpr size_t kLongest = 10;
  constexpr std::ptrdiff_t kYearDigits = 4;
  constexpr std::ptrdiff_t kLongestMonth = 2;
  if (!hasLength(szDate, kShortest, kLongest)) {
    return false;
  }
  char szText[16];
  copyText(szText, szDate);
  if (!consistsOf(szText, '/')) {
    return false;
  }
  const char *firstSlash = strchr(szText, '/');
  if (firstSlash == nullptr || firstSlash - szText != kYearDigits) {
    return false;
  }
  const char *month = firstSlash + 1;
  const char *secondSlash = strchr(month, '/');
  if (secondSlash == nullptr || secondSlash == month || secondSlash - month > kLongestMonth) {
    return false;
  }
  pDate->year = number(szText);
  pDate->month = number(month);
  pDate->day = number(secondSlash + 1);
  return true;
}

bool parseTime(const char *szTime, ZELO_SCHED_DATE *pDate) {
  constexpr size_t kShortest = 3;
  constexpr size_t kLongest = 5;
  if (!hasLength(szTime, kShortest, kLongest)) {
    return false;
  }
  char szText[8];
  copyText(szText, szTime);
  if (!consistsOf(szText, ':')) {
    return false;
  }
  const char *colon = strchr(szText, ':');
  if (colon == nullptr || (colon - szText != 1 && colon - szText != 2)) {
    return false;
  }
  pDate->hour = number(szText);
  pDate->minute = number(colon + 1);
  return true;
}

}  // namespace

int ZELOSchedDateGet(ZELO_SCHED_DATE *pDate) {
  SCHED_CHECK_ARG(pDate != nullptr, "((void *)0) != pDate", -1);
  const time_t now = time(nullptr);
  const struct tm *local = localtime(&now);
  if (local == nullptr) {
    SCHED_LOG_ERRNO("localtime failed. ");
    SCHED_SET_ERROR(kErrSystem);
    return -1;
  }
  pDate->year = static_cast<uint32_t>(local->tm_year + kFirstYearOfTm);
  pDate->month = static_cast<uint32_t>(local->tm_mon + 1);
  pDate->day = static_cast<uint32_t>(local->tm_mday);
  pDate->weekday = static_cast<uint32_t>(local->tm_wday);
  pDate->hour = static_cast<uint32_t>(local->tm_hour);
  pDate->minute = static_cast<uint32_t>(local->tm_min);
  return 0;
}

int ZELOSchedDateComp(const ZELO_SCHED_DATE *pDate1, const ZELO_SCHED_DATE *pDate2) {
  SCHED_CHECK_ARG(pDate1 != nullptr, "((void *)0) != pDate1", -1);
  SCHED_CHECK_ARG(pDate2 != nullptr, "NULL != pDate2", -1);
  return schedCompareDays(*pDate1, *pDate2);
}

int ZELOSchedDateParse(const char *szDateOrg, ZELO_SCHED_DATE *pDate) {
  SCHED_CHECK_ARG(szDateOrg != nullptr, "((void *)0) != szDateOrg", -1);
  SCHED_CHECK_ARG(pDate != nullptr, "NULL != pDate", -1);
  if (!parseDate(szDateOrg, pDate)) {
    SCHED_LOG("Bad date format: [%s]", szDateOrg);
    SCHED_SET_ERROR(kErrMalformed);
    return -1;
  }
  return 0;
}

int ZELOSchedTimeParse(const char *szTimeOrg, ZELO_SCHED_DATE *pDate) {
  SCHED_CHECK_ARG(szTimeOrg != nullptr, "((void *)0) != szTimeOrg", -1);
  SCHED_CHECK_ARG(pDate != nullptr, "NULL != pDate", -1);
  if (!parseTime(szTimeOrg, pDate)) {
    SCHED_LOG("Bad time format: [%s]", szTimeOrg);
    SCHED_SET_ERROR(kErrMalformed);
    return -1;
  }
  return 0;
}

void ZELOSchedRandInit(void) {
  // A forked run seeds again: with its parent's seed, runs started together would wait equally
  // long and collide again.
  static pid_t seededProcess = 0;
  const pid_t self = getpid();
  if (seededProcess == self) {
    return;
  }
  seededProcess = self;
  srand(static_cast<unsigned>(time(nullptr)) + static_cast<unsigned>(self));
}
