// A task from JSON on a stored one, and the start date that JSON tells.
#include <gtest/gtest.h>
#include <json/json.h>

#include <string>

#include "json/task_json.h"
#include "runs/time_limit.h"
#include "sandbox_fixture.h"
#include "store/task_list.h"
#include "terminal/schedule_text.h"

namespace support {
namespace {

class ZeloschedTaskJsonTest : public SandboxTest {
 protected:
  ::Task task_ = newTask(ZELO_SCHED_BACKEND_SCHEDULE);

  // Of members that are added to those that must be there.
  static Json::Value object(const std::string &schedule, const std::string &more = "") {
    JsonFaults faults;
    const std::string text =
        R"({"version": 1, "tasks": [{"name": "n", "owner": "root", "command": "true")" + more +
        R"(, "schedule": )" + schedule + "}]}";
    const std::vector<TaskText> tasks = taskTextsOf(text, &faults);
    EXPECT_TRUE(faults.empty() && tasks.size() == 1) << text;
    return tasks.front().object;
  }

  // The faults, a line each.
  std::string fill(const std::string &schedule, const std::string &more = "") {
    JsonFaults faults;
    fillTask({"tasks[0]", object(schedule, more)}, task_.get(), &faults);
    std::string lines;
    for (const JsonFault &fault : faults) lines += fault.place + ": " + fault.what + "\n";
    return lines;
  }

  std::string from() const { return settingsOf(*task_)["schedule"]["from"].asString(); }
  void start(uint32_t year, uint32_t month, uint32_t day) {
    task_->StartYear = year;
    task_->StartMonth = month;
    task_->StartDay = day;
  }
};

constexpr char kDaily[] = R"({"type": "daily", "at": "08:30"})";

TEST_F(ZeloschedTaskJsonTest, AMemberThatIsAbsentKeepsWhatTheTaskHas) {
  ASSERT_EQ(fill(R"({"type": "daily", "at": "08:30", "every_hours": 2, "until_hour": 18,
                     "from": "2099-01-31"})",
                 R"(, "app": "a", "app_name": "b", "app_args": "c", "action": "d", "enabled": false,
                    "time_limit": "2h", "overlap": {"task": true, "app": false},
                    "ui": {"edit_dialog": "e", "edit_form": "f", "listable": false})"),
            "");
  const Json::Value before = settingsOf(*task_);
  EXPECT_EQ(before["time_limit"], "2h");
  EXPECT_EQ(fill(kDaily), "");
  EXPECT_EQ(settingsOf(*task_), before);
}

TEST_F(ZeloschedTaskJsonTest, ACommandKeepsItsLimitAndALimitItsCommand) {
  setText(task_->Command, "command", storedCommand({"old", "2h"}));
  EXPECT_EQ(fill(kDaily), "");
  EXPECT_EQ(std::string(task_->Command), storedCommand({"true", "2h"}));
  EXPECT_EQ(fill(kDaily, R"(, "time_limit": null)"), "");
  EXPECT_STREQ(task_->Command, "true");
}

TEST_F(ZeloschedTaskJsonTest, NullTakesARepetitionAndAStartAway) {
  EXPECT_EQ(fill(R"({"type": "daily", "at": "08:30", "every_hours": 2, "from": "2099-01-31"})"),
            "");
  EXPECT_EQ(task_->LastWorkHour, 23U);
  EXPECT_EQ(fill(R"({"type": "daily", "at": "08:30", "every_hours": null, "from": null})"), "");
  EXPECT_EQ(task_->RepeatHour, 0U);
  EXPECT_EQ(from(), "");
}

TEST_F(ZeloschedTaskJsonTest, AStartStaysWithTheSameScheduleAlone) {
  EXPECT_EQ(fill(R"({"type": "monthly", "at": "08:30", "day": 15, "from": "2099-01-15"})"), "");
  EXPECT_EQ(fill(R"({"type": "monthly", "at": "09:30", "day": 15})"), "");
  EXPECT_EQ(from(), "2099-01-15");
  EXPECT_EQ(fill(R"({"type": "monthly", "at": "09:30", "day": 16})"), "");
  EXPECT_EQ(from(), "");
  EXPECT_EQ(fill(R"({"type": "daily", "at": "09:30", "from": "2099-01-15"})"), "");
  EXPECT_EQ(fill(R"({"type": "weekly", "at": "09:30", "days": ["mon"]})"), "");
  EXPECT_EQ(from(), "");
}

TEST_F(ZeloschedTaskJsonTest, AKeptLastHourThatIsTooEarlyIsAFaultOfTheTask) {
  ASSERT_EQ(fill(R"({"type": "daily", "at": "08:30", "every_hours": 2, "until_hour": 10})"), "");
  EXPECT_EQ(fill(R"({"type": "daily", "at": "11:30"})").substr(0, 30),
            "tasks[0]: the last hour 10 is ");
}

// What is stored may be no day of the schedule; the next one that is means the same.
TEST_F(ZeloschedTaskJsonTest, AStartIsToldAsADayOnWhichTheTaskRuns) {
  setMonthly(task_.get(), "31 08:30");
  start(2027, 2, 31);
  EXPECT_EQ(from(), "2027-03-31");
  start(2027, 0, 31);
  EXPECT_EQ(from(), "2027-01-31");
  start(0, 2, 31);
  EXPECT_EQ(from(), "");
  setYearly(task_.get(), "02-29 08:30");
  start(2097, 2, 29);
  EXPECT_EQ(from(), "2104-02-29");  // 2100 is no leap year
  setDaily(task_.get(), "08:30");
  start(2027, 0, 0);
  EXPECT_EQ(from(), "2027-01-01");
  start(0, 0, 0);
  EXPECT_EQ(from(), "");
}

}  // namespace
}  // namespace support
