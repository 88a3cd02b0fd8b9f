// The next trigger time of random tasks against a walk through the calendar, minute by minute, that
// asks of each minute whether the task is due in it. The walk has a calendar of its own, without
// time zones. Where the shown time is known to differ from the next run, the walk accounts for it:
//
//   - a day that its month lacks is shown as a day of the month after it (31 April as 1 May);
//   - a start date to come is shown as stored, whether it exists or not;
//   - a week without days is shown eight days ahead;
//   - in the last hour of a day, a next day in summer time is shown one day too late.
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <map>
#include <optional>
#include <random>
#include <string>
#include <tuple>

#include "captured_log.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "soak.h"
#include "tasks.h"

namespace support {
namespace {

using std::chrono::days;
using std::chrono::months;
using std::chrono::sys_days;
using std::chrono::weekday;
using std::chrono::year;
using std::chrono::year_month;
using std::chrono::year_month_day;

const int kCasesPerZone = timesSoaked(10000);
const int kLeastOfEachKind = kCasesPerZone / 200;
constexpr int kSeed = 20130507;
constexpr int kMinutesPerHour = 60;
constexpr int kMinutesPerDay = 24 * kMinutesPerHour;
constexpr int kSecondsPerMinute = 60;
constexpr int kLastHour = 23;

struct Zone {
  const char *name;
  int minutesEast;
  bool hasSummerTime;
};

void PrintTo(const Zone &zone, std::ostream *out) {
  *out << zone.name;
}

struct Minute {
  sys_days day;
  int ofDay;
};

// ---- the walk

std::tuple<int, unsigned, unsigned> dateNumbers(sys_days day) {
  const year_month_day date(day);
  return {int(date.year()), unsigned(date.month()), unsigned(date.day())};
}

std::tuple<int, unsigned, unsigned> startNumbers(const ZELO_SCHED_TASK &task) {
  return {static_cast<int>(task.StartYear), task.StartMonth, task.StartDay};
}

bool hasStartDate(const ZELO_SCHED_TASK &task) {
  return task.Type != ZELO_SCHED_TYPE_DAILY && task.Type != ZELO_SCHED_TYPE_WEEKLY;
}

bool startIsToCome(const ZELO_SCHED_TASK &task, sys_days today) {
  return hasStartDate(task) && dateNumbers(today) < startNumbers(task);
}

bool startExists(const ZELO_SCHED_TASK &task) {
  return (year(static_cast<int>(task.StartYear)) / static_cast<int>(task.StartMonth) /
          static_cast<int>(task.StartDay))
      .ok();
}

bool isDueInMinute(const ZELO_SCHED_TASK &task, int ofDay) {
  const auto hour = static_cast<uint32_t>(ofDay / kMinutesPerHour);
  const auto minute = static_cast<uint32_t>(ofDay % kMinutesPerHour);
  if (minute != task.RunMin || hour < task.RunHour) return false;
  if (hour == task.RunHour) return true;
  return task.RepeatHour != 0 && hour <= task.LastWorkHour &&
         (hour - task.RunHour) % task.RepeatHour == 0;
}

// Days beyond the end of the text are on.
bool isWeekdayOn(const ZELO_SCHED_TASK &task, sys_days day) {
  const std::string week = task.Week;
  const size_t at = weekday(day).c_encoding();
  return at >= week.size() || week[at] != '0';
}

bool isRunDay(const ZELO_SCHED_TASK &task, sys_days day) {
  const year_month_day date(day);
  switch (task.Type) {
    case ZELO_SCHED_TYPE_ONCE:
      return dateNumbers(day) == startNumbers(task);
    case ZELO_SCHED_TYPE_DAILY:
      return true;
    case ZELO_SCHED_TYPE_WEEKLY:
      return isWeekdayOn(task, day);
    case ZELO_SCHED_TYPE_MONTHLY:
      return unsigned(date.day()) == task.StartDay;
    default:
      return unsigned(date.day()) == task.StartDay && unsigned(date.month()) == task.StartMonth;
  }
}

// Whether `day` stands for one that the month before lacks. Only months that have not passed yet
// are looked at.
bool isSpilledDay(const ZELO_SCHED_TASK &task, sys_days day, sys_days today) {
  const year_month_day date(day);
  const year_month_day now(today);
  const year_month before = year_month(date.year(), date.month()) - months(1);
  if (before < year_month(now.year(), now.month())) return false;
  if (task.Type == ZELO_SCHED_TYPE_YEARLY) {
    if (unsigned(before.month()) != task.StartMonth) return false;
  } else if (task.Type != ZELO_SCHED_TYPE_MONTHLY) {
    return false;
  }
  const auto length = unsigned((before / std::chrono::last).day());
  return task.StartDay > length && unsigned(date.day()) == task.StartDay - length;
}

// The first minute after `now` in which the task is due; nothing when there is none.
std::optional<Minute> walk(const ZELO_SCHED_TASK &task, const Minute &now, bool *spilled) {
  constexpr days kLongestWait(5 * 366);
  for (sys_days day = now.day; day <= now.day + kLongestWait; day += days(1)) {
    if (startIsToCome(task, day)) continue;
    *spilled = !isRunDay(task, day);
    if (*spilled && !isSpilledDay(task, day, now.day)) continue;
    for (int ofDay = day == now.day ? now.ofDay + 1 : 0; ofDay < kMinutesPerDay; ++ofDay) {
      if (isDueInMinute(task, ofDay)) return Minute{day, ofDay};
    }
  }
  return std::nullopt;
}

// In Central Europe, at 23 o'clock standard time.
bool isSummerAtNight(sys_days day) {
  const year_month_day date(day);
  return day >=
             sys_days(date.year() / std::chrono::March / std::chrono::Sunday[std::chrono::last]) &&
         day <
             sys_days(date.year() / std::chrono::October / std::chrono::Sunday[std::chrono::last]);
}

std::string text(const std::tuple<int, unsigned, unsigned> &date, unsigned hour, unsigned minute) {
  const auto &[y, m, d] = date;
  char buffer[64];
  std::snprintf(buffer, sizeof(buffer), "%04d-%02u-%02u %02u:%02u", y, m, d, hour, minute);
  return buffer;
}

std::string text(const Minute &minute) {
  return text(dateNumbers(minute.day), static_cast<unsigned>(minute.ofDay / kMinutesPerHour),
              static_cast<unsigned>(minute.ofDay % kMinutesPerHour));
}

// Counts each kind of result, so that a kind that never occurs fails the test.
struct Expected {
  std::string kind;
  std::string text;
};

Expected expected(const ZELO_SCHED_TASK &task, const Minute &now, const Zone &zone) {
  if (startIsToCome(task, now.day) && !startExists(task)) {
    return {"as stored", text(startNumbers(task), task.RunHour, task.RunMin)};
  }
  bool spilled = false;
  std::optional<Minute> next = walk(task, now, &spilled);
  std::string kind = spilled ? "spilled" : "later";
  if (!next && task.Type == ZELO_SCHED_TYPE_ONCE) return {"never", "N/A"};
  if (!next) {
    constexpr days kBeyondTheWeek(8);
    next = Minute{now.day + kBeyondTheWeek,
                  static_cast<int>(task.RunHour * kMinutesPerHour + task.RunMin)};
    kind = "no weekday";
  }
  if (next->day == now.day) return {"today", text(*next)};
  if (startIsToCome(task, now.day)) return {"start", text(*next)};
  if (zone.hasSummerTime && now.ofDay / kMinutesPerHour == kLastHour &&
      isSummerAtNight(next->day)) {
    next->day += days(1);
    kind = "summer night";
  }
  return {kind, text(*next)};
}

// ---- random tasks at random minutes

class RandomCases {
 public:
  explicit RandomCases(unsigned seed) : random_(seed) {}

  Minute minute(const ZELO_SCHED_TASK &task) {
    const int month = oneOf({1, 1, 2, 2, 2, 3, 4, 5, 6, 7, 9, 10, 11, 12, 12, 12});
    const year_month_day first = year(below(115) + 1990) / month / 1;
    sys_days day(first);
    if (below(4) != 0) {
      day += days(oneOf({-2, -1, 0, 0, 1, 27, 28, 29, 30}));
    } else {
      day += days(below(31));
    }
    const auto run = static_cast<int>(task.RunHour * kMinutesPerHour + task.RunMin);
    const int ofDay = oneOf({0, kMinutesPerDay - 1, run - 1, run, run + 1, below(kMinutesPerDay),
                             below(kMinutesPerDay), kMinutesPerDay - 1 - below(kMinutesPerHour)});
    return {day, std::clamp(ofDay, 0, kMinutesPerDay - 1)};
  }

  Task task() {
    Task made = makeTask("random", "true");
    made->Type = below(5);
    made->RunHour = static_cast<uint32_t>(oneOf({0, kLastHour, below(24), below(24)}));
    made->RunMin = static_cast<uint32_t>(oneOf({0, 59, below(60), below(60)}));
    made->RepeatHour = chance(10) ? hostile() : static_cast<uint32_t>(oneOf({0, 0, 1, below(25)}));
    made->LastWorkHour = chance(10) ? hostile() : static_cast<uint32_t>(below(30));
    for (int i = 0; i < 7; ++i) made->Week[i] = oneOf({'0', '0', '0', '1', '1', 'x'});
    if (chance(20)) setText(made->Week, "0000000");
    if (chance(10)) made->Week[below(7)] = '\0';
    return made;
  }

  // A start date around today, which need not exist.
  void setStart(ZELO_SCHED_TASK *task, sys_days today) {
    year_month_day start(today + days(oneOf({0, 0, -1, 1, below(800) - 600, below(800) - 600})));
    task->StartYear = static_cast<uint32_t>(int(start.year()));
    task->StartMonth = unsigned(start.month());
    task->StartDay = unsigned(start.day());
    if (chance(2)) task->StartDay = static_cast<uint32_t>(oneOf({28, 29, 30, 31, 1 + below(31)}));
    if (chance(4)) task->StartMonth = static_cast<uint32_t>(oneOf({2, 1 + below(12)}));
  }

  int below(int bound) { return static_cast<int>(random_() % static_cast<unsigned>(bound)); }

 private:
  bool chance(int oneIn) { return below(oneIn) == 0; }

  uint32_t hostile() {
    constexpr uint32_t kNumbers[] = {24, 31, 99, UINT32_MAX - 23, UINT32_MAX - 1, UINT32_MAX};
    return kNumbers[below(static_cast<int>(std::size(kNumbers)))];
  }

  template <typename Value>
  Value oneOf(std::initializer_list<Value> values) {
    return values.begin()[below(static_cast<int>(values.size()))];
  }

  std::mt19937 random_;
};

std::string description(const ZELO_SCHED_TASK &task, const Minute &now) {
  return "now " + text(now) + " type " + std::to_string(task.Type) + " week " + task.Week +
         " start " + text(startNumbers(task), task.RunHour, task.RunMin) + " repeat " +
         std::to_string(task.RepeatHour) + " last " + std::to_string(task.LastWorkHour);
}

void setClockTo(const Minute &now, int second, const Zone &zone) {
  if (zone.hasSummerTime) {
    setClock(text(now));
    return;
  }
  const auto minutes = now.day.time_since_epoch().count() * long{kMinutesPerDay} + now.ofDay;
  setClock(static_cast<time_t>((minutes - zone.minutesEast) * kSecondsPerMinute + second));
}

// Local times in the hour that a spring night skips do not exist.
bool exists(const Minute &now, const Zone &zone) {
  constexpr int kSkippedHour = 2;
  const bool summerBegins = isSummerAtNight(now.day) && !isSummerAtNight(now.day - days(1));
  return !zone.hasSummerTime || !summerBegins || now.ofDay / kMinutesPerHour != kSkippedHour;
}

class NextTriggerPropertyTest : public SandboxTest, public testing::WithParamInterface<Zone> {};

TEST_P(NextTriggerPropertyTest, ItIsTheFirstMinuteOfAWalkInWhichTheTaskIsDue) {
  const Zone &zone = GetParam();
  setZone(zone.name);
  RandomCases cases(static_cast<unsigned>(kSeed + zone.minutesEast));
  std::map<std::string, int> kinds;
  for (int i = 0; i < kCasesPerZone && !HasFailure(); ++i) {
    const Task task = cases.task();
    const Minute now = cases.minute(*task);
    cases.setStart(task.get(), now.day);
    if (!exists(now, zone)) continue;
    SCOPED_TRACE(description(*task, now));
    setClockTo(now, cases.below(kSecondsPerMinute), zone);
    const Expected wanted = expected(*task, now, zone);
    ++kinds[wanted.kind];
    ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    EXPECT_EQ(task->NextTriggerTime, wanted.text) << wanted.kind;
  }
  for (const char *kind :
       {"today", "later", "start", "never", "spilled", "as stored", "no weekday"}) {
    EXPECT_GE(kinds[kind], kLeastOfEachKind) << kind;
  }
  EXPECT_EQ(kinds["summer night"] >= kLeastOfEachKind, zone.hasSummerTime);
  EXPECT_EQ(logged(), std::vector<std::string>{});
}

INSTANTIATE_TEST_SUITE_P(Zones, NextTriggerPropertyTest,
                         testing::Values(Zone{"UTC", 0, false}, Zone{"EST5", -300, false},
                                         Zone{"IST-5:30", 330, false},
                                         Zone{"<+1245>-12:45", 765, false},
                                         Zone{"<-0930>9:30", -570, false},
                                         Zone{"CET-1CEST,M3.5.0,M10.5.0/3", 60, true}));

}  // namespace
}  // namespace support
