// Tasks over the days on which the clock changes, under odd zones, on leap days, and when the clock
// is set back. Cron asks at each minute that the local clock shows; what is asserted is when a task
// is due then, and what is shown as its next run, also where that surprises:
//
//   - a minute that a spring night skips is shown, and the task is not due on that day;
//   - a minute that an autumn night repeats is one twice, and the task is due twice;
//   - in the last hour of a day, a next day in summer time is shown one day too late;
//   - a clock that is set back makes what has run due again.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

using Moments = std::vector<std::string>;

constexpr time_t kMinute = 60;
constexpr time_t kDay = 24 * 60 * kMinute;
constexpr size_t kTextSize = 32;

std::string textOf(time_t moment, const char *format = "%Y-%m-%d %H:%M") {
  char text[kTextSize];
  struct tm local = {};
  localtime_r(&moment, &local);
  strftime(text, sizeof(text), format, &local);
  return text;
}

class ClockChangesTest : public SandboxTest {
 protected:
  bool isDue(long id) {
    resetFailingCalls();
    failCall("QLIBCProcForkChildNoWait", {.times = kAlways, .result = 1});
    EXPECT_EQ(ZELOSchedTaskRun(id, 1, 1), 0);
    return callCount("QLIBCProcForkChildNoWait") == 1;
  }

  std::string next(const Task &task) {
    EXPECT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    return task->NextTriggerTime;
  }

  // The minutes, as the local clock shows them, in which the task is due from one moment to
  // another.
  Moments dueBetween(long id, time_t begin, time_t end, const char *format = "%Y-%m-%d %H:%M %Z") {
    Moments due;
    for (time_t now = begin; now < end; now += kMinute) {
      setClock(now);
      if (isDue(id)) due.push_back(textOf(now, format));
    }
    return due;
  }

  Task daily(uint32_t hour, uint32_t minute) {
    Task task = makeTask("daily", "true");
    task->RunHour = hour;
    task->RunMin = minute;
    return task;
  }
};

// ---- summer time

struct SummerTime {
  const char *zone;
  const char *spring;    // the day on which two o'clock becomes three
  const char *skipped;   // a minute that this day lacks
  const char *autumn;    // the day on which an hour comes twice
  const char *repeated;  // a minute in it
  const char *summer, *winter;
};

void PrintTo(const SummerTime &rule, std::ostream *out) {
  *out << rule.zone;
}

class SummerTimeTest : public ClockChangesTest, public testing::WithParamInterface<SummerTime> {
 protected:
  void SetUp() override {
    ClockChangesTest::SetUp();
    setZone(GetParam().zone);
  }

  static Task dailyAt(const char *time) {
    Task task = makeTask("daily", "true");
    task->RunHour = static_cast<uint32_t>(std::stoi(time));
    task->RunMin = static_cast<uint32_t>(std::stoi(time + 3));
    return task;
  }
  static time_t at(const char *day, const char *time) {
    return localTime(std::string(day) + " " + time);
  }
  static std::string dayBefore(const char *day) { return textOf(at(day, "12:00") - kDay, "%F"); }
  static std::string dayAfter(const char *day) { return textOf(at(day, "12:00") + kDay, "%F"); }
};

TEST_P(SummerTimeTest, AMinuteThatASpringNightSkipsIsShownAndNeverDue) {
  const SummerTime &rule = GetParam();
  const Task task = dailyAt(rule.skipped);
  const long id = saveTask(task);
  const std::string tomorrow = dayAfter(rule.spring);
  EXPECT_EQ(dueBetween(id, at(rule.spring, "00:00"), at(tomorrow.c_str(), "00:00")), Moments{});
  EXPECT_EQ(
      dueBetween(id, at(tomorrow.c_str(), "00:00"), at(tomorrow.c_str(), "12:00"), "%F %H:%M"),
      Moments{tomorrow + " " + rule.skipped});
  setClock(std::string(rule.spring) + " 01:59");
  EXPECT_EQ(next(task), std::string(rule.spring) + " " + rule.skipped);
  setClock(std::string(rule.spring) + " 03:00");
  EXPECT_EQ(next(task), tomorrow + " " + rule.skipped);
}

TEST_P(SummerTimeTest, AMinuteThatAnAutumnNightRepeatsIsDueTwice) {
  const SummerTime &rule = GetParam();
  const Task task = dailyAt(rule.repeated);
  const long id = saveTask(task);
  const std::string when = std::string(rule.autumn) + " " + rule.repeated;
  EXPECT_EQ(dueBetween(id, at(rule.autumn, "00:00"), at(rule.autumn, "12:00")),
            (Moments{when + " " + rule.summer, when + " " + rule.winter}));
}

TEST_P(SummerTimeTest, AfterItsFirstRunARepeatedMinuteIsShownForTomorrowThenForTodayAgain) {
  const SummerTime &rule = GetParam();
  const Task task = dailyAt(rule.repeated);
  const std::string today = std::string(rule.autumn) + " " + rule.repeated;
  const std::string tomorrow = dayAfter(rule.autumn) + " " + rule.repeated;
  const time_t first = at(rule.autumn, "00:00") + (task->RunHour * 60 + task->RunMin) * kMinute;
  ASSERT_EQ(textOf(first, "%F %H:%M %Z"), today + " " + rule.summer);
  const std::vector<std::pair<time_t, std::string>> shown = {
      {first - kMinute, today},         {first, tomorrow},
      {first + 29 * kMinute, tomorrow}, {first + 31 * kMinute, today},
      {first + 59 * kMinute, today},    {first + 60 * kMinute, tomorrow}};
  for (const auto &[moment, wanted] : shown) {
    setClock(moment);
    EXPECT_EQ(next(task), wanted) << textOf(moment, "%F %H:%M %Z");
  }
}

TEST_P(SummerTimeTest, EveryHourIsDueOnceForEachHourThatTheDayHas) {
  const SummerTime &rule = GetParam();
  Task task = daily(0, 15);
  task->RepeatHour = 1;
  task->LastWorkHour = 23;
  const long id = saveTask(task);
  const auto dueOn = [&](const char *day) {
    const std::string tomorrow = dayAfter(day);
    return dueBetween(id, at(day, "00:00"), at(tomorrow.c_str(), "00:00")).size();
  };
  EXPECT_EQ(dueOn(rule.spring), 23U);
  EXPECT_EQ(dueOn(rule.autumn), 25U);
  EXPECT_EQ(dueOn(dayBefore(rule.spring).c_str()), 24U);
}

TEST_P(SummerTimeTest, InTheLastHourTheNextDayInSummerIsShownADayTooLate) {
  const SummerTime &rule = GetParam();
  const Task task = daily(12, 0);
  const std::string after = dayAfter(rule.spring);
  setClock(std::string(rule.spring) + " 22:59");
  EXPECT_EQ(next(task), after + " 12:00");
  setClock(std::string(rule.spring) + " 23:00");
  EXPECT_EQ(next(task), dayAfter(after.c_str()) + " 12:00");
  EXPECT_EQ(dueBetween(saveTask(task), at(after.c_str(), "11:00"), at(after.c_str(), "13:00"),
                       "%F %H:%M"),
            Moments{after + " 12:00"})
      << "it runs on its day all the same";
  setClock(dayBefore(rule.autumn) + " 23:00");
  EXPECT_EQ(next(task), std::string(rule.autumn) + " 12:00") << "the next day ends in winter time";
}

INSTANTIATE_TEST_SUITE_P(Zones, SummerTimeTest,
                         testing::Values(SummerTime{"CET-1CEST,M3.5.0,M10.5.0/3", "2013-03-31",
                                                    "02:30", "2013-10-27", "02:30", "CEST", "CET"},
                                         SummerTime{"EST5EDT,M3.2.0,M11.1.0", "2014-03-09", "02:30",
                                                    "2014-11-02", "01:30", "EDT", "EST"},
                                         SummerTime{"AEST-10AEDT,M10.1.0,M4.1.0/3", "2015-10-04",
                                                    "02:30", "2015-04-05", "02:30", "AEDT",
                                                    "AEST"}),
                         [](const testing::TestParamInfo<SummerTime> &param) {
                           return std::string(param.param.winter);
                         });

// ---- far zones

// The sign is the other way round there: twelve hours behind.
TEST_F(ClockChangesTest, TwelveHoursBehindTheDayIsTheLocalOne) {
  setZone("GMT+12");
  Task task = makeTask("weekly", "true");
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->Week, "0100000");  // Mondays
  const long id = saveTask(task);
  constexpr time_t kTuesdayNoon = 1367928000;  // 2013-05-07 12:00 UTC, midnight there
  setClock(kTuesdayNoon - kMinute);
  EXPECT_EQ(textOf(kTuesdayNoon - kMinute), "2013-05-06 23:59");
  EXPECT_EQ(next(task), "2013-05-13 00:00");
  EXPECT_EQ(dueBetween(id, kTuesdayNoon - 2 * kDay, kTuesdayNoon + 2 * kDay),
            Moments{"2013-05-06 00:00 GMT"});
}

// ---- leap days

Task onLeapDays() {
  Task task = makeTask("leap day", "true");
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  task->StartYear = 2012;
  task->StartMonth = 2;
  task->StartDay = 29;
  return task;
}

TEST_F(ClockChangesTest, TheTwentyNinthOfFebruaryIsDueInLeapYearsOnlyUpTo2100) {
  setZone("UTC");
  const Task task = onLeapDays();
  const long id = saveTask(task);
  for (int year = 2012; year <= 2100; ++year) {
    const bool isLeap = year % 4 == 0 && year != 2100;
    const std::string day = std::to_string(year);
    setClock(day + "-02-28 00:00");
    EXPECT_FALSE(isDue(id)) << day;
    setClock(day + "-03-01 00:00");
    EXPECT_FALSE(isDue(id)) << day;
    setClock(localTime(day + "-02-28 00:00") + kDay);
    EXPECT_EQ(isDue(id), isLeap) << day;
  }
}

TEST_F(ClockChangesTest, ALeapDayThatAYearLacksIsShownAsTheFirstOfMarch) {
  setZone("UTC");
  const Task task = onLeapDays();
  for (int year = 2012; year < 2100; ++year) {
    setClock(std::to_string(year) + "-03-01 00:00");
    const std::string following = std::to_string(year + 1);
    const bool isLeap = (year + 1) % 4 == 0 && year + 1 != 2100;
    EXPECT_EQ(next(task), following + (isLeap ? "-02-29 00:00" : "-03-01 00:00"));
  }
}

TEST_F(ClockChangesTest, AMonthlyDayIsSkippedInMonthsThatLackIt) {
  setZone("UTC");
  Task task = makeTask("monthly", "true");
  task->Type = ZELO_SCHED_TYPE_MONTHLY;
  task->StartDay = 30;
  const long id = saveTask(task);
  Moments days;
  for (time_t now = localTime("2016-01-01 00:00"); now < localTime("2017-01-01 00:00");
       now += kDay) {
    setClock(now);
    if (isDue(id)) days.push_back(textOf(now, "%m-%d"));
  }
  EXPECT_EQ(days, (Moments{"01-30", "03-30", "04-30", "05-30", "06-30", "07-30", "08-30", "09-30",
                           "10-30", "11-30", "12-30"}));
}

// ---- a clock that is set back

TEST_F(ClockChangesTest, AClockSetBackShowsAndRunsAgain) {
  setZone("UTC");
  const Task task = daily(8, 30);
  const long id = saveTask(task);
  setClock("2013-05-07 08:30");
  EXPECT_TRUE(isDue(id));
  EXPECT_EQ(next(task), "2013-05-08 08:30");
  setClock("2013-05-07 08:29");
  EXPECT_EQ(next(task), "2013-05-07 08:30");
  setClock("2013-05-07 08:30");
  EXPECT_TRUE(isDue(id));
}

TEST_F(ClockChangesTest, AClockSetBackBeforeItsStartMakesATaskWait) {
  setZone("UTC");
  Task task = makeTask("once", "true");
  task->Type = ZELO_SCHED_TYPE_ONCE;
  task->StartYear = 2013;
  task->StartMonth = 5;
  task->StartDay = 7;
  const long id = saveTask(task);
  setClock("2013-05-08 00:00");
  EXPECT_EQ(next(task), "N/A");
  setClock("2013-05-06 00:00");
  EXPECT_EQ(next(task), "2013-05-07 00:00");
  EXPECT_FALSE(isDue(id));
  setClock("2013-05-07 00:00");
  EXPECT_TRUE(isDue(id));
}

// A machine whose battery is empty comes up at the beginning of time.
TEST_F(ClockChangesTest, BeforeEveryStartNothingIsDueAndDatesAreStillShown) {
  setZone("UTC");
  const Task task = daily(0, 0);
  const long id = saveTask(task);
  setClock(time_t{0});
  EXPECT_FALSE(isDue(id)) << "it starts in 2012";
  EXPECT_EQ(next(task), "1970-01-02 00:00") << "whose start is not looked at";
}

}  // namespace
}  // namespace support
