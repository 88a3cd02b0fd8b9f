// The minutes at which a task will run, as the command line tells them.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <map>
#include <random>

#include "fake_clock.h"
#include "runs/coming_runs.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
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

  static std::vector<std::string> next(const Task &task, const std::string &now, size_t count) {
    std::vector<std::string> texts;
    ComingRuns runs(*task, localMinute(localTime(now)));
    for (auto run = runs.next(); run && texts.size() < count; run = runs.next()) {
      texts.push_back(minuteText(*run));
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

TEST_F(ZeloschedComingRunsTest, EachScheduleHasItsNextRun) {
  for (const ScheduleCase &each : scheduleCases()) {
    for (const Moment &moment : each.moments) {
      SCOPED_TRACE(each.what + " at " + moment.now);
      const Texts runs = next(taskOf(each.schedule), moment.now, 1);
      EXPECT_EQ(runs.empty() ? kNever : runs.front(), nextOf(moment));
    }
  }
}

TEST_F(ZeloschedComingRunsTest, OneRunComesAfterTheOther) {
  const Task task = daily(8, 15);
  task->RepeatHour = 4;
  task->LastWorkHour = 17;
  EXPECT_EQ(next(task, "2026-12-31 12:14", 4), (Texts{"2026-12-31 12:15", "2026-12-31 16:15",
                                                      "2027-01-01 08:15", "2027-01-01 12:15"}));
  task->RepeatHour = 0;
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  task->StartMonth = 2;
  task->StartDay = 29;
  EXPECT_EQ(next(task, "2096-03-01 00:00", 2), (Texts{"2104-02-29 08:15", "2108-02-29 08:15"}));
}

TEST_F(ZeloschedComingRunsTest, RunsEndWithTheLastYearThatCanBeTold) {
  const Task task = daily(8, 30);
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  task->StartMonth = 2;
  task->StartDay = 29;
  const Texts runs = next(task, "2096-03-01 00:00", 10000);
  ASSERT_EQ(runs.size(), 7436U);
  EXPECT_EQ(runs.back(), "32764-02-29 08:30");
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

// Minute by minute around changes of the clock: by an hour and by half an hour, of summer time and
// of a country's time, and one that skips a day.
TEST_F(ZeloschedComingRunsTest, AMinuteBeginsWhenTheClockFirstShowsItOrNever) {
  const struct {
    const char *zone;
    const char *noon;  // in UTC, of a day beside the change
  } changes[] = {
      {"Europe/Berlin", "2026-03-29 12:00"},       {"Europe/Berlin", "2026-10-25 12:00"},
      {"America/New_York", "2026-03-08 12:00"},    {"America/New_York", "2026-11-01 12:00"},
      {"Australia/Lord_Howe", "2026-04-05 12:00"}, {"Australia/Lord_Howe", "2026-10-04 12:00"},
      {"Europe/Moscow", "2014-10-26 12:00"},       {"Pacific/Apia", "2011-12-30 12:00"},
      {"Africa/Casablanca", "2026-02-15 12:00"},   {"UTC", "2026-01-01 12:00"}};
  for (const auto &[zone, noon] : changes) {
    SCOPED_TRACE(std::string(zone) + " " + noon);
    setZone("UTC");
    const time_t middle = localTime(noon);
    const LocalMinute day = localMinute(middle);
    setZone(zone);
    std::map<LocalMinute, time_t> firsts;
    for (time_t moment = middle - 4 * kDay; moment < middle + 4 * kDay; moment += 60) {
      firsts.emplace(localMinute(moment), moment);
    }
    LocalMinute minute = {day.day - std::chrono::days(2), 0, 0};
    for (; minute.day < day.day + std::chrono::days(2); minute.day += std::chrono::days(1)) {
      for (minute.hour = 0; minute.hour < 24; ++minute.hour) {
        for (minute.minute = 0; minute.minute < 60; ++minute.minute) {
          const auto first = firsts.find(minute);
          const std::optional<time_t> wanted =
              first == firsts.end() ? std::nullopt : std::optional(first->second);
          ASSERT_EQ(momentOf(minute), wanted) << minuteText(minute);
        }
      }
    }
  }
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
    const auto run = ComingRuns(*task, localMinute(now)).next();
    const std::string told = run ? minuteText(*run) : kNever;
    tm fields{};
    localtime_r(&now, &fields);
    const bool isDayLate = fields.tm_isdst > 0 && fields.tm_hour == 23;
    if (isDayLate) continue;
    if (shown != kNever) {
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
