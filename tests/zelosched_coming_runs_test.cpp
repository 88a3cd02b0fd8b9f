// The minutes at which a task will run, as the command line tells them.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <random>

#include "coming_runs.h"
#include "fake_clock.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

constexpr long kHour = 3600;
constexpr long kDay = 24 * kHour;

class ZeloschedComingRunsTest : public SandboxTest {
 protected:
  static Task daily(uint32_t hour, uint32_t minute) {
    Task task = makeTask("t", "true");
    task->RunHour = hour;
    task->RunMin = minute;
    return task;
  }

  static Task monthly(uint32_t day) {
    Task task = daily(8, 30);
    task->Type = ZELO_SCHED_TYPE_MONTHLY;
    task->StartDay = day;
    return task;
  }

  static std::vector<std::string> next(const Task &task, const std::string &now, size_t count) {
    std::vector<std::string> texts;
    for (const LocalMinute &run : comingRuns(*task, localMinute(localTime(now)), count)) {
      texts.push_back(minuteText(run));
    }
    return texts;
  }

  static std::string libraryNext(const Task &task, const std::string &now) {
    setClock(now);
    EXPECT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    return task->NextTriggerTime;
  }
};

using Texts = std::vector<std::string>;

TEST_F(ZeloschedComingRunsTest, ADailyTaskRunsEveryDayAfterThisMinute) {
  const Task task = daily(8, 30);
  EXPECT_EQ(next(task, "2026-12-30 08:29", 3),
            (Texts{"2026-12-30 08:30", "2026-12-31 08:30", "2027-01-01 08:30"}));
  EXPECT_EQ(next(task, "2026-12-30 08:30", 1), (Texts{"2026-12-31 08:30"}));
}

TEST_F(ZeloschedComingRunsTest, ARepeatedTaskRunsAtEachOfItsHours) {
  const Task task = daily(8, 15);
  task->RepeatHour = 4;
  task->LastWorkHour = 17;
  EXPECT_EQ(next(task, "2026-11-21 12:14", 4), (Texts{"2026-11-21 12:15", "2026-11-21 16:15",
                                                      "2026-11-22 08:15", "2026-11-22 12:15"}));
}

TEST_F(ZeloschedComingRunsTest, ALastHourBeforeTheFirstGivesOneRun) {
  const Task task = daily(20, 0);
  task->RepeatHour = 3;
  task->LastWorkHour = 5;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 2), (Texts{"2026-11-21 20:00", "2026-11-22 20:00"}));
}

TEST_F(ZeloschedComingRunsTest, AWeeklyTaskRunsOnItsDays) {
  const Task task = daily(8, 30);
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->Week, "0100010");
  EXPECT_EQ(next(task, "2026-11-21 00:00", 3),
            (Texts{"2026-11-23 08:30", "2026-11-27 08:30", "2026-11-30 08:30"}));
}

TEST_F(ZeloschedComingRunsTest, AWeekThatIsTooShortLeavesTheOtherDaysOnWhateverStandsBehindIt) {
  const Task task = daily(8, 30);
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->Week, "0000000");
  task->Week[5] = '\0';
  EXPECT_EQ(next(task, "2026-12-01 08:30", 3),
            (Texts{"2026-12-04 08:30", "2026-12-05 08:30", "2026-12-11 08:30"}));
}

TEST_F(ZeloschedComingRunsTest, AWeeklyTaskWithoutDaysNeverRuns) {
  const Task task = daily(8, 30);
  task->Type = ZELO_SCHED_TYPE_WEEKLY;
  setText(task->Week, "0000000");
  EXPECT_EQ(next(task, "2026-11-21 00:00", 3), Texts{});
}

TEST_F(ZeloschedComingRunsTest, AMonthWithoutTheDayIsPassedOver) {
  const Task task = monthly(31);
  EXPECT_EQ(next(task, "2026-03-31 09:00", 2), (Texts{"2026-05-31 08:30", "2026-07-31 08:30"}));
  EXPECT_EQ(libraryNext(task, "2026-04-02 09:00"), "2026-05-01 08:30");
}

TEST_F(ZeloschedComingRunsTest, The29thOfFebruaryComesAfterEightYearsAtTheLatest) {
  const Task task = monthly(29);
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  task->StartMonth = 2;
  EXPECT_EQ(next(task, "2096-03-01 00:00", 2), (Texts{"2104-02-29 08:30", "2108-02-29 08:30"}));
}

TEST_F(ZeloschedComingRunsTest, ATaskThatRunsOnceRunsOnItsDayOnly) {
  const Task task = daily(8, 30);
  task->Type = ZELO_SCHED_TYPE_ONCE;
  task->StartYear = 2026;
  task->StartMonth = 12;
  task->StartDay = 24;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 5), (Texts{"2026-12-24 08:30"}));
  EXPECT_EQ(next(task, "2026-12-24 08:30", 5), Texts{});
}

TEST_F(ZeloschedComingRunsTest, NothingRunsBeforeTheStartDate) {
  const Task task = daily(8, 30);
  task->StartYear = 2031;
  task->StartMonth = 2;
  task->StartDay = 3;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 2), (Texts{"2031-02-03 08:30", "2031-02-04 08:30"}));
  EXPECT_EQ(libraryNext(task, "2026-11-21 00:00"), "2026-11-21 08:30");
}

TEST_F(ZeloschedComingRunsTest, AStartWithoutAMonthBeginsWithTheYear) {
  const Task task = daily(8, 30);
  task->StartYear = 2098;
  task->StartMonth = 0;
  task->StartDay = 0;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 1), (Texts{"2098-01-01 08:30"}));
  task->StartMonth = 5;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 1), (Texts{"2098-05-01 08:30"}));
}

TEST_F(ZeloschedComingRunsTest, AStartInAYearThatNeverComesGivesNoRun) {
  const Task task = daily(8, 30);
  task->StartYear = 4000000000U;
  EXPECT_EQ(next(task, "2026-11-21 00:00", 1), Texts{});
}

TEST_F(ZeloschedComingRunsTest, AnHourOrMinuteThatDoesNotExistGivesNoRun) {
  EXPECT_EQ(next(daily(24, 0), "2026-11-21 00:00", 1), Texts{});
  EXPECT_EQ(next(daily(4000000000U, 0), "2026-11-21 00:00", 1), Texts{});
  EXPECT_EQ(next(daily(8, 60), "2026-11-21 00:00", 1), Texts{});
}

TEST_F(ZeloschedComingRunsTest, ATimeThatTheChangeToSummerTimeSkipsDoesNotCome) {
  setZone("Europe/Berlin");
  EXPECT_EQ(next(daily(2, 30), "2026-03-28 12:00", 1), (Texts{"2026-03-30 02:30"}));
}

TEST_F(ZeloschedComingRunsTest, ATimeThatComesTwiceIsToldOnce) {
  setZone("Europe/Berlin");
  EXPECT_EQ(next(daily(2, 30), "2026-10-24 12:00", 2),
            (Texts{"2026-10-25 02:30", "2026-10-26 02:30"}));
}

TEST_F(ZeloschedComingRunsTest, AMinuteThatComesTwiceBeginsTheFirstTime) {
  setZone("Europe/Berlin");
  const time_t before = localTime("2026-10-25 01:30");
  EXPECT_EQ(momentOf(localMinute(before + kHour)), before + kHour);
}

TEST_F(ZeloschedComingRunsTest, TheLastHourOfASummerDayIsNoDayLate) {
  setZone("Europe/Berlin");
  const Task task = daily(8, 30);
  EXPECT_EQ(next(task, "2026-07-01 23:15", 1), (Texts{"2026-07-02 08:30"}));
  EXPECT_EQ(libraryNext(task, "2026-07-01 23:15"), "2026-07-03 08:30");
}

TEST_F(ZeloschedComingRunsTest, ADisabledTaskHasNoNextRun) {
  const Task task = daily(8, 30);
  const LocalMinute now = localMinute(localTime("2026-11-21 00:00"));
  ASSERT_TRUE(nextRun(*task, now).has_value());
  EXPECT_EQ(minuteText(*nextRun(*task, now)), "2026-11-21 08:30");
  task->State = ZELO_SCHED_STATE_DISABLED;
  EXPECT_FALSE(nextRun(*task, now).has_value());
}

TEST_F(ZeloschedComingRunsTest, RunsBetweenTakesTheEndInAndLeavesTheBeginningOut) {
  const Task task = daily(8, 30);
  const auto at = [](const char *text) { return localMinute(localTime(text)); };
  const std::vector<LocalMinute> runs =
      runsBetween(*task, at("2026-11-20 08:30"), at("2026-11-22 08:30"));
  ASSERT_EQ(runs.size(), 2U);
  EXPECT_EQ(minuteText(runs[0]), "2026-11-21 08:30");
  EXPECT_EQ(minuteText(runs[1]), "2026-11-22 08:30");
  EXPECT_STREQ(weekdayName(runs[0]), "Saturday");
}

// ---- against the clock, and against the library -----------------------------------------------

// Whether cron starts the task in that minute and the check at the start lets it run.
bool fires(const ZELO_SCHED_TASK &task, time_t moment) {
  tm now{};
  localtime_r(&moment, &now);
  const auto year = static_cast<uint32_t>(now.tm_year + 1900);
  const auto month = static_cast<uint32_t>(now.tm_mon + 1);
  const auto day = static_cast<uint32_t>(now.tm_mday);
  if (std::tie(year, month, day) < std::tie(task.StartYear, task.StartMonth, task.StartDay)) {
    return false;
  }
  const bool isStart =
      std::tie(year, month, day) == std::tie(task.StartYear, task.StartMonth, task.StartDay);
  const auto weekday = static_cast<size_t>(now.tm_wday);
  const bool isOn = weekday >= std::strlen(task.Week) || task.Week[weekday] != '0';
  const bool isDay[] = {isStart, true, isOn, day == task.StartDay,
                        day == task.StartDay && month == task.StartMonth};
  if (!isDay[task.Type] || static_cast<uint32_t>(now.tm_min) != task.RunMin) return false;
  const auto hour = static_cast<uint32_t>(now.tm_hour);
  if (task.RepeatHour == 0) return hour == task.RunHour;
  return hour >= task.RunHour && hour <= std::max(task.RunHour, task.LastWorkHour) &&
         (hour - task.RunHour) % task.RepeatHour == 0;
}

class ZeloschedRandomTasksTest : public ZeloschedComingRunsTest {
 protected:
  void SetUp() override {
    ZeloschedComingRunsTest::SetUp();
    setZone("Europe/Berlin");
  }

  uint32_t upTo(uint32_t most) { return std::uniform_int_distribution<uint32_t>(0, most)(random_); }

  Task randomTask() {
    Task task = daily(upTo(23), upTo(59));
    task->Type = static_cast<int32_t>(upTo(4));
    for (size_t i = 0; i < 7; ++i) task->Week[i] = upTo(2) == 0 ? '1' : '0';
    if (upTo(9) == 0) task->Week[upTo(6)] = '\0';
    task->StartYear = upTo(1) == 0 ? 0 : 2024 + upTo(3);
    task->StartMonth = 1 + upTo(11);
    task->StartDay = 1 + upTo(30);
    task->RepeatHour = upTo(2) == 0 ? 1 + upTo(6) : 0;
    task->LastWorkHour = upTo(23);
    return task;
  }

  std::mt19937 random_{20261121};
};

TEST_F(ZeloschedRandomTasksTest, TheRunsAreTheMinutesAtWhichTheTaskFires) {
  constexpr long kDays = 70;
  size_t found = 0;
  for (int i = 0; i < 400; ++i) {
    const Task task = randomTask();
    const time_t now = localTime("2025-01-01 00:00") + upTo(900) * kDay + upTo(1439) * 60;
    const time_t end = now + kDays * kDay;
    std::vector<LocalMinute> wanted;
    const time_t first = now - now % kHour + task->RunMin * 60;
    for (time_t moment = first; moment <= end; moment += kHour) {
      const LocalMinute minute = localMinute(moment);
      const bool isNew = wanted.empty() || wanted.back() < minute;
      if (moment > now && minute > localMinute(now) && isNew && fires(*task, moment)) {
        wanted.push_back(minute);
      }
    }
    found += wanted.size();
    EXPECT_EQ(runsBetween(*task, localMinute(now), localMinute(end)), wanted)
        << "type " << task->Type << " start " << task->StartYear << "-" << task->StartMonth << "-"
        << task->StartDay << " now " << minuteText(localMinute(now));
  }
  EXPECT_GT(found, 1000U);
}

TEST_F(ZeloschedRandomTasksTest, TheFirstRunIsTheLibrarysNextTriggerTimeWhereThatFires) {
  size_t compared = 0;
  for (int i = 0; i < 2000; ++i) {
    const Task task = randomTask();
    const time_t now = localTime("2025-01-01 00:00") + upTo(900) * kDay + upTo(1439) * 60;
    setClock(now);
    ASSERT_EQ(ZELOSchedNextTriggerTime(task.get()), 0);
    const std::string shown = task->NextTriggerTime;
    const std::vector<LocalMinute> runs = comingRuns(*task, localMinute(now), 1);
    const std::string told = runs.empty() ? "N/A" : minuteText(runs.front());
    tm fields{};
    localtime_r(&now, &fields);
    const bool isDayLate = fields.tm_isdst > 0 && fields.tm_hour == 23;
    if (isDayLate) continue;
    if (shown != "N/A") {
      const bool isReal = strptime(shown.c_str(), "%Y-%m-%d %H:%M", &fields) != nullptr;
      ASSERT_TRUE(isReal) << shown;
      fields.tm_isdst = -1;
      fields.tm_sec = 0;
      const time_t moment = mktime(&fields);
      if (minuteText(localMinute(moment)) != shown || !fires(*task, moment)) continue;
    }
    EXPECT_EQ(told, shown) << "type " << task->Type;
    ++compared;
  }
  EXPECT_GT(compared, 1000U);
}

}  // namespace
}  // namespace support
