// For random tasks, the minutes that the cron daemon would match by the task's line are exactly
// those at which the task is to start; and no number makes a line that does not end.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <cstring>
#include <map>
#include <random>
#include <set>
#include <sstream>

#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

struct Minute {
  int year;
  int month;    // from 1
  int day;      // from 1
  int weekday;  // from Sunday
  int hour;
  int minute;
};

// ---- the daemon's side: a crontab line

struct Field {
  bool any = false;
  std::set<int64_t> values{};
  bool matches(int value) const { return any || values.contains(value); }
};

std::vector<std::string> splitAt(const std::string &text, char separator) {
  std::vector<std::string> pieces(1);
  for (const char character : text) {
    if (character == separator) {
      pieces.emplace_back();
    } else {
      pieces.back() += character;
    }
  }
  return pieces;
}

Field parseField(const std::string &text) {
  Field field;
  field.any = text == "*";
  if (field.any || text.empty()) return field;
  for (const std::string &number : splitAt(text, ',')) {
    size_t used = 0;
    field.values.insert(std::stoll(number, &used));
    EXPECT_EQ(used, number.size()) << text;
  }
  return field;
}

struct CronLine {
  Field minute, hour, day, month, weekday;

  // Where both days are restricted, either is enough: no task's line does so.
  bool matches(const Minute &now) const {
    return minute.matches(now.minute) && hour.matches(now.hour) && day.matches(now.day) &&
           month.matches(now.month) && weekday.matches(now.weekday);
  }
};

CronLine parseLine(const std::string &line) {
  const std::vector<std::string> fields = splitAt(line, '\t');
  EXPECT_EQ(fields.size(), 7U) << line;
  if (fields.size() != 7) return {};
  EXPECT_EQ(fields[5], "root");
  const CronLine parsed = {parseField(fields[0]), parseField(fields[1]), parseField(fields[2]),
                           parseField(fields[3]), parseField(fields[4])};
  EXPECT_TRUE(parsed.weekday.any || (parsed.day.any && parsed.month.any)) << line;
  return parsed;
}

// The lines of the crontab by the ids of their tasks.
std::map<int, std::string> linesById() {
  const std::string mark = "--run id=";
  std::map<int, std::string> lines;
  for (const std::string &line : crontabLines()) {
    const size_t at = line.find(mark);
    EXPECT_NE(at, std::string::npos) << line;
    if (at == std::string::npos) continue;
    EXPECT_TRUE(lines.emplace(std::atoi(line.c_str() + at + mark.size()), line).second) << line;
  }
  return lines;
}

// ---- the task's side

bool startsOnDay(const ZELO_SCHED_TASK &task, const Minute &now) {
  const bool sameDay = static_cast<uint32_t>(now.day) == task.StartDay;
  const bool sameMonth = static_cast<uint32_t>(now.month) == task.StartMonth;
  const auto weekday = static_cast<size_t>(now.weekday);
  if (task.Type == ZELO_SCHED_TYPE_WEEKLY) {
    return weekday >= std::strlen(task.Week) || task.Week[weekday] == '1';
  }
  if (task.Type == ZELO_SCHED_TYPE_MONTHLY) return sameDay;
  // A crontab knows no years: what runs once does so on its day of every year.
  if (task.Type == ZELO_SCHED_TYPE_YEARLY || task.Type == ZELO_SCHED_TYPE_ONCE) {
    return sameDay && sameMonth;
  }
  return true;
}

bool startsInHour(const ZELO_SCHED_TASK &task, int hour) {
  const int first = static_cast<int>(task.RunHour);
  const int last = static_cast<int>(task.LastWorkHour);
  const int repeat = static_cast<int>(task.RepeatHour);
  if (hour == first) return true;
  return repeat != 0 && hour > first && hour <= last && (hour - first) % repeat == 0;
}

bool starts(const ZELO_SCHED_TASK &task, const Minute &now) {
  return static_cast<uint32_t>(now.minute) == task.RunMin && startsInHour(task, now.hour) &&
         startsOnDay(task, now);
}

// ---- every minute of a leap year and of the year after it

template <typename Visit>
void eachDay(Visit visit) {
  constexpr std::array kDays = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  int weekday = 1;  // 1 January 2024 was a Monday
  for (const int year : {2024, 2025}) {
    for (int month = 1; month <= 12; ++month) {
      const int days = kDays[static_cast<size_t>(month - 1)] + (month == 2 && year == 2024);
      for (int day = 1; day <= days; ++day) {
        visit(Minute{year, month, day, weekday, 0, 0});
        weekday = (weekday + 1) % 7;
      }
    }
  }
}

std::string describe(const Minute &now) {
  std::ostringstream text;
  text << now.year << "-" << now.month << "-" << now.day << " " << now.hour << ":" << now.minute;
  return text.str();
}

// The first minute about which line and task disagree, or "".
std::string firstDifference(const ZELO_SCHED_TASK &task, const CronLine &line) {
  std::string difference;
  eachDay([&](Minute now) {
    for (now.hour = 0; now.hour < 24; ++now.hour) {
      for (now.minute = 0; now.minute < 60; ++now.minute) {
        if (difference.empty() && line.matches(now) != starts(task, now)) {
          difference = describe(now);
        }
      }
    }
  });
  return difference;
}

class CrontabLinePropertyTest : public SandboxTest {
 protected:
  // Without writing the crontab, which a later sync does.
  static void addToStore(const ZELO_SCHED_TASK *task) {
    PSZHASH hash = QLIBCSzHashAlloc(1);
    ASSERT_EQ(ZELOSchedInitHashFromTask(&hash, task), 0);
    ASSERT_GE(QLIBCFileAddSection(kStore, std::to_string(task->ID).c_str(), hash, 0), 0);
    QLIBCSzHashFree(hash);
  }
};

Task randomTask(std::mt19937 *random, int id) {
  const auto number = [&](uint32_t from, uint32_t to) {
    return std::uniform_int_distribution<uint32_t>(from, to)(*random);
  };
  Task task = makeTask("task", "true");
  task->ID = id;
  task->Type = static_cast<int32_t>(number(0, 4));
  task->StartYear = number(1970, 2100);
  task->StartMonth = number(1, 12);
  task->StartDay = number(1, 31);
  task->RunHour = number(0, 23);
  task->RunMin = number(0, 59);
  task->RepeatHour = number(0, 1) == 0 ? 0 : number(1, 24);
  task->LastWorkHour = number(0, 23);
  for (size_t i = 0; i < 7; ++i) task->Week[i] = number(0, 1) == 0 ? '0' : '1';
  if (number(0, 9) == 0) task->Week[number(0, 6)] = '\0';
  return task;
}

TEST_F(CrontabLinePropertyTest, ALineMatchesTheMinutesOfItsTaskAndNoOther) {
  constexpr int kTasks = 60;
  constexpr unsigned kSeed = 20130507;
  std::mt19937 random(kSeed);
  std::vector<Task> tasks;
  for (int id = 1; id <= kTasks; ++id) {
    tasks.push_back(randomTask(&random, id));
    addToStore(tasks.back().get());
  }
  ASSERT_EQ(ZELOSchedTaskSync(), 0);
  const std::map<int, std::string> lines = linesById();
  ASSERT_EQ(lines.size(), tasks.size());
  for (const Task &task : tasks) {
    const std::string &line = lines.at(task->ID);
    EXPECT_EQ(firstDifference(*task, parseLine(line)), "") << line;
  }
}

// The comparison above detects lines that are wrong.
TEST_F(CrontabLinePropertyTest, ALineThatIsWrongIsToldApart) {
  const Task task = makeTask("task", "true");
  task->RunHour = 8;
  task->RepeatHour = 3;
  task->LastWorkHour = 17;
  for (const char *fields : {"1\t8,11,14,17\t*\t*\t*", "0\t8,11,14\t*\t*\t*", "0\t*\t*\t*\t*",
                             "0\t8,11,14,17\t29\t2\t*", "0\t8,11,14,17\t*\t*\t1,2,3,4,5,6"}) {
    EXPECT_NE(firstDifference(*task, parseLine(fields + std::string("\troot\tx"))), "") << fields;
  }
  EXPECT_EQ(firstDifference(*task, parseLine("0\t8,11,14,17\t*\t*\t*\troot\tx")), "");
}

TEST_F(CrontabLinePropertyTest, NumbersThatNoDayHasEndAtOnceAndMatchNoHourAfterIt) {
  const std::array<uint32_t, 7> numbers = {0, 1, 23, 24, 31, 99, UINT32_MAX};
  std::vector<Task> tasks;
  for (const uint32_t first : numbers) {
    for (const uint32_t repeat : numbers) {
      for (const uint32_t last : numbers) {
        Task task = makeTask("task", "true");
        task->ID = static_cast<int32_t>(tasks.size() + 1);
        task->RunHour = first;
        task->RepeatHour = repeat;
        task->LastWorkHour = last;
        addToStore(task.get());
        tasks.push_back(std::move(task));
      }
    }
  }
  ASSERT_EQ(ZELOSchedTaskSync(), 0);
  const std::map<int, std::string> lines = linesById();
  ASSERT_EQ(lines.size(), tasks.size());
  for (const Task &task : tasks) {
    const std::string &line = lines.at(task->ID);
    SCOPED_TRACE(line);
    const CronLine parsed = parseLine(line);
    EXPECT_LE(parsed.hour.values.size(), 24U);
    for (int64_t hour = 0; hour < 24; ++hour) {
      const int64_t first = task->RunHour;
      const int64_t repeat = task->RepeatHour;
      const int64_t last = task->LastWorkHour;
      const bool wanted = hour == first || (repeat != 0 && hour > first && hour <= last &&
                                            (hour - first) % repeat == 0);
      EXPECT_EQ(parsed.hour.matches(static_cast<int>(hour)), wanted) << hour;
    }
  }
}

}  // namespace
}  // namespace support
