// What the command line refuses to save.
#include <gtest/gtest.h>

#include <functional>

#include "check/crontab_check.h"
#include "check/task_check.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
#include "tasks.h"

namespace support {
namespace {

using Sentences = std::vector<std::string>;

class ZeloschedTaskCheckTest : public SandboxTest {
 protected:
  static Sentences harms(const std::function<void(ZELO_SCHED_TASK &)> &change) {
    const Task task = makeTask("t", "true");
    change(*task);
    return harmsOf(*task);
  }
};

struct Fault {
  std::function<void(ZELO_SCHED_TASK &)> make;
  const char *sentence;
  bool isUnreadable;
};

void setDay(ZELO_SCHED_TASK &task, int32_t type, uint32_t year, uint32_t month, uint32_t day) {
  task.Type = type;
  task.StartYear = year;
  task.StartMonth = month;
  task.StartDay = day;
}

TEST_F(ZeloschedTaskCheckTest, EachFaultIsSaidWithWhatToWriteInstead) {
  const Fault faults[] = {
      {[](auto &task) { task.RunHour = 24; }, "invalid hour 24 (00 to 23)", true},
      {[](auto &task) { task.RunMin = 60; }, "invalid minute 60 (00 to 59)", true},
      {[](auto &task) {
         task.RepeatHour = 1;
         task.LastWorkHour = 24;
       },
       "invalid last hour 24 (0 to 23)", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 0, 0, 0); },
       "invalid day 0 (1 to 31)", true},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 0, 0, 32); },
       "invalid day 32 (1 to 31)", true},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_YEARLY, 0, 13, 1); },
       "invalid month 13 (01 to 12)", true},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_ONCE, 2026, 0, 1); },
       "invalid month 0 (01 to 12)", true},
      {[](auto &task) {
         task.Type = ZELO_SCHED_TYPE_WEEKLY;
         setText(task.Week, "0000000");
       },
       "a weekly task needs a day of the week: write --weekly mon,wed,fri 08:30", true},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_YEARLY, 0, 2, 30); },
       "month 2 never has a day 30: write a day that it has", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_ONCE, 2027, 2, 29); },
       "month 2 never has a day 29 in 2027: write a day that it has", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_ONCE, 10000, 2, 2); },
       "the year 10000 never comes: write one up to 9999", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 10000, 0, 0); },
       "the year 10000 never comes: write one up to 9999", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_WEEKLY, UINT32_MAX, 2, 2); },
       "the year 4294967295 never comes: write one up to 9999", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 10000, 2, 2); },
       "the year 10000 never comes: write one up to 9999", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_YEARLY, UINT32_MAX, 2, 2); },
       "the year 4294967295 never comes: write one up to 9999", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 2027, 99, 2); },
       "the start date 2027-99-2 does not exist: write --start with a day that its month has",
       false},
      {[](auto &task) {
         task.Type = ZELO_SCHED_TYPE_WEEKLY;
         setText(task.Week, "0100");
       },
       "the days of the week '0100' are not seven: write one character for each day from Sunday "
       "on, 0 for off",
       false},
      {[](auto &task) { task.Type = 5; },
       "type 5 is unknown: write once, daily, weekly, monthly or yearly", false},
      {[](auto &task) { task.State = 5; }, "state 5 is unknown: write enabled or disabled", false},
      {[](auto &task) {
         task.RunHour = 8;
         task.RepeatHour = 2;
         task.LastWorkHour = 7;
       },
       "the last hour 7 is before the first, 8: write a later --until, or --every off for one run "
       "a day",
       false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 2027, 2, 29); },
       "the start date 2027-2-29 does not exist: write --start with a day that its month has",
       false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_WEEKLY, 0, 99, 99); },
       "the start date 0-99-99 does not exist: write --start with a day that its month has", false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 2027, 13, 0); },
       "the start date 2027-13-0 does not exist: write --start with a day that its month has",
       false},
      {[](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 2027, 0, 32); },
       "the start date 2027-0-32 does not exist: write --start with a day that its month has",
       false},
      {[](auto &task) { setText(task.Action, "a\nb"); },
       "the action has a line feed: write it on one line", false},
      {[](auto &task) {
         task.Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
         setText(task.AppArgs, "sideways");
       },
       "a power time is poweron or poweroff, and not 'sideways'", false},
      {[](auto &task) { task.Owner = 3999999999U; },
       "there is no user 3999999999, under whose rights the task would run: write --owner with "
       "the name of a user",
       false},
      {[](auto &task) { setText(task.App, "Bob's\t"); },
       "the application 'Bob's\\t' has an apostrophe, with which no run could be recorded: write "
       "it without",
       false},
      {[](auto &task) { setText(task.Command, std::string(12288, 'x')); },
       "the command is 12288 bytes long, and only 12287 can be stored: put it into a script",
       false},
  };
  for (const Fault &fault : faults) {
    EXPECT_EQ(harms(fault.make), Sentences{fault.sentence});
    const Task task = makeTask("t", "true");
    fault.make(*task);
    EXPECT_EQ(unreadableFieldsOf(*task).size(), fault.isUnreadable ? 1U : 0U) << fault.sentence;
  }
}

TEST_F(ZeloschedTaskCheckTest, WhatIsJustInRangeIsFit) {
  const std::function<void(ZELO_SCHED_TASK &)> fits[] = {
      [](auto &) {},
      [](auto &task) {
        task.RunHour = 23;
        task.RunMin = 59;
      },
      [](auto &task) { task.LastWorkHour = 99; },  // of no effect without repeats
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 0, 0, 31); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_YEARLY, 0, 2, 29); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_ONCE, 2028, 2, 29); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 0, 0, 0); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_WEEKLY, 2028, 2, 29); },
      // Zeros stand for the beginning.
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 2027, 0, 0); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_WEEKLY, 2027, 12, 0); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_DAILY, 2027, 0, 31); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_MONTHLY, 9999, 12, 31); },
      [](auto &task) { setDay(task, ZELO_SCHED_TYPE_YEARLY, 9999, 12, 31); },
      [](auto &task) { setText(task.Week, "0000000"); },  // of a daily task
      [](auto &task) { task.State = ZELO_SCHED_STATE_DISABLED; },
      [](auto &task) { setText(task.Command, std::string(12287, 'x')); },
  };
  for (const auto &change : fits) EXPECT_EQ(harms(change), Sentences{});
}

// Also for tasks of programs that check nothing. If the library's line differed from the expected
// one, status would report it for ever, and no task could be saved.
TEST_F(ZeloschedTaskCheckTest, TheCrontabIsInStepWithTheLineOfEachSchedule) {
  for (const ScheduleCase &each : scheduleCases()) {
    SCOPED_TRACE(each.what);
    const Task task = taskOf(each.schedule);
    writeFile(kCrontab, kPlainCrontab + lineOf(each) + "\n");
    EXPECT_EQ(crontabDifferences({task.get()}), Sentences{});
    writeFile(kCrontab, kPlainCrontab);
    EXPECT_EQ(crontabDifferences({task.get()}).size(), 1U);
  }
}

TEST_F(ZeloschedTaskCheckTest, EachScheduleThatCronCannotReadIsNamed) {
  for (const ScheduleCase &each : scheduleCases()) {
    SCOPED_TRACE(each.what);
    EXPECT_EQ(unreadableFieldsOf(*taskOf(each.schedule)).empty(), each.isReadable);
  }
}

TEST_F(ZeloschedTaskCheckTest, APowerTimeWithoutADayIsRefusedButStopsNoCron) {
  const Task task = makeTask("t", "");
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->AppArgs, "poweroff");
  setText(task->Week, "0000000");
  EXPECT_EQ(harmsOf(*task).size(), 1U);
  EXPECT_EQ(unreadableFieldsOf(*task), Sentences{});
}

TEST_F(ZeloschedTaskCheckTest, EveryFaultOfATaskIsSaid) {
  EXPECT_EQ(harms([](auto &task) {
              task.RunHour = 25;
              task.RunMin = 61;
              setText(task.App, "'");
            }).size(),
            3U);
}

TEST_F(ZeloschedTaskCheckTest, ATaskThatRunsOnceMustHaveARunAhead) {
  const Task task = makeTask("t", "true");
  setDay(*task, ZELO_SCHED_TYPE_ONCE, 2026, 11, 21);
  task->RunHour = 8;
  EXPECT_EQ(pastSchedule(*task, localTime("2026-11-21 07:59")), "");
  EXPECT_EQ(pastSchedule(*task, localTime("2026-11-21 08:00")),
            "the task would never run, as 2026-11-21 at 08:00 is over: write a later date");
  task->RepeatHour = 2;
  task->LastWorkHour = 18;
  EXPECT_EQ(pastSchedule(*task, localTime("2026-11-21 08:00")), "");
  task->Type = ZELO_SCHED_TYPE_DAILY;
  EXPECT_EQ(pastSchedule(*task, localTime("2036-11-21 08:00")), "");
}

}  // namespace
}  // namespace support
