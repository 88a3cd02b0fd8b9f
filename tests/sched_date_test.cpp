// Dates that roll over, and the minute at which a task runs next.
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

// Summer time from the last Sunday in March to the last one in October, without a zone file.
constexpr char kCentralEurope[] = "CET-1CEST,M3.5.0,M10.5.0/3";
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

// Two billion years from now: the month after its last one overflows.
TEST_F(SchedDateTest, ADateThatCannotBeConvertedStays) {
  constexpr uint32_t kLastYear = uint32_t{INT32_MAX} + 1900;
  setZone("UTC");
  EXPECT_EQ(normalised({kLastYear, 12, 31, 0, 23, 59}), (Fields{kLastYear, 12, 31, 3, 23, 59}));
  ZELO_SCHED_DATE date = {kLastYear, 13, 1, 9, 8, 7};
  EXPECT_EQ(ZELOSchedDateNormalize(&date), -1);
  EXPECT_EQ(fieldsOf(date), (Fields{kLastYear, 13, 1, 9, 8, 7}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_date.cpp"}));
  EXPECT_EQ(logged(), Lines{std::string("sched_date.cpp:N mktime failed. ") + kOverflowText});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

TEST_F(SchedDateTest, TheSecondBeforeTheEpochIsNoFailure) {
  setZone("UTC");
  EXPECT_EQ(normalised({1970, 1, 1, 0, 0, 0}), (Fields{1970, 1, 1, 4, 0, 0}));
  EXPECT_EQ(normalised({1969, 12, 31, 0, 23, 59}), (Fields{1969, 12, 31, 3, 23, 59}));
  setZone("XXX-0:00:01");  // where mktime's result -1 is the first second of a minute
  EXPECT_EQ(normalised({1970, 1, 1, 0, 0, 0}), (Fields{1970, 1, 1, 4, 0, 0}));
}

TEST_F(SchedDateTest, ADateThatCannotBeConvertedBackStays) {
  failCall("localtime_r", {.error = EOVERFLOW});
  ZELO_SCHED_DATE date = {2013, 1, 32, 9, 8, 7};
  EXPECT_EQ(ZELOSchedDateNormalize(&date), -1);
  EXPECT_EQ(fieldsOf(date), (Fields{2013, 1, 32, 9, 8, 7}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_date.cpp"}));
  EXPECT_EQ(logged(), Lines{std::string("sched_date.cpp:N localtime failed. ") + kOverflowText});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

// ---- what is shown as the next run

TEST_F(SchedDateTest, EachScheduleHasItsNextRun) {
  for (const ScheduleCase &each : scheduleCases()) {
    for (const Moment &moment : each.moments) {
      SCOPED_TRACE(each.what + " at " + moment.now);
      EXPECT_EQ(nextAt(moment.now, taskOf(each.schedule)), moment.shown);
    }
  }
  EXPECT_EQ(logged(), Lines{});
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

TEST_F(SchedDateTest, ANextRunNeedsATaskAndNormalisingADate) {
  expectRefused("sched_date.cpp",
                {{"((void *)0) != pDate", [] { return ZELOSchedDateNormalize(nullptr); }},
                 {"((void *)0) != pTask", [] { return ZELOSchedNextTriggerTime(nullptr); }}});
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
  failCall("localtime_r", {.error = EOVERFLOW});
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
