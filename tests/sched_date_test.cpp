// Dates that roll over, and the minute at which a task runs next.
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

// Summer time from the last Sunday in March to the last one in October, without a zone file.
constexpr char kCentralEurope[] = "CET-1CEST,M3.5.0,M10.5.0/3";
constexpr char kNever[] = "N/A";
constexpr char kFieldBefore[] = "as it was";
constexpr char kOverflowText[] = "Value too large for defined data type";

// 7 May 2013 was a Tuesday.
constexpr char kTuesdayMorning[] = "2013-05-07 07:00";

std::vector<uint32_t> fieldsOf(const ZELO_SCHED_DATE &date) {
  return {date.year, date.month, date.day, date.weekday, date.hour, date.minute};
}

std::vector<uint32_t> normalised(ZELO_SCHED_DATE date) {
  EXPECT_EQ(ZELOSchedDateNormalize(&date), 0);
  return fieldsOf(date);
}

using Fields = std::vector<uint32_t>;

struct Hours {
  uint32_t repeat = 0;
  uint32_t last = 0;
};

Task dailyTask(uint32_t hour, uint32_t minute, Hours hours = {}) {
  Task task = makeTask("task", "true");
  task->RunHour = hour;
  task->RunMin = minute;
  task->RepeatHour = hours.repeat;
  task->LastWorkHour = hours.last;
  return task;
}

Task weeklyTask(const std::string &week, uint32_t hour, uint32_t minute, Hours hours = {}) {
  Task task = dailyTask(hour, minute, hours);
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->Week, week);
  return task;
}

struct Day {
  uint32_t year, month, day;
};

Task datedTask(int32_t type, Day start, uint32_t hour, uint32_t minute, Hours hours = {}) {
  Task task = dailyTask(hour, minute, hours);
  task->Type = type;
  task->StartYear = start.year;
  task->StartMonth = start.month;
  task->StartDay = start.day;
  return task;
}

Task onceTask(Day start, uint32_t hour, uint32_t minute, Hours hours = {}) {
  return datedTask(ZELO_SCHED_TYPE_ONCE, start, hour, minute, hours);
}

Task monthlyTask(Day start, uint32_t hour, uint32_t minute, Hours hours = {}) {
  return datedTask(ZELO_SCHED_TYPE_MONTHLY, start, hour, minute, hours);
}

Task yearlyTask(Day start, uint32_t hour, uint32_t minute, Hours hours = {}) {
  return datedTask(ZELO_SCHED_TYPE_YEARLY, start, hour, minute, hours);
}

std::string nextAt(const std::string &now, const Task &task) {
  setClock(now);
  setText(task->NextTriggerTime, kFieldBefore);
  EXPECT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
  return task->NextTriggerTime;
}

class SchedDateTest : public SandboxTest {};

// ---- normalising

TEST_F(SchedDateTest, ADateWithinRangeStaysAndGetsItsWeekday) {
  EXPECT_EQ(normalised({2013, 5, 7, 99, 8, 30}), (Fields{2013, 5, 7, 2, 8, 30}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedDateTest, DaysMonthsHoursAndMinutesRollOver) {
  const struct {
    ZELO_SCHED_DATE date;
    Fields wanted;
  } rows[] = {
      {{2013, 1, 32, 0, 0, 0}, {2013, 2, 1, 5, 0, 0}},
      {{2013, 13, 1, 0, 0, 0}, {2014, 1, 1, 3, 0, 0}},
      {{2013, 2, 29, 0, 0, 0}, {2013, 3, 1, 5, 0, 0}},
      {{2012, 2, 29, 0, 0, 0}, {2012, 2, 29, 3, 0, 0}},
      {{2013, 2, 30, 0, 0, 0}, {2013, 3, 2, 6, 0, 0}},
      {{2013, 4, 31, 0, 7, 5}, {2013, 5, 1, 3, 7, 5}},
      {{2013, 12, 32, 0, 23, 59}, {2014, 1, 1, 3, 23, 59}},
      {{2013, 5, 7, 0, 24, 0}, {2013, 5, 8, 3, 0, 0}},
      {{2013, 5, 7, 0, 8, 60}, {2013, 5, 7, 2, 9, 0}},
      {{2013, 12, 31, 0, 23, 60}, {2014, 1, 1, 3, 0, 0}},
      {{2013, 5, 0, 0, 0, 0}, {2013, 4, 30, 2, 0, 0}},
      {{2013, 0, 7, 0, 0, 0}, {2012, 12, 7, 5, 0, 0}},
      {{1900, 2, 29, 0, 0, 0}, {1900, 3, 1, 4, 0, 0}},
      {{2100, 2, 28, 0, 0, 0}, {2100, 2, 28, 0, 0, 0}},
  };
  for (const auto &row : rows) {
    SCOPED_TRACE(testing::PrintToString(fieldsOf(row.date)));
    EXPECT_EQ(normalised(row.date), row.wanted);
  }
}

TEST_F(SchedDateTest, InSummerTheHourComesBackOneHigher) {
  setZone(kCentralEurope);
  EXPECT_EQ(normalised({2013, 7, 10, 0, 10, 15}), (Fields{2013, 7, 10, 3, 11, 15}));
  EXPECT_EQ(normalised({2013, 1, 10, 0, 10, 15}), (Fields{2013, 1, 10, 4, 10, 15}));
}

TEST_F(SchedDateTest, InTheLastHourOfASummerDayTheDateMovesOn) {
  setZone(kCentralEurope);
  EXPECT_EQ(normalised({2013, 7, 10, 0, 23, 10}), (Fields{2013, 7, 11, 4, 0, 10}));
  EXPECT_EQ(normalised({2013, 7, 31, 0, 23, 10}), (Fields{2013, 8, 1, 4, 0, 10}));
}

TEST_F(SchedDateTest, NormalisingNeedsADate) {
  EXPECT_EQ(ZELOSchedDateNormalize(nullptr), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_date.cpp"}));
  EXPECT_EQ(logged(), Lines{"sched_date.cpp:N Invaild Argument (((void *)0) != pDate)=[0]\n"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

TEST_F(SchedDateTest, ADateThatCannotBeConvertedBackStays) {
  failCall("localtime", {.error = EOVERFLOW});
  ZELO_SCHED_DATE date = {2013, 1, 32, 9, 8, 7};
  EXPECT_EQ(ZELOSchedDateNormalize(&date), -1);
  EXPECT_EQ(fieldsOf(date), (Fields{2013, 1, 32, 9, 8, 7}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_date.cpp"}));
  EXPECT_EQ(logged(), Lines{std::string("sched_date.cpp:N localtime failed. ") + kOverflowText});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

// ---- daily

TEST_F(SchedDateTest, ADailyRunStillAheadIsToday) {
  EXPECT_EQ(nextAt("2013-05-17 07:00", dailyTask(8, 30)), "2013-05-17 08:30");
}

TEST_F(SchedDateTest, ARunOfThisVeryMinuteIsPast) {
  EXPECT_EQ(nextAt("2013-05-17 08:30", dailyTask(8, 30)), "2013-05-18 08:30");
}

TEST_F(SchedDateTest, SecondsDoNotCount) {
  EXPECT_EQ(nextAt("2013-05-17 08:29:59", dailyTask(8, 30)), "2013-05-17 08:30");
  EXPECT_EQ(nextAt("2013-05-17 08:30:59", dailyTask(8, 30)), "2013-05-18 08:30");
}

TEST_F(SchedDateTest, AfterTheLastMinuteOfTheYearComesTheFirstOfJanuary) {
  EXPECT_EQ(nextAt("2013-12-31 23:59", dailyTask(8, 30)), "2014-01-01 08:30");
}

TEST_F(SchedDateTest, LeapDaysAreRespected) {
  EXPECT_EQ(nextAt("2012-02-28 12:00", dailyTask(8, 30)), "2012-02-29 08:30");
  EXPECT_EQ(nextAt("2013-02-28 12:00", dailyTask(8, 30)), "2013-03-01 08:30");
}

TEST_F(SchedDateTest, ADailyTaskIgnoresItsStartDate) {
  EXPECT_EQ(nextAt("2013-05-07 07:00", datedTask(ZELO_SCHED_TYPE_DAILY, {2030, 6, 31}, 8, 30)),
            "2013-05-07 08:30");
}

TEST_F(SchedDateTest, ADailyTaskIgnoresItsWeek) {
  Task task = dailyTask(8, 30);
  setText(task->Week, "0000000");
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30");
  EXPECT_EQ(nextAt("2013-05-07 09:00", task), "2013-05-08 08:30");
}

// ---- repeats within a day

TEST_F(SchedDateTest, TheNextRepeatOfTodayIsTaken) {
  EXPECT_EQ(nextAt("2013-05-07 12:00", dailyTask(8, 0, {2, 17})), "2013-05-07 14:00");
}

TEST_F(SchedDateTest, AfterTheLastRepeatComesTheFirstRunOfTomorrow) {
  EXPECT_EQ(nextAt("2013-05-07 16:30", dailyTask(8, 0, {2, 17})), "2013-05-08 08:00");
}

TEST_F(SchedDateTest, ARepeatMayStartInTheLastHour) {
  EXPECT_EQ(nextAt("2013-05-07 16:30", dailyTask(8, 45, {3, 17})), "2013-05-07 17:45");
}

TEST_F(SchedDateTest, ALastHourBeforeTheRunHourMeansOneRun) {
  EXPECT_EQ(nextAt("2013-05-07 08:30", dailyTask(8, 0, {1, 7})), "2013-05-08 08:00");
}

TEST_F(SchedDateTest, ALastHourWithoutRepeatsMeansOneRun) {
  EXPECT_EQ(nextAt("2013-05-07 08:30", dailyTask(8, 0, {0, 17})), "2013-05-08 08:00");
}

TEST_F(SchedDateTest, EveryHourOfTheDayCanBeARepeat) {
  const Task task = dailyTask(0, 15, {1, 23});
  EXPECT_EQ(nextAt("2013-05-07 00:00", task), "2013-05-07 00:15");
  for (int hour = 0; hour < 23; ++hour) {
    char now[32];
    char wanted[32];
    snprintf(now, sizeof(now), "2013-05-07 %02d:15", hour);
    snprintf(wanted, sizeof(wanted), "2013-05-07 %02d:15", hour + 1);
    EXPECT_EQ(nextAt(now, task), wanted);
  }
  EXPECT_EQ(nextAt("2013-05-07 23:15", task), "2013-05-08 00:15");
}

TEST_F(SchedDateTest, RepeatsCountForEveryTypeThatRunsToday) {
  const Hours everyTwoHours = {2, 17};
  const Task tasks[] = {
      onceTask({2013, 5, 7}, 8, 0, everyTwoHours),
      weeklyTask("0010000", 8, 0, everyTwoHours),
      monthlyTask({2013, 1, 7}, 8, 0, everyTwoHours),
      yearlyTask({2012, 5, 7}, 8, 0, everyTwoHours),
  };
  for (const Task &task : tasks) {
    EXPECT_EQ(nextAt("2013-05-07 12:00", task), "2013-05-07 14:00") << task->Type;
  }
}

// ---- weekly

TEST_F(SchedDateTest, AWeeklyRunStillAheadIsToday) {
  EXPECT_EQ(nextAt(kTuesdayMorning, weeklyTask("0010000", 8, 30)), "2013-05-07 08:30");
}

TEST_F(SchedDateTest, OnFridayAfterTheRunTheNextIsAWeekAway) {
  EXPECT_EQ(nextAt("2013-05-17 08:30", weeklyTask("0000010", 8, 30)), "2013-05-24 08:30");
}

TEST_F(SchedDateTest, EachWeekdayIsFoundFromTuesday) {
  const struct {
    const char *week;
    const char *wanted;
  } rows[] = {
      {"1000000", "2013-05-12 08:30"}, {"0100000", "2013-05-13 08:30"},
      {"0010000", "2013-05-14 08:30"}, {"0001000", "2013-05-08 08:30"},
      {"0000100", "2013-05-09 08:30"}, {"0000010", "2013-05-10 08:30"},
      {"0000001", "2013-05-11 08:30"}, {"1000001", "2013-05-11 08:30"},
      {"1111111", "2013-05-08 08:30"},
  };
  for (const auto &row : rows) {
    EXPECT_EQ(nextAt("2013-05-07 09:00", weeklyTask(row.week, 8, 30)), row.wanted) << row.week;
  }
}

TEST_F(SchedDateTest, AWeekdayWhoseTurnIsNotTodaySkipsTheRestOfToday) {
  EXPECT_EQ(nextAt(kTuesdayMorning, weeklyTask("0001000", 8, 30)), "2013-05-08 08:30");
}

TEST_F(SchedDateTest, AnyCharacterButAZeroTurnsAWeekdayOn) {
  EXPECT_EQ(nextAt(kTuesdayMorning, weeklyTask("00x0000", 8, 30)), "2013-05-07 08:30");
}

TEST_F(SchedDateTest, AWeekThatIsTooShortLeavesTheOtherDaysOnWhateverStandsBehindIt) {
  const Task task = weeklyTask("0000000", 8, 30);
  task->Week[4] = '\0';
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-09 08:30") << "Thursday";
  task->Week[2] = '\0';
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30") << "the end itself";
  task->Week[0] = '\0';
  EXPECT_EQ(nextAt("2013-05-07 08:30", task), "2013-05-08 08:30");
}

TEST_F(SchedDateTest, WithoutAWeekdayTheNextRunIsShownEightDaysAhead) {
  EXPECT_EQ(nextAt(kTuesdayMorning, weeklyTask("0000000", 8, 30)), "2013-05-15 08:30");
}

TEST_F(SchedDateTest, AWeeklyTaskIgnoresItsStartDate) {
  Task task = weeklyTask("0010000", 8, 30);
  task->StartYear = 2030;
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30");
}

TEST_F(SchedDateTest, AWeekGoesOnIntoTheNextYear) {
  EXPECT_EQ(nextAt("2013-12-31 09:00", weeklyTask("0010000", 8, 30)), "2014-01-07 08:30");
}

// ---- once

TEST_F(SchedDateTest, ATaskOfTomorrowRunsTomorrow) {
  EXPECT_EQ(nextAt("2013-05-07 09:00", onceTask({2013, 5, 8}, 8, 30)), "2013-05-08 08:30");
}

TEST_F(SchedDateTest, ATaskOfTodayRunsTodayWhileItsTimeIsAhead) {
  EXPECT_EQ(nextAt(kTuesdayMorning, onceTask({2013, 5, 7}, 8, 30)), "2013-05-07 08:30");
}

TEST_F(SchedDateTest, ATaskOfTodayNeverRunsOnceItsTimeHasPassed) {
  EXPECT_EQ(nextAt("2013-05-07 08:30", onceTask({2013, 5, 7}, 8, 30)), kNever);
  EXPECT_EQ(nextAt("2013-05-07 17:00", onceTask({2013, 5, 7}, 8, 0, {2, 17})), kNever);
}

TEST_F(SchedDateTest, ATaskOfThePastNeverRuns) {
  for (const Day &start : {Day{2013, 5, 6}, {2013, 4, 30}, {2012, 12, 31}, {0, 0, 0}}) {
    EXPECT_EQ(nextAt(kTuesdayMorning, onceTask(start, 8, 30)), kNever);
  }
}

// ---- a start date that is still to come

TEST_F(SchedDateTest, UntilTheStartDateThatDateIsNext) {
  for (const int32_t type :
       {ZELO_SCHED_TYPE_ONCE, ZELO_SCHED_TYPE_MONTHLY, ZELO_SCHED_TYPE_YEARLY}) {
    EXPECT_EQ(nextAt(kTuesdayMorning, datedTask(type, {2014, 5, 7}, 8, 30)), "2014-05-07 08:30")
        << type;
  }
}

TEST_F(SchedDateTest, TheFirstRunOfTheStartDateIsShownWhateverTheRepeats) {
  EXPECT_EQ(nextAt("2013-05-07 23:00", onceTask({2013, 5, 8}, 8, 30, {2, 17})), "2013-05-08 08:30");
}

TEST_F(SchedDateTest, AStartDateThatDoesNotExistIsShownAsStored) {
  EXPECT_EQ(nextAt(kTuesdayMorning, monthlyTask({2013, 6, 31}, 8, 30)), "2013-06-31 08:30");
  EXPECT_EQ(nextAt(kTuesdayMorning, onceTask({2013, 13, 0}, 99, 99)), "2013-13-00 99:99");
}

TEST_F(SchedDateTest, OnTheStartDateTheRestOfTodayCounts) {
  for (const int32_t type : {ZELO_SCHED_TYPE_MONTHLY, ZELO_SCHED_TYPE_YEARLY}) {
    EXPECT_EQ(nextAt(kTuesdayMorning, datedTask(type, {2013, 5, 7}, 8, 30)), "2013-05-07 08:30")
        << type;
  }
}

// ---- monthly

TEST_F(SchedDateTest, AfterItsDayAMonthlyTaskRunsNextMonth) {
  EXPECT_EQ(nextAt("2013-01-20 12:00", monthlyTask({2012, 1, 15}, 8, 30)), "2013-02-15 08:30");
}

TEST_F(SchedDateTest, BeforeItsDayAMonthlyTaskRunsThisMonth) {
  EXPECT_EQ(nextAt("2013-01-10 12:00", monthlyTask({2012, 6, 15}, 8, 30)), "2013-01-15 08:30");
}

TEST_F(SchedDateTest, OnItsDayAMonthlyTaskRunsTodayOrNextMonth) {
  const Task task = monthlyTask({2012, 1, 7}, 8, 30);
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30");
  EXPECT_EQ(nextAt("2013-05-07 08:30", task), "2013-06-07 08:30");
}

TEST_F(SchedDateTest, AMonthlyTaskGoesOnIntoTheNextYear) {
  EXPECT_EQ(nextAt("2013-12-20 12:00", monthlyTask({2012, 1, 15}, 8, 30)), "2014-01-15 08:30");
}

TEST_F(SchedDateTest, AMonthlyTaskThatStartsInTheFutureShowsItsStartDate) {
  EXPECT_EQ(nextAt("2013-01-10 12:00", monthlyTask({2013, 3, 15}, 8, 30)), "2013-03-15 08:30");
}

TEST_F(SchedDateTest, TheThirtyFirstOfAprilIsShownAsTheFirstOfMay) {
  EXPECT_EQ(nextAt("2013-04-30 12:00", monthlyTask({2012, 1, 31}, 8, 30)), "2013-05-01 08:30");
}

TEST_F(SchedDateTest, TheThirtyFirstOfFebruaryIsShownInMarch) {
  EXPECT_EQ(nextAt("2013-01-31 12:00", monthlyTask({2012, 1, 31}, 8, 30)), "2013-03-03 08:30");
  EXPECT_EQ(nextAt("2012-02-29 12:00", monthlyTask({2012, 1, 31}, 8, 30)), "2012-03-02 08:30");
}

// ---- yearly

TEST_F(SchedDateTest, AYearlyTaskRunsThisYearOrTheNext) {
  const Task task = yearlyTask({2012, 5, 7}, 8, 30);
  EXPECT_EQ(nextAt("2013-04-30 12:00", task), "2013-05-07 08:30");
  EXPECT_EQ(nextAt("2013-05-06 12:00", task), "2013-05-07 08:30");
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30");
  EXPECT_EQ(nextAt("2013-05-07 08:30", task), "2014-05-07 08:30");
  EXPECT_EQ(nextAt("2013-05-08 07:00", task), "2014-05-07 08:30");
  EXPECT_EQ(nextAt("2013-06-01 07:00", task), "2014-05-07 08:30");
}

TEST_F(SchedDateTest, ALeapDayIsShownAsTheFirstOfMarchOfACommonYear) {
  const Task task = yearlyTask({2012, 2, 29}, 8, 30);
  EXPECT_EQ(nextAt("2013-03-10 12:00", task), "2014-03-01 08:30");
  EXPECT_EQ(nextAt("2015-03-10 12:00", task), "2016-02-29 08:30");
}

// ---- types that do not exist

TEST_F(SchedDateTest, AnUnknownTypeRunsTodayByItsWeekday) {
  Task task = weeklyTask("0010000", 8, 30);
  for (const int32_t type : {5, -1, INT32_MAX, INT32_MIN}) {
    task->Type = type;
    EXPECT_EQ(nextAt(kTuesdayMorning, task), "2013-05-07 08:30") << type;
  }
}

// A record of zeroes normalises to the last day of November of the year before year 0.
TEST_F(SchedDateTest, AnUnknownTypeThatDoesNotRunTodayHasNoSensibleDay) {
  Task task = weeklyTask("0000000", 8, 30);
  task->Type = 5;
  EXPECT_EQ(nextAt(kTuesdayMorning, task), "4294967295-11-30 08:30");
}

// ---- summer time

TEST_F(SchedDateTest, ARunOfTodayIsShownInSummerTime) {
  setZone(kCentralEurope);
  EXPECT_EQ(nextAt("2013-07-10 23:30", dailyTask(23, 45)), "2013-07-10 23:45");
}

TEST_F(SchedDateTest, InTheLastHourOfASummerDayTheNextDayIsShownOneTooLate) {
  setZone(kCentralEurope);
  const Task task = dailyTask(8, 30);
  EXPECT_EQ(nextAt("2013-07-10 22:59", task), "2013-07-11 08:30");
  EXPECT_EQ(nextAt("2013-07-10 23:00", task), "2013-07-12 08:30");
  EXPECT_EQ(nextAt("2013-07-10 23:59", task), "2013-07-12 08:30");
  EXPECT_EQ(nextAt("2013-07-11 00:00", task), "2013-07-11 08:30");
}

TEST_F(SchedDateTest, WhetherTheNextDayIsInSummerDecides) {
  setZone(kCentralEurope);
  const Task task = dailyTask(8, 30);
  EXPECT_EQ(nextAt("2013-01-10 23:30", task), "2013-01-11 08:30");
  EXPECT_EQ(nextAt("2013-03-30 23:30", task), "2013-04-01 08:30");  // into summer time
  EXPECT_EQ(nextAt("2013-10-26 23:30", task), "2013-10-27 08:30");  // out of it
}

TEST_F(SchedDateTest, ASummerDayFarAheadIsShownOneTooLateAsWell) {
  setZone(kCentralEurope);
  EXPECT_EQ(nextAt("2013-01-01 23:30", yearlyTask({2012, 7, 15}, 8, 30)), "2013-07-16 08:30");
  EXPECT_EQ(nextAt("2013-07-16 23:30", monthlyTask({2012, 1, 15}, 8, 30)), "2013-08-16 08:30");
  EXPECT_EQ(nextAt("2013-07-09 23:30", weeklyTask("0000010", 8, 30)), "2013-07-13 08:30");
  EXPECT_EQ(nextAt("2013-07-10 23:30", yearlyTask({2012, 1, 15}, 8, 30)), "2014-01-15 08:30");
}

TEST_F(SchedDateTest, AFutureStartDateIsNotMovedBySummerTime) {
  setZone(kCentralEurope);
  EXPECT_EQ(nextAt("2013-07-10 23:30", onceTask({2013, 7, 15}, 8, 30)), "2013-07-15 08:30");
}

// ---- numbers out of range

TEST_F(SchedDateTest, ARunHourBeyondTheDayIsShownAsItStands) {
  EXPECT_EQ(nextAt("2013-05-07 23:59", dailyTask(24, 0)), "2013-05-07 24:00");
  EXPECT_EQ(nextAt(kTuesdayMorning, dailyTask(99, 99)), "2013-05-07 99:99");
}

TEST_F(SchedDateTest, RepeatsEndWithTheDay) {
  const Task task = dailyTask(8, 30, {1, 99});
  EXPECT_EQ(nextAt("2013-05-07 22:45", task), "2013-05-07 23:30");
  EXPECT_EQ(nextAt("2013-05-07 23:45", task), "2013-05-08 08:30");
}

TEST_F(SchedDateTest, ALastHourThatCannotBeCountedToIsNoTrap) {
  EXPECT_EQ(nextAt("2013-05-07 23:59", dailyTask(8, 30, {1, UINT32_MAX})), "2013-05-08 08:30");
  EXPECT_EQ(nextAt("2013-05-07 09:00", dailyTask(8, 30, {UINT32_MAX, UINT32_MAX})),
            "2013-05-08 08:30");
  EXPECT_EQ(nextAt("2013-05-07 09:00", dailyTask(8, 30, {UINT32_MAX - 7, UINT32_MAX})),
            "2013-05-08 08:30");
}

TEST_F(SchedDateTest, NoCombinationOfHoursFailsOrRunsForEver) {
  constexpr uint32_t kNumbers[] = {0, 1, 23, 24, 31, 99, UINT32_MAX};
  constexpr size_t kLongestText = 63;
  Task task = weeklyTask("0101010", 0, 0);
  for (const char *now : {"2013-05-07 00:00", "2013-05-07 23:59"}) {
    setClock(now);
    for (int32_t type = ZELO_SCHED_TYPE_ONCE; type <= ZELO_SCHED_TYPE_YEARLY + 1; ++type) {
      for (const uint32_t hour : kNumbers) {
        for (const uint32_t minute : kNumbers) {
          for (const uint32_t repeat : kNumbers) {
            for (const uint32_t last : kNumbers) {
              task->Type = type;
              task->RunHour = hour;
              task->RunMin = minute;
              task->RepeatHour = repeat;
              task->LastWorkHour = last;
              setText(task->NextTriggerTime, kFieldBefore);
              ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
              const std::string text = task->NextTriggerTime;
              ASSERT_NE(text, kFieldBefore);
              ASSERT_LE(text.size(), kLongestText);
              ASSERT_TRUE(text == kNever || text.find('-') != std::string::npos) << text;
            }
          }
        }
      }
    }
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedDateTest, NoStartDateFailsOrRunsForEver) {
  constexpr uint32_t kNumbers[] = {0, 1, 12, 13, 31, 32, 1900, 2013, INT32_MAX, UINT32_MAX};
  setClock(kTuesdayMorning);
  for (int32_t type = ZELO_SCHED_TYPE_ONCE; type <= ZELO_SCHED_TYPE_YEARLY; ++type) {
    for (const uint32_t year : kNumbers) {
      for (const uint32_t month : kNumbers) {
        for (const uint32_t day : kNumbers) {
          const Task task = datedTask(type, {year, month, day}, 8, 30);
          ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
          const std::string text = task->NextTriggerTime;
          ASSERT_TRUE(text == kNever || text.ends_with(" 08:30")) << text;
        }
      }
    }
  }
}

// ---- failures

TEST_F(SchedDateTest, ANextRunNeedsATask) {
  EXPECT_EQ(ZELOSchedNextTriggerTime(nullptr), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_date.cpp"}));
  EXPECT_EQ(logged(), Lines{"sched_date.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

TEST_F(SchedDateTest, WithoutADateTheFieldStaysAsItWas) {
  const Task task = dailyTask(8, 30);
  task->ID = 7;
  setText(task->NextTriggerTime, kFieldBefore);
  failCall("localtime", {.error = EOVERFLOW});
  EXPECT_EQ(ZELOSchedNextTriggerTime(task.get()), -1);
  EXPECT_STREQ(task->NextTriggerTime, kFieldBefore);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_util.cpp"}));
  EXPECT_EQ(logged(),
            (Lines{std::string("sched_util.cpp:N localtime failed. ") + kOverflowText,
                   "sched_date.cpp:N get date failed. [0x2A00 sched_util.cpp:N]",
                   "sched_date.cpp:N get trigger date failed. [7] [0x2A00 sched_util.cpp:N]"}));
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{3, 3, 3}));
}

TEST_F(SchedDateTest, WithoutNormalisationTheFieldStaysAsItWas) {
  setClock("2013-05-07 09:00");
  const Task task = dailyTask(8, 30);
  task->ID = -1;
  setText(task->NextTriggerTime, kFieldBefore);
  failCall("localtime", {.from = 2, .error = EOVERFLOW});
  EXPECT_EQ(ZELOSchedNextTriggerTime(task.get()), -1);
  EXPECT_STREQ(task->NextTriggerTime, kFieldBefore);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_date.cpp"}));
  EXPECT_EQ(logged(),
            (Lines{std::string("sched_date.cpp:N localtime failed. ") + kOverflowText,
                   "sched_date.cpp:N date normalization failed. [0x2A00 sched_date.cpp:N]",
                   "sched_date.cpp:N get trigger date failed. [-1] [0x2A00 sched_date.cpp:N]"}));
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{3, 3, 3}));
}

// ---- what a call costs, and what it leaves alone

std::vector<Task> oneTaskForEachWay() {
  std::vector<Task> tasks;
  tasks.push_back(onceTask({2014, 1, 1}, 8, 30));
  tasks.push_back(onceTask({2013, 5, 7}, 8, 30));
  tasks.push_back(onceTask({2012, 5, 7}, 8, 30));
  tasks.push_back(dailyTask(8, 30));
  tasks.push_back(dailyTask(6, 0, {1, UINT32_MAX}));
  tasks.push_back(dailyTask(6, 30));
  tasks.push_back(weeklyTask("0000000", 8, 30));
  tasks.push_back(monthlyTask({2012, 1, 31}, 8, 30));
  tasks.push_back(yearlyTask({2012, 2, 29}, 8, 30));
  return tasks;
}

TEST_F(SchedDateTest, TheClockIsReadOncePerCall) {
  setClock(kTuesdayMorning);
  for (const Task &task : oneTaskForEachWay()) {
    const unsigned before = clockReads();
    ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    EXPECT_EQ(clockReads() - before, 1U) << task->NextTriggerTime;
  }
}

TEST_F(SchedDateTest, NothingIsAllocated) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the address sanitizer has an allocator of its own";
  setClock(kTuesdayMorning);
  for (const Task &task : oneTaskForEachWay()) {
    unsigned allocations = 0;
    {
      const FailPlan countOnly = {.from = kAlways};
      FailingAllocation scope("malloc", countOnly);
      const unsigned before = callCount("malloc") + callCount("calloc") + callCount("realloc");
      ZELOSchedNextTriggerTime(task.get());
      allocations = callCount("malloc") + callCount("calloc") + callCount("realloc") - before;
    }
    EXPECT_EQ(allocations, 0U) << task->NextTriggerTime;
  }
}

TEST_F(SchedDateTest, AnAllocationWouldHaveBeenSeen) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the address sanitizer has an allocator of its own";
  const FailPlan countOnly = {.from = kAlways};
  FailingAllocation scope("malloc", countOnly);
  const unsigned before = callCount("malloc");
  const std::vector<char> allocated(1000);
  EXPECT_EQ(callCount("malloc") - before, 1U);
  EXPECT_EQ(allocated.size(), 1000U);
}

TEST_F(SchedDateTest, NoOtherFieldIsWritten) {
  setClock(kTuesdayMorning);
  for (const Task &task : oneTaskForEachWay()) {
    ZELO_SCHED_TASK before = *task;
    ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    std::memset(before.NextTriggerTime, 0, sizeof(before.NextTriggerTime));
    std::memset(task->NextTriggerTime, 0, sizeof(task->NextTriggerTime));
    EXPECT_EQ(std::memcmp(&before, task.get(), sizeof(before)), 0);
  }
}

}  // namespace
}  // namespace support
