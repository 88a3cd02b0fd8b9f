// When a task runs: the rules themselves. Their callers are tested with the same table.
#include <gtest/gtest.h>

#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
#include "schedule_cron.h"
#include "schedule_days.h"
#include "schedule_due.h"
#include "schedule_runs.h"
#include "schedule_shift.h"

namespace support {
namespace {

ZELO_SCHED_DATE dateOf(const std::string &text) {
  const time_t moment = localTime(text);
  tm fields{};
  localtime_r(&moment, &fields);
  return {static_cast<uint32_t>(fields.tm_year) + 1900, static_cast<uint32_t>(fields.tm_mon) + 1,
          static_cast<uint32_t>(fields.tm_mday),        static_cast<uint32_t>(fields.tm_wday),
          static_cast<uint32_t>(fields.tm_hour),        static_cast<uint32_t>(fields.tm_min)};
}

std::string textOf(const ZELO_SCHED_DATE &date) {
  char text[64];
  snprintf(text, sizeof(text), "%04u-%02u-%02u %02u:%02u", date.year, date.month, date.day,
           date.hour, date.minute);
  return text;
}

class ScheduleTest : public SandboxTest {};

TEST_F(ScheduleTest, EachScheduleHasItsLine) {
  for (const ScheduleCase &each : scheduleCases()) {
    SCOPED_TRACE(each.what);
    const Task task = taskOf(each.schedule);
    EXPECT_EQ(schedCronLineOf(*task).text, lineOf(each));
    EXPECT_EQ(schedIsCronLineReadable(*task), each.isReadable);
  }
}

TEST_F(ScheduleTest, EachScheduleIsDueInItsMinutesAndHasItsNextRun) {
  for (const ScheduleCase &each : scheduleCases()) {
    const Task task = taskOf(each.schedule);
    for (const Moment &moment : each.moments) {
      SCOPED_TRACE(each.what + " at " + moment.now);
      const ZELO_SCHED_DATE now = dateOf(moment.now);
      EXPECT_EQ(schedIsDue(*task, now), moment.isDue);
      ZELO_SCHED_DATE run = {};
      const bool isFound = SchedRuns(*task, now).next(&run);
      EXPECT_EQ(isFound ? textOf(run) : kNever, nextOf(moment));
    }
  }
}

// Minute by minute: the runs are exactly the minutes at which cron starts the task and it is due.
TEST_F(ScheduleTest, TheRunsAreTheMinutesOfCronAtWhichTheTaskIsDue) {
  for (const ScheduleCase &each : scheduleCases()) {
    SCOPED_TRACE(each.what);
    const Task task = taskOf(each.schedule);
    const time_t begin = localTime("2013-04-20 11:45");
    SchedRuns runs(*task, dateOf("2013-04-20 11:45"));
    ZELO_SCHED_DATE run = {};
    bool isRunLeft = runs.next(&run);
    for (time_t moment = begin + 60; moment < begin + 50 * 24 * 60 * 60; moment += 60) {
      tm fields{};
      gmtime_r(&moment, &fields);
      const ZELO_SCHED_DATE now = {
          static_cast<uint32_t>(fields.tm_year) + 1900, static_cast<uint32_t>(fields.tm_mon) + 1,
          static_cast<uint32_t>(fields.tm_mday),        static_cast<uint32_t>(fields.tm_wday),
          static_cast<uint32_t>(fields.tm_hour),        static_cast<uint32_t>(fields.tm_min)};
      if (!schedIsDue(*task, now) || !schedIsCronDay(*task, now)) continue;
      ASSERT_TRUE(isRunLeft) << textOf(now);
      ASSERT_EQ(textOf(run), textOf(now));
      EXPECT_EQ(run.weekday, now.weekday);
      isRunLeft = runs.next(&run);
    }
    EXPECT_TRUE(!isRunLeft || textOf(run) >= "2013-06-09 11:45") << textOf(run);
  }
}

TEST_F(ScheduleTest, TheLongestLineIsWhole) {
  Task task = taskOf({.type = ZELO_SCHED_TYPE_YEARLY,
                      .start = {0, UINT32_MAX, UINT32_MAX},
                      .hour = 0,
                      .minute = UINT32_MAX,
                      .repeat = 1,
                      .last = 23});
  task->ID = INT32_MIN;
  const std::string line = schedCronLineOf(*task).text;
  EXPECT_TRUE(
      line.ends_with(",22,23\t4294967295\t4294967295\t*\troot\t"
                     "/tmp/zeloschedtask --run id=-2147483648"))
      << line;
  EXPECT_EQ(line.size(), 141U);
}

TEST_F(ScheduleTest, TheWeekIsAMaskAndAList) {
  const Task task = taskOf({.week = "1000011"});
  EXPECT_EQ(schedWeekdayMaskOf(*task), 0b1100001U);
  EXPECT_STREQ(schedWeekdayListOf(*task).text, "0,5,6");
}

std::vector<uint32_t> minutesOfDay(const Task &task) {
  std::vector<uint32_t> minutes;
  for (const uint32_t hour : schedHoursOf(*task)) minutes.push_back(hour * 60 + task->RunMin);
  return minutes;
}

// Whatever the hours: each run is later by the shift, none is lost, and none leaves its day.
TEST_F(ScheduleTest, AShiftMovesEveryRunOfADay) {
  for (const uint32_t repeat : {0U, 1U, 2U, 5U, 12U, 23U, 24U}) {
    for (uint32_t hour = 0; hour < 24; ++hour) {
      for (uint32_t last = hour; last < 24; ++last) {
        for (const uint32_t minute : {0U, 30U, 59U}) {
          const auto taken = [&] {
            return taskOf({.hour = hour, .minute = minute, .repeat = repeat, .last = last});
          };
          const Task task = taken();
          const uint32_t most = schedMostShift(*task);
          for (const uint32_t shift : {0U, 1U, most / 2, most}) {
            if (shift > most) continue;
            std::vector<uint32_t> wanted = minutesOfDay(task);
            for (uint32_t &run : wanted) run += shift;
            const Task shifted = taken();
            schedShift(shifted.get(), shift);
            ASSERT_EQ(minutesOfDay(shifted), wanted)
                << hour << ":" << minute << " every " << repeat << " until " << last;
            ASSERT_LT(wanted.back(), 24U * 60);
          }
          EXPECT_EQ(minutesOfDay(task).back() + most, 24U * 60 - 1);
        }
      }
    }
  }
}

}  // namespace
}  // namespace support
