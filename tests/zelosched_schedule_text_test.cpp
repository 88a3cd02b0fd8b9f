// Schedules as people say them.
#include <gtest/gtest.h>

#include "commands/options.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "terminal/schedule_text.h"

namespace support {
namespace {

class ZeloschedScheduleTextTest : public SandboxTest {
 protected:
  Task task_ = makeTask("t", "true");

  std::string date() const {
    return std::to_string(task_->StartYear) + "-" + std::to_string(task_->StartMonth) + "-" +
           std::to_string(task_->StartDay);
  }
  std::string time() const {
    return std::to_string(task_->RunHour) + ":" + std::to_string(task_->RunMin);
  }
};

TEST_F(ZeloschedScheduleTextTest, OnceTakesADateAndATimeWithATOrABlankBetween) {
  for (const char *text : {"2026-12-24T18:30", "2026-12-24 18:30"}) {
    setOnce(task_.get(), text);
    EXPECT_EQ(task_->Type, ZELO_SCHED_TYPE_ONCE);
    EXPECT_EQ(date() + " " + time(), "2026-12-24 18:30");
  }
}

TEST_F(ZeloschedScheduleTextTest, DailyTakesATimeAndForgetsDaysAndStart) {
  setText(task_->Week, "0000001");
  setDaily(task_.get(), "8:05");
  EXPECT_EQ(task_->Type, ZELO_SCHED_TYPE_DAILY);
  EXPECT_EQ(date() + " " + time(), "0-0-0 8:5");
  EXPECT_STREQ(task_->Week, "1111111");
}

TEST_F(ZeloschedScheduleTextTest, WeeklyTakesNamesRangesAndGroups) {
  const std::vector<std::pair<const char *, const char *>> weeks = {
      {"mon,wed,fri", "0101010"}, {"MON,Wednesday", "0101000"}, {"mon-fri", "0111110"},
      {"fri-mon", "1100011"},     {"sun-sat", "1111111"},       {"weekdays", "0111110"},
      {"weekend", "1000001"},     {"weekend,wed", "1001001"},   {"all", "1111111"},
      {"sun-sun", "1000000"},     {"none", "0000000"}};
  for (const auto &[text, week] : weeks) {
    setWeekly(task_.get(), std::string(text) + " 08:30");
    EXPECT_STREQ(task_->Week, week) << text;
    EXPECT_EQ(task_->Type, ZELO_SCHED_TYPE_WEEKLY);
    EXPECT_EQ(time(), "8:30");
  }
}

TEST_F(ZeloschedScheduleTextTest, MonthlyTakesADayAndYearlyAMonthAndADay) {
  setMonthly(task_.get(), "15 08:30");
  EXPECT_EQ(task_->Type, ZELO_SCHED_TYPE_MONTHLY);
  EXPECT_EQ(date() + " " + time(), "0-0-15 8:30");
  setYearly(task_.get(), "02-29 23:59");
  EXPECT_EQ(task_->Type, ZELO_SCHED_TYPE_YEARLY);
  EXPECT_EQ(date() + " " + time(), "0-2-29 23:59");
}

TEST_F(ZeloschedScheduleTextTest, EveryRepeatsUntilTheEndOfTheDayUnlessToldOtherwise) {
  setEvery(task_.get(), "2h");
  EXPECT_EQ(task_->RepeatHour, 2U);
  EXPECT_EQ(task_->LastWorkHour, 23U);
  setUntil(task_.get(), "18");
  setEvery(task_.get(), "3");
  EXPECT_EQ(task_->RepeatHour, 3U);
  EXPECT_EQ(task_->LastWorkHour, 18U);
  setUntil(task_.get(), "17:00");
  EXPECT_EQ(task_->LastWorkHour, 17U);
  setEvery(task_.get(), "off");
  EXPECT_EQ(task_->RepeatHour, 0U);
  EXPECT_EQ(task_->LastWorkHour, 0U);
}

TEST_F(ZeloschedScheduleTextTest, AStartMustBeADayOnWhichTheTaskRuns) {
  setMonthly(task_.get(), "15 08:30");
  EXPECT_THROW(setStart(task_.get(), "2027-01-14"), UsageError);
  setStart(task_.get(), "2027-01-15");
  EXPECT_EQ(date(), "2027-1-15");
  setYearly(task_.get(), "03-15 08:30");
  EXPECT_THROW(setStart(task_.get(), "2027-01-15"), UsageError);
  setOnce(task_.get(), "2026-12-24T18:30");
  EXPECT_THROW(setStart(task_.get(), "2026-12-24"), UsageError);
}

struct Wrong {
  void (*set)(ZELO_SCHED_TASK *task, const std::string &text);
  const char *text;
};

TEST_F(ZeloschedScheduleTextTest, WhatCannotBeReadIsAUsageError) {
  const Wrong wrong[] = {
      {setOnce, ""},
      {setOnce, "2026-12-24"},
      {setOnce, "24.12.2026 18:30"},
      {setOnce, "2026-12-24T"},
      {setOnce, "2026-12T18:30"},
      {setOnce, "2026-+1-24T18:30"},
      {setOnce, "99999-12-24T18:30"},
      {setDaily, ""},
      {setDaily, "8"},
      {setDaily, "8:3"},
      {setDaily, "08:300"},
      {setDaily, ":30"},
      {setDaily, "-8:30"},
      {setDaily, "8:30 "},
      {setDaily, "8:30:00"},
      {setWeekly, "08:30"},
      {setWeekly, "mon,,fri 08:30"},
      {setWeekly, "mo 08:30"},
      {setWeekly, "mon-wed-fri 08:30"},
      {setWeekly, "mon- 08:30"},
      {setMonthly, "08:30"},
      {setMonthly, "x 08:30"},
      {setMonthly, "100 08:30"},
      {setYearly, "29 08:30"},
      {setYearly, "02-29-1 08:30"},
      {setYearly, "02- 08:30"},
      {setEvery, "0"},
      {setEvery, "24h"},
      {setEvery, "h"},
      {setEvery, "30m"},
      {setUntil, ""},
      {setUntil, "18:30"},
      {setUntil, "x"},
      {setStart, "tomorrow"},
  };
  for (const Wrong &row : wrong) {
    EXPECT_THROW(row.set(task_.get(), row.text), UsageError) << row.text;
  }
}

TEST_F(ZeloschedScheduleTextTest, ASentenceSaysWhatToWriteInstead) {
  try {
    setDaily(task_.get(), "8h\n");
    FAIL();
  } catch (const UsageError &error) {
    EXPECT_STREQ(error.what(), "'8h\\n' is no time of day: write it as 08:30");
  }
}

TEST_F(ZeloschedScheduleTextTest, NumbersOutOfRangeAreReadAndLeftToTheCheck) {
  setDaily(task_.get(), "25:61");
  EXPECT_EQ(time(), "25:61");
  setMonthly(task_.get(), "32 08:30");
  EXPECT_EQ(task_->StartDay, 32U);
}

TEST_F(ZeloschedScheduleTextTest, WhatWasReadIsSaidInWords) {
  setOnce(task_.get(), "2026-12-24T18:30");
  EXPECT_EQ(scheduleInWords(*task_), "once on 2026-12-24 at 18:30");
  setDaily(task_.get(), "8:05");
  EXPECT_EQ(scheduleInWords(*task_), "daily at 08:05");
  setWeekly(task_.get(), "mon,wed,fri 08:30");
  setEvery(task_.get(), "2h");
  setUntil(task_.get(), "18");
  EXPECT_EQ(scheduleInWords(*task_), "weekly on Mon, Wed and Fri at 08:30, every 2 hours until 18");
  setEvery(task_.get(), "1h");
  setUntil(task_.get(), "8");
  setMonthly(task_.get(), "15 08:30");
  EXPECT_EQ(scheduleInWords(*task_), "monthly on day 15 at 08:30");
  setYearly(task_.get(), "02-29 08:30");
  EXPECT_EQ(scheduleInWords(*task_), "yearly on 29 February at 08:30");
  setYearly(task_.get(), "13-29 08:30");
  EXPECT_EQ(scheduleInWords(*task_), "yearly on 29 month 13 at 08:30");
  setWeekly(task_.get(), "none 08:30");
  EXPECT_EQ(scheduleInWords(*task_), "weekly on no day at 08:30");
  task_->Week[5] = '\0';  // all days behind the end are on
  EXPECT_EQ(scheduleInWords(*task_), "weekly on Fri and Sat at 08:30");
  task_->Type = 7;
  EXPECT_EQ(scheduleInWords(*task_), "of unknown type 7 at 08:30");
}

}  // namespace
}  // namespace support
