// The machine's power schedule as tasks: the operations of the backend one by one, then the
// exported calls with ordinary tasks beside the power tasks.
#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <optional>

#include "backends/power_day_names.h"
#include "backends/power_id.h"
#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "power_calls.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kUnit[] = "backend_zeloautopower.cpp:N ";
constexpr char kKey[] = "/usr/zelo/bin/zelo_poweroff_feasible_check";
constexpr char kInjected[] = "[0x0900 injected.cpp:N]";
constexpr int kInjectedCode = 0x0900;

const Entry kDailyOn{1, 127, 7, 30};
constexpr long kDailyOnId = 71270730;
const Entry kWorkdaysOff{1, 62, 22, 15};
constexpr long kWorkdaysOffId = 90622215;

const Entry kWithoutId{2, 127, 7, 30};

std::string line(const std::string &text) {
  return kUnit + text;
}
std::string argument(const std::string &condition) {
  return line("Invaild Argument (" + condition + ")=[0]\n");
}

// What the backend itself logged.
Lines ownLines() {
  Lines lines = logged();
  std::erase_if(lines, [](const std::string &text) { return !text.starts_with(kUnit); });
  return lines;
}

Lines syncCalls(size_t linesToRemove, const Lines &schedules = {}) {
  Lines calls = {"PoweronSet", "ConfGet 1 100"};
  for (size_t i = 0; i <= linesToRemove; ++i) {
    calls.push_back(std::string("SetLine /etc/crontab ") + kKey);
  }
  calls.push_back(std::string("UpdateCrontab ") + kKey + " 0 1");
  calls.insert(calls.end(), schedules.begin(), schedules.end());
  return calls;
}

std::string scheduleCall(const Entry &entry) {
  const std::string hour = std::to_string(entry.hour);
  return "ScheduleSet " + std::to_string(entry.weekdays) + " " + hour + " 0 " + hour + " " +
         std::to_string(entry.minute) + " 0 " + kKey + " 1";
}

const std::string kWorkdaysOffLine = std::string("15\t22\t*\t*\t1,2,3,4,5\troot\t") + kKey;

std::string weekOf(unsigned weekdays) {
  std::string week(7, '0');
  for (size_t i = 0; i < week.size(); ++i) {
    if ((weekdays >> i & 1U) != 0) week[i] = '1';
  }
  return week;
}

Task powerTask(const std::string &appArgs, const Entry &entry) {
  Task task = makeTask("", "");
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  task->State = entry.enabled == 1 ? ZELO_SCHED_STATE_ENABLED : ZELO_SCHED_STATE_DISABLED;
  setText(task->AppArgs, appArgs);
  setText(task->Week, weekOf(entry.weekdays));
  task->RunHour = entry.hour;
  task->RunMin = entry.minute;
  return task;
}

Lines namesOf(const ZELO_SCHED_TASK *task) {
  Lines names;
  for (; task != nullptr; task = task->next) names.emplace_back(task->Name);
  return names;
}

const ZELO_SCHED_TASK *watchedRecord = nullptr;
bool watchedWasFreed = false;

class AutopowerTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    ASSERT_EQ(ZELOSchedBackendInit(), 0);
    startAnew();
  }
  static void startAnew() {
    cleanWorld();
    haveClock();
    resetPowerCalls();
    setClock("2013-05-07 06:00");
  }
  void TearDown() override {
    resetPowerCalls();
    SandboxTest::TearDown();
  }

  static const ZELO_SCHED_BACKEND &backend() { return SchedBackends[1]; }
  static void setLists(const Entries &on, const Entries &off) {
    setPowerList(kOn, on);
    setPowerList(kOff, off);
    resetPowerCalls();
  }
  static ZELO_SCHED_TASK *fresh() {
    static ZELO_SCHED_TASK task;
    task = {};
    return &task;
  }

  struct Listed {
    int result;
    TaskList list;
  };
  static Listed list(ZELO_SCHED_TASK_FILTER filter = nullptr) {
    ZELO_SCHED_TASK *head = nullptr;
    const int result = backend().list_get(&head, filter);
    return {result, TaskList(head)};
  }
  static int create(const std::string &appArgs, const Entry &entry) {
    const Task task = powerTask(appArgs, entry);
    const int result = backend().create(task.get());
    EXPECT_EQ(task->ID, powerIdOf({appArgs == "poweron" ? kOn : kOff, entry}));
    return result;
  }
  static int edit(long id, const std::string &appArgs, const Entry &entry) {
    const Task task = powerTask(appArgs, entry);
    task->ID = static_cast<int32_t>(id);
    const int result = backend().edit(task.get());
    EXPECT_EQ(task->ID, id) << "the record keeps the old id";
    return result;
  }
};

// ---- registration

TEST_F(AutopowerTest, ItIsRegisteredAtIndexOne) {
  EXPECT_EQ(cBackend, 2U);
  EXPECT_EQ(backend().id, -3);
  EXPECT_STREQ(backend().szName, "zeloautopower");
}

TEST_F(AutopowerTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  const Task task = powerTask("poweroff", kDailyOn);
  int status = 0;
  char comment[4] = "abc";
  expectRefused(
      "backend_zeloautopower.cpp",
      {
          {"((void *)0) != pTask", [] { return backend().get_default(nullptr); }},
          {"((void *)0) != pTaskList", [] { return backend().list_get(nullptr, nullptr); }},
          {"((void *)0) != pTask", [] { return backend().get_by_id(kDailyOnId, nullptr); }},
          {"((void *)0) != pTask", [] { return backend().create(nullptr); }},
          {"((void *)0) != pTask", [] { return backend().edit(nullptr); }},
          {"((void *)0) != pTask", [&] { return backend().run(nullptr, &status, comment, 4); }},
          {"((void *)0) != pStatusCode",
           [&] { return backend().run(task.get(), nullptr, comment, 4); }},
          {"((void *)0) != szComment",
           [&] { return backend().run(task.get(), &status, nullptr, 4); }},
          {"0 < cbComment", [&] { return backend().run(task.get(), &status, comment, 0); }},
      });
  EXPECT_STREQ(comment, "abc");
  EXPECT_EQ(powerCalls(), Lines{});
}

// ---- ids

TEST_F(AutopowerTest, TheIdIsMadeOfListAndEntry) {
  EXPECT_EQ(powerIdOf({kOn, {0, 127, 7, 30}}), 61270730);
  EXPECT_EQ(powerIdOf({kOn, kDailyOn}), kDailyOnId);
  EXPECT_EQ(powerIdOf({kOff, {0, 1, 0, 0}}), 80010000);
  EXPECT_EQ(powerIdOf({kOff, kWorkdaysOff}), kWorkdaysOffId);
  EXPECT_EQ(powerIdOf({kOn, {0, 0, 0, 0}}), 60000000);
}

TEST_F(AutopowerTest, EveryEntryComesBackFromItsId) {
  for (const int list : {kOn, kOff}) {
    for (unsigned enabled = 0; enabled <= 1; ++enabled) {
      for (unsigned weekdays = 0; weekdays <= 255; ++weekdays) {
        for (unsigned hour = 0; hour <= 99; hour += 1 + hour / 24 * 25) {
          for (unsigned minute = 0; minute <= 99; minute += 3) {
            const PowerTime time{
                list,
                {static_cast<unsigned char>(enabled), static_cast<unsigned char>(weekdays),
                 static_cast<unsigned char>(hour), static_cast<unsigned char>(minute)}};
            const auto id = powerIdOf(time);
            ASSERT_TRUE(id.has_value());
            ASSERT_TRUE(isPowerId(*id));
            ASSERT_TRUE(powerTimeOf(*id) == time);
          }
        }
      }
    }
  }
}

TEST_F(AutopowerTest, AnEntryThatItsDigitsCannotHoldHasNoId) {
  for (const Entry &entry :
       {Entry{2, 0, 0, 0}, Entry{255, 0, 0, 0}, Entry{1, 0, 100, 0}, Entry{1, 0, 0, 100}}) {
    EXPECT_FALSE(powerIdOf({kOn, entry}).has_value()) << entry;
    EXPECT_FALSE(powerIdOf({kOff, entry}).has_value()) << entry;
  }
}

TEST_F(AutopowerTest, TheWeekdayDigitsOfAnIdAreKeptToABytesBits) {
  const auto time = powerTimeOf(73000730);
  ASSERT_TRUE(time.has_value());
  EXPECT_EQ(time->entry, (Entry{1, 300 & 0xFF, 7, 30}));
}

TEST_F(AutopowerTest, IdsOutsideTheRangeAreNotItsOwn) {
  for (const long id : {0L, 1L, 59999999L, 100000000L, 160000000L, -1L, -60000000L, -71270730L,
                        LONG_MAX, LONG_MIN}) {
    SCOPED_TRACE(id);
    EXPECT_EQ(backend().owns_id(id), 0);
    EXPECT_EQ(backend().get_by_id(id, fresh()), 0);
    EXPECT_EQ(backend().remove(id), 0);
  }
  EXPECT_EQ(backend().owns_id(60000000), 1);
  EXPECT_EQ(backend().owns_id(99999999), 1);
  EXPECT_EQ(powerCalls(), Lines{});
  EXPECT_EQ(logged(), Lines{});
}

// ---- the default task

TEST_F(AutopowerTest, TheDefaultTaskIsANewDailyOneAtMidnight) {
  ZELO_SCHED_TASK *task = fresh();
  task->Backend = -3;
  EXPECT_EQ(backend().get_default(task), 0);
  EXPECT_EQ(task->Backend, -3);
  EXPECT_EQ(task->ID, -1);
  EXPECT_STREQ(task->Name, "Power");
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_ENABLED);
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_DAILY);
  EXPECT_EQ(task->RunHour, 0U);
  EXPECT_EQ(task->RunMin, 0U);
  EXPECT_EQ(task->StartYear, 0U);
  EXPECT_EQ(task->StartMonth, 0U);
  EXPECT_EQ(task->StartDay, 0U);
  EXPECT_STREQ(task->App, "");
  EXPECT_STREQ(task->AppName, "#schedule:power_on_off#");
  EXPECT_STREQ(task->Action, "");
  EXPECT_STREQ(task->Command, "");
  EXPECT_STREQ(task->Week, "1111111");
  EXPECT_EQ(task->CanEditFromUI, 1);
  EXPECT_EQ(task->Owner, 0U);
  EXPECT_STREQ(task->EditDialog, "ZELO.TOV.TaskScheduler.EditDialog");
}

TEST_F(AutopowerTest, AKeyThatTheDefaultTaskLacksIsReported) {
  for (const char *key :
       {"id", "name", "run hour", "run min", "app", "app name", "action", "cmd", "state", "type"}) {
    SCOPED_TRACE(key);
    clearLog();
    failCallFor("QLIBCSzHashGetValue", key, {.code = kInjectedCode});
    EXPECT_EQ(backend().get_default(fresh()), -1);
    EXPECT_EQ(logged(),
              Lines{line("Get hash value failed. key:[" + std::string(key) + "]. ") + kInjected});
    resetFailingCalls();
  }
}

// ---- listing

TEST_F(AutopowerTest, TheListHoldsBothListsFromTheirEndsPowerOffFirst) {
  setLists({kDailyOn, {0, 1, 8, 0}}, {kWorkdaysOff, {0, 2, 23, 0}, {1, 127, 1, 5}});
  const Listed listed = list();
  EXPECT_EQ(listed.result, 5);
  EXPECT_EQ(namesOf(listed.list.get()),
            (Lines{"PowerOff task 2", "PowerOff task 1", "PowerOff task 0", "PowerOn task 1",
                   "PowerOn task 0"}));
  std::vector<long> ids;
  for (const ZELO_SCHED_TASK *task = listed.list.get(); task != nullptr; task = task->next) {
    ids.push_back(task->ID);
  }
  EXPECT_EQ(ids, (std::vector<long>{91270105, 80022300, kWorkdaysOffId, 60010800, kDailyOnId}));
  EXPECT_EQ(powerCalls(), (Lines{"ConfGet 0 100", "ConfGet 1 100"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, AListedTaskIsFilledFromItsEntry) {
  setLists({{0, 1, 8, 5}}, {kWorkdaysOff});
  const Listed listed = list();
  const ZELO_SCHED_TASK *off = listed.list.get();
  ASSERT_NE(off, nullptr);
  const ZELO_SCHED_TASK *on = off->next;
  ASSERT_NE(on, nullptr);
  EXPECT_EQ(off->State, ZELO_SCHED_STATE_ENABLED);
  EXPECT_EQ(on->State, ZELO_SCHED_STATE_DISABLED);
  EXPECT_STREQ(off->Week, "0111110");
  EXPECT_STREQ(on->Week, "1000000");
  EXPECT_EQ(off->RunHour, 22U);
  EXPECT_EQ(off->RunMin, 15U);
  EXPECT_EQ(off->LastWorkHour, 22U);
  EXPECT_EQ(on->RunHour, 8U);
  EXPECT_EQ(on->RunMin, 5U);
  EXPECT_EQ(on->LastWorkHour, 8U);
  EXPECT_EQ(off->CanRunFromUI, 1);
  EXPECT_EQ(on->CanRunFromUI, 0);
  EXPECT_STREQ(off->AppArgs, "poweroff");
  EXPECT_STREQ(on->AppArgs, "poweron");
  EXPECT_STREQ(off->Action, "#schedule:power_off#");
  EXPECT_STREQ(on->Action, "#schedule:power_on#");
  EXPECT_STREQ(off->NextTriggerTime, "2013-05-07 22:15");
  EXPECT_STREQ(on->NextTriggerTime, "2013-05-12 08:05");
  for (const ZELO_SCHED_TASK *task : {off, on}) {
    EXPECT_EQ(task->Backend, -3);
    EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_WEEKLY);
    EXPECT_EQ(task->RepeatHour, 0U);
    EXPECT_EQ(task->Listable, 1);
    EXPECT_EQ(task->CanEditName, 0);
    EXPECT_EQ(task->CanEditOwner, 0);
    EXPECT_EQ(task->CanRunAppSameTime, 1);
    EXPECT_EQ(task->CanRunTaskSameTime, 1);
    EXPECT_EQ(task->CanEditFromUI, 1);
    EXPECT_EQ(task->CanDeleteFromUI, 1);
    EXPECT_EQ(task->StartYear, 0U);
    EXPECT_STREQ(task->App, "ZELO.TOV.TaskScheduler.AutoPower");
    EXPECT_STREQ(task->AppName, "#schedule:power_on_off#");
    EXPECT_STREQ(task->Command, "");
  }
}

TEST_F(AutopowerTest, EveryDayShowsAsDailyAndAnythingElseAsWeekly) {
  setLists({{1, 127, 1, 0}, {1, 126, 1, 0}, {1, 0, 1, 0}}, {});
  const Listed listed = list();
  ASSERT_EQ(listed.result, 3);
  const ZELO_SCHED_TASK *task = listed.list.get();
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_WEEKLY);
  EXPECT_STREQ(task->Week, "0000000");
  task = task->next;
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_WEEKLY);
  EXPECT_EQ(task->next->Type, ZELO_SCHED_TYPE_DAILY);
}

TEST_F(AutopowerTest, EmptyListsLeaveTheCallersListUntouched) {
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  EXPECT_EQ(backend().list_get(&head, nullptr), 0);
  EXPECT_EQ(head, &own);
  EXPECT_EQ(own.next, nullptr);
}

TEST_F(AutopowerTest, TheTasksGoToTheEndOfTheCallersList) {
  setLists({kDailyOn}, {});
  ZELO_SCHED_TASK second = {};
  ZELO_SCHED_TASK first = {};
  first.next = &second;
  ZELO_SCHED_TASK *head = &first;
  EXPECT_EQ(backend().list_get(&head, nullptr), 1);
  const TaskList added(second.next);
  EXPECT_EQ(head, &first);
  EXPECT_EQ(first.next, &second);
  EXPECT_EQ(namesOf(added.get()), Lines{"PowerOn task 0"});
}

TEST_F(AutopowerTest, AFilteredTaskIsNeitherListedNorCountedNorReleased) {
  setLists({kDailyOn, {1, 1, 8, 0}}, {kWorkdaysOff});
  watchedWasFreed = false;
  const Listed listed = list([](const ZELO_SCHED_TASK *task) {
    if (std::strcmp(task->Name, "PowerOn task 1") != 0) return 1;
    EXPECT_EQ(task->ID, 70010800) << "the filter sees a whole task";
    watchedRecord = task;
    return 0;
  });
  EXPECT_EQ(listed.result, 2);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"PowerOff task 0", "PowerOn task 0"}));
  ASSERT_NE(watchedRecord, nullptr);
  EXPECT_FALSE(watchedWasFreed);
  EXPECT_STREQ(watchedRecord->Name, "PowerOn task 1");
  auto *dropped = const_cast<ZELO_SCHED_TASK *>(watchedRecord);
  watchedRecord = nullptr;
  EXPECT_EQ(ZELOSchedTaskFree(dropped), 0);
}

TEST_F(AutopowerTest, WhatWasGatheredIsFreedWhenTheListingFails) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer watches for leaks itself";
  setLists({kDailyOn}, {kWorkdaysOff});
  failPowerCall("ConfGet 1", {.code = kInjectedCode});
  watchedWasFreed = false;
  const Listed listed = list([](const ZELO_SCHED_TASK *task) {
    watchedRecord = task;
    return 1;
  });
  EXPECT_EQ(listed.result, -1);
  EXPECT_NE(watchedRecord, nullptr);
  EXPECT_TRUE(watchedWasFreed);
  watchedRecord = nullptr;
}

TEST_F(AutopowerTest, ARecordThatCannotBeAllocatedFailsTheListing) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates";
  setLists({kDailyOn, kDailyOn}, {});
  Listed listed{};
  {
    FailingAllocation scope("calloc", {.from = 2, .minSize = sizeof(ZELO_SCHED_TASK)});
    listed = list();
  }
  EXPECT_EQ(listed.result, -1);
  EXPECT_EQ(listed.list, nullptr);
  EXPECT_EQ(logged(), Lines{line("malloc ZELO_SCHED_TASK failed.")});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "backend_zeloautopower.cpp"}));
}

TEST_F(AutopowerTest, AnEntryWithoutAnIdFailsTheListing) {
  giveList(kOff, {kWorkdaysOff, kWithoutId});
  EXPECT_EQ(list().result, -1);
  EXPECT_EQ(logged(), Lines{line("zeloautopower_get_from_psched failed.")});
  EXPECT_EQ(errorRecord(), kNoError);
}

TEST_F(AutopowerTest, ANextTriggerTimeThatIsUnknownFailsTheListing) {
  setLists({kDailyOn}, {});
  failCall("localtime");
  EXPECT_EQ(list().result, -1);
  EXPECT_EQ(ownLines(), (Lines{line("Failed to obtain next trigger time. id:[71270730]. "
                                    "[0x2A00 sched_util.cpp:N]"),
                               line("Get task from Power schedule failed. ")}));
}

// ---- one task by its id

TEST_F(AutopowerTest, ATaskIsFoundByItsIdAndNamedInTheOtherForm) {
  setLists({{1, 1, 8, 0}, kDailyOn}, {{0, 127, 0, 0}, {0, 127, 0, 1}, kWorkdaysOff});
  ZELO_SCHED_TASK *task = fresh();
  EXPECT_EQ(backend().get_by_id(kDailyOnId, task), 1);
  EXPECT_STREQ(task->Name, "Poweron 1");
  EXPECT_EQ(task->ID, kDailyOnId);
  EXPECT_EQ(task->Backend, -3);
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_DAILY);
  EXPECT_STREQ(task->AppArgs, "poweron");
  EXPECT_STREQ(task->NextTriggerTime, "2013-05-07 07:30");
  EXPECT_EQ(powerCalls(), Lines{"ConfGet 0 100"});
  EXPECT_EQ(backend().get_by_id(kWorkdaysOffId, task), 1);
  EXPECT_STREQ(task->Name, "Poweroff 2");
  EXPECT_STREQ(task->Week, "0111110");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, OfEqualEntriesTheFirstIsFound) {
  setLists({{1, 1, 8, 0}, kDailyOn, kDailyOn}, {});
  ZELO_SCHED_TASK *task = fresh();
  EXPECT_EQ(backend().get_by_id(kDailyOnId, task), 1);
  EXPECT_STREQ(task->Name, "Poweron 1");
}

TEST_F(AutopowerTest, AnIdWhoseEntryIsNotInTheListIsNotFound) {
  ZELO_SCHED_TASK *task = fresh();
  EXPECT_EQ(backend().get_by_id(kDailyOnId, task), 0) << "an empty list";
  EXPECT_EQ(task->Backend, -3);
  setLists({kDailyOn}, {kDailyOn});
  EXPECT_EQ(backend().get_by_id(61270730, task), 0) << "there it is enabled";
  EXPECT_EQ(backend().get_by_id(kWorkdaysOffId, task), 0);
  EXPECT_EQ(backend().get_by_id(73830730, task), 0) << "the same but for digits above a byte";
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, AnIdThatIsNotItsOwnStillMarksTheRecord) {
  ZELO_SCHED_TASK *task = fresh();
  EXPECT_EQ(backend().get_by_id(5, task), 0);
  EXPECT_EQ(task->Backend, -3);
}

TEST_F(AutopowerTest, AnEntryWithoutAnIdFailsTheLookupOfThoseBehindIt) {
  giveList(kOn, {{1, 1, 8, 0}, kWithoutId, kDailyOn});
  EXPECT_EQ(backend().get_by_id(kDailyOnId, fresh()), -1);
  EXPECT_EQ(logged(), Lines{line("transform power schedule to id failed. ")});
  EXPECT_EQ(backend().get_by_id(70010800, fresh()), 1);
}

TEST_F(AutopowerTest, ANextTriggerTimeThatIsUnknownFailsTheLookup) {
  giveList(kOn, {kDailyOn});
  const std::string unknown =
      line("Failed to obtain next trigger time. id:[71270730]. [0x2A00 sched_util.cpp:N]");
  failCall("localtime");
  EXPECT_EQ(backend().get_by_id(kDailyOnId, fresh()), -1);
  EXPECT_EQ(ownLines(),
            (Lines{unknown, line("Get task from Power schedule failed. id:[71270730]")}));
  resetFailingCalls();
  clearLog();
  failCall("localtime", {.from = 2});
  EXPECT_EQ(backend().get_by_id(kDailyOnId, fresh()), -1) << "it is worked out twice";
  EXPECT_EQ(ownLines(), Lines{unknown});
}

// ---- creating

TEST_F(AutopowerTest, ACreatedTaskIsAppendedToItsListAndCarriedOut) {
  setLists({{0, 1, 1, 1}}, {});
  const Task on = powerTask("poweron", kDailyOn);
  EXPECT_EQ(backend().create(on.get()), 0);
  EXPECT_EQ(on->ID, kDailyOnId);
  EXPECT_STREQ(on->Name, "Power task");
  EXPECT_EQ(powerList(kOn), (Entries{{0, 1, 1, 1}, kDailyOn}));
  EXPECT_EQ(alarm(), std::to_string(localTime("2013-05-07 07:30")) + "\n");

  resetPowerCalls();
  const Task off = powerTask("poweroff", kWorkdaysOff);
  setText(off->Name, "mine");
  EXPECT_EQ(backend().create(off.get()), 0);
  EXPECT_EQ(off->ID, kWorkdaysOffId);
  EXPECT_STREQ(off->Name, "mine");
  EXPECT_EQ(crontabLines(), Lines{kWorkdaysOffLine});
  Lines expected = {"ConfGet 1 100", "ConfSet 1 1"};
  for (const std::string &call : syncCalls(0, {scheduleCall(kWorkdaysOff)})) {
    expected.push_back(call);
  }
  EXPECT_EQ(powerCalls(), expected);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, CreatingAnEqualEntryReplacesIt) {
  setLists({kDailyOn, {1, 1, 8, 0}}, {});
  EXPECT_EQ(create("poweron", kDailyOn), 0);
  EXPECT_EQ(powerList(kOn), (Entries{kDailyOn, {1, 1, 8, 0}}));
}

TEST_F(AutopowerTest, AnEqualEntryOfTheOtherListIsAnother) {
  setLists({kDailyOn}, {});
  EXPECT_EQ(create("poweroff", kDailyOn), 0);
  EXPECT_EQ(powerList(kOn), Entries{kDailyOn});
  EXPECT_EQ(powerList(kOff), Entries{kDailyOn});
}

TEST_F(AutopowerTest, AnyCharacterButZeroMakesAWeekdayCount) {
  const Task task = powerTask("poweron", kDailyOn);
  setText(task->Week, "x0 0100");
  EXPECT_EQ(backend().create(task.get()), 0);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 0b0010101, 7, 30}}));
}

TEST_F(AutopowerTest, AWeekThatIsTooShortLeavesTheOtherDaysOnWhateverStandsBehindIt) {
  const Task task = powerTask("poweron", kDailyOn);
  std::memcpy(task->Week,
              "01\0"
              "0000",
              sizeof(task->Week));
  EXPECT_EQ(backend().create(task.get()), 0);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 0b1111110, 7, 30}}));
}

TEST_F(AutopowerTest, OnlyTheEnabledStateEnables) {
  for (const int32_t state :
       {int32_t{ZELO_SCHED_STATE_DISABLED}, int32_t{ZELO_SCHED_STATE_NOT_EXISTED}, -1, 256}) {
    const Task task = powerTask("poweron", kDailyOn);
    task->State = state;
    EXPECT_EQ(backend().create(task.get()), 0);
    EXPECT_EQ(task->ID, 61270730);
  }
  EXPECT_EQ(powerList(kOn), (Entries{{0, 127, 7, 30}}));
}

TEST_F(AutopowerTest, ATaskThatGivesNoEntryIsRefusedBeforeAListIsRead) {
  const std::string notMade =
      line("convert task from power schedule failed. [0x0D00 backend_zeloautopower.cpp:N]");
  const Lines hour = {argument("255 >= pTask->RunHour"), notMade};
  const Lines minute = {argument("255 >= pTask->RunMin"), notMade};
  struct {
    const char *appArgs;
    uint32_t hour;
    uint32_t minute;
    Lines told;
  } refusals[] = {
      {"poweron", 4294967295U, 0, hour},
      {"poweron", 256, 0, hour},
      {"poweron", 263, 0, hour},
      {"poweron", 7, 4294967295U, minute},
      {"poweron", 7, 256, minute},
      {"poweron", 7, 256 + 30, minute},
      {"neither", 256, 0, hour},
      // It would have the id of another entry.
      {"poweron", 100, 30, {line("wired id in transform [-1] ")}},
      {"", 7, 30, {line("Invalid app args for power []")}},
      {"poweron ", 7, 30, {line("Invalid app args for power [poweron ]")}},
      {"Poweron", 7, 30, {line("Invalid app args for power [Poweron]")}},
      {"power", 7, 30, {line("Invalid app args for power [power]")}},
      {"poweroffx", 7, 30, {line("Invalid app args for power [poweroffx]")}},
  };
  for (const auto &refused : refusals) {
    SCOPED_TRACE(testing::Message()
                 << refused.appArgs << " " << refused.hour << ":" << refused.minute);
    startAnew();
    const Task task = powerTask(refused.appArgs, kDailyOn);
    task->RunHour = refused.hour;
    task->RunMin = refused.minute;
    EXPECT_EQ(backend().create(task.get()), -1);
    EXPECT_EQ(logged(), refused.told);
    const bool isArgument = refused.told.size() > 1;
    EXPECT_EQ(errorRecord(),
              isArgument ? (ErrorRecord{0x0D00, "backend_zeloautopower.cpp"}) : kNoError);
    EXPECT_EQ(task->ID, -1);
    EXPECT_EQ(powerCalls(), Lines{});
  }
}

TEST_F(AutopowerTest, ATimeThatNoClockShowsIsRefusedByThePlatform) {
  const Task task = powerTask("poweron", kDailyOn);
  task->RunHour = 24;
  EXPECT_EQ(backend().create(task.get()), -1);
  EXPECT_EQ(logged(), (Lines{line("ZELOAutoPowerConfSet failed. num:[1] "
                                  "[0x0D00 power_schedule.cpp:N]"),
                             line("set task failed. [71272430] [0x0D00 power_schedule.cpp:N]")}));
  EXPECT_EQ(powerList(kOn), Entries{});
  EXPECT_EQ(task->ID, 71272430) << "what was tried";
}

TEST_F(AutopowerTest, AFailedCreationIsReportedUnderTheIdOfTheEntry) {
  const Task task = powerTask("poweron", kDailyOn);
  failPowerCall("ConfSet", {.code = kInjectedCode});
  EXPECT_EQ(ZELOSchedTaskCreate(task.get()), -1);
  EXPECT_EQ(task->ID, kDailyOnId);
  EXPECT_EQ(logged().back(), std::string("sched_task_create.cpp:N Failed to create for backend "
                                         "[1] id:[71270730] ") +
                                 kInjected);
}

TEST_F(AutopowerTest, EveryMessageIsAnError) {
  giveList(kOn, {kWithoutId});
  EXPECT_EQ(backend().list_get(nullptr, nullptr), -1);
  EXPECT_EQ(backend().create(powerTask("", kDailyOn).get()), -1);
  backend().create(powerTask("poweron", kWithoutId).get());
  failPowerCall("PoweronSet", {.code = kInjectedCode});
  EXPECT_EQ(backend().sync(), -1);
  const std::vector<int> priorities = loggedPriorities();
  EXPECT_EQ(priorities.size(), logged().size());
  EXPECT_GT(priorities.size(), 3U);
  for (const int priority : priorities) EXPECT_EQ(priority, 3);
}

TEST_F(AutopowerTest, ADefaultThatDoesNotConvertIsReportedByItsRow) {
  constexpr int kRunHourRow = 15;
  failCallFor("QLIBCSzHashGetValue", "run hour", {.text = "5x"});
  const Task task = makeTask("", "");
  EXPECT_EQ(backend().get_default(task.get()), -1);
  EXPECT_EQ(logged(),
            Lines{line("parm_table[" + std::to_string(kRunHourRow) + "].fnFromHashStr failed.")});
}

TEST_F(AutopowerTest, ATaskCannotBeCreatedWhereTheMachineHasNoClock) {
  haveNoClock();
  EXPECT_EQ(create("poweron", kDailyOn), -1);
  EXPECT_EQ(logged(), (Lines{line("set auto poweron failed. [0x0900 power_on.cpp:N]"),
                             line("sync power hw failed. [0x0900 power_on.cpp:N]")}));
  EXPECT_EQ(errorRecord().code, 0x0900);
  EXPECT_EQ(backend().remove(kDailyOnId), 1) << "nothing is wanted of the clock then";
  EXPECT_EQ(create("poweroff", kWorkdaysOff), 0);
}

TEST_F(AutopowerTest, AFullListIsHandedOnWithOneEntryMore) {
  Entries full;
  for (unsigned char i = 0; i < 100; ++i) full.push_back({0, i, 1, 1});
  giveList(kOn, full);
  takeAnyList();
  EXPECT_EQ(create("poweron", kDailyOn), 0);
  EXPECT_EQ(powerCalls()[1], "ConfSet 0 101");
  full.push_back(kDailyOn);
  EXPECT_EQ(lastList(), full);
}

TEST_F(AutopowerTest, AnEntryWithoutAnIdIsReportedAndPassedOverWhenOneIsSet) {
  giveList(kOn, {kWithoutId, {1, 1, 8, 0}, kWithoutId, kDailyOn});
  takeAnyList();
  EXPECT_EQ(edit(kDailyOnId, "poweron", {1, 2, 9, 0}), 0);
  EXPECT_EQ(logged(), (Lines{line("wired id in power schedule [-1] "),
                             line("wired id in power schedule [-1] ")}));
  EXPECT_EQ(lastList(), (Entries{kWithoutId, {1, 1, 8, 0}, kWithoutId, {1, 2, 9, 0}}));
}

// ---- editing

TEST_F(AutopowerTest, AnEditChangesTheEntryAndSoTheIdUnderWhichItIsFound) {
  setLists({{1, 1, 8, 0}, kDailyOn, {1, 2, 8, 0}}, {});
  EXPECT_EQ(edit(kDailyOnId, "poweron", {0, 64, 9, 45}), 0);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 1, 8, 0}, {0, 64, 9, 45}, {1, 2, 8, 0}}));
  EXPECT_EQ(backend().get_by_id(kDailyOnId, fresh()), 0);
  EXPECT_EQ(backend().get_by_id(60640945, fresh()), 1);
}

TEST_F(AutopowerTest, AnEditKeepsToTheListOfTheIdWhateverTheAppArgsSay) {
  setLists({kDailyOn}, {});
  EXPECT_EQ(edit(kDailyOnId, "poweroff", {1, 127, 8, 0}), 0);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 127, 8, 0}}));
  EXPECT_EQ(powerList(kOff), Entries{});
}

TEST_F(AutopowerTest, AnEditOfAnIdThatIsNotInTheListAppends) {
  setLists({{1, 1, 8, 0}}, {});
  EXPECT_EQ(edit(kDailyOnId, "poweron", {1, 127, 8, 0}), 0);
  Lines expected = {"ConfGet 0 100", "ConfSet 0 2"};
  for (const std::string &call : syncCalls(0)) expected.push_back(call);
  EXPECT_EQ(powerCalls(), expected);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 1, 8, 0}, {1, 127, 8, 0}}));
}

TEST_F(AutopowerTest, AnEditOfAnIdThatIsNotItsOwnOnlySyncs) {
  for (const int32_t id : {59999999, 100000000, -1}) {
    SCOPED_TRACE(id);
    resetPowerCalls();
    EXPECT_EQ(edit(id, "poweron", kDailyOn), 0);
    EXPECT_EQ(powerCalls(), syncCalls(0));
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, AnEditThatCannotBeConvertedLeavesTheList) {
  setLists({kDailyOn}, {});
  const Task task = powerTask("poweron", kDailyOn);
  task->ID = kDailyOnId;
  task->RunHour = 4294967295U;
  EXPECT_EQ(backend().edit(task.get()), -1);
  EXPECT_EQ(
      logged(),
      (Lines{argument("255 >= pTask->RunHour"), line("Convert to autopower schedule failed. "),
             line("set task failed. [71270730] [0x0D00 backend_zeloautopower.cpp:N]")}));
  EXPECT_EQ(powerCalls(), Lines{"ConfGet 0 100"});
}

// ---- removing

TEST_F(AutopowerTest, ARemovedEntryMakesTheLaterOnesMoveForward) {
  setLists({}, {{1, 1, 8, 0}, kWorkdaysOff, {0, 2, 9, 0}, {0, 4, 9, 0}});
  ASSERT_EQ(backend().sync(), 0);
  resetPowerCalls();
  EXPECT_EQ(backend().remove(kWorkdaysOffId), 1);
  Lines expected = {"ConfGet 1 100", "ConfSet 1 3"};
  for (const std::string &call : syncCalls(2, {scheduleCall({1, 1, 8, 0})})) {
    expected.push_back(call);
  }
  EXPECT_EQ(powerCalls(), expected);
  EXPECT_EQ(powerList(kOff), (Entries{{1, 1, 8, 0}, {0, 2, 9, 0}, {0, 4, 9, 0}}));
}

TEST_F(AutopowerTest, TheOnlyAndTheLastEntryCanBeRemoved) {
  setLists({{1, 1, 8, 0}, kDailyOn}, {});
  EXPECT_EQ(backend().remove(kDailyOnId), 1);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 1, 8, 0}}));
  EXPECT_EQ(backend().remove(70010800), 1);
  EXPECT_EQ(powerList(kOn), Entries{});
  EXPECT_EQ(alarm(), "0\n");
}

TEST_F(AutopowerTest, OfEqualEntriesTheFirstIsRemoved) {
  setLists({kDailyOn, {1, 1, 8, 0}, kDailyOn}, {});
  EXPECT_EQ(backend().remove(kDailyOnId), 1);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 1, 8, 0}, kDailyOn}));
}

TEST_F(AutopowerTest, ARemovalThatFindsNothingDoesNotSync) {
  setLists({kDailyOn}, {});
  EXPECT_EQ(backend().remove(61270730), 0);
  EXPECT_EQ(powerCalls(), Lines{"ConfGet 0 100"});
  EXPECT_EQ(logged(), Lines{});
}

// ---- the hardware and the crontab

TEST_F(AutopowerTest, ASyncReplacesThePowerOffLinesAndArmsTheClock) {
  setLists({kDailyOn}, {kWorkdaysOff, {0, 127, 1, 1}, {1, 65, 23, 5}});
  writeFile(kCrontab, std::string(kPlainCrontab) + "1\t1\t*\t*\t*\troot\t" + kKey + "\n# " + kKey +
                          "\n@daily root other\n");
  EXPECT_EQ(backend().sync(), 0);
  EXPECT_EQ(powerCalls(), syncCalls(2, {scheduleCall(kWorkdaysOff), scheduleCall({1, 65, 23, 5})}));
  EXPECT_EQ(crontabLines(), (Lines{"@daily root other", kWorkdaysOffLine,
                                   std::string("5\t23\t*\t*\t0,6\troot\t") + kKey}));
  EXPECT_EQ(alarm(), std::to_string(localTime("2013-05-07 07:30")) + "\n");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerTest, WithoutPowerOffEntriesTheCrontabIsLeftWithoutTheirLines) {
  setLists({}, {kWorkdaysOff});
  ASSERT_EQ(backend().sync(), 0);
  setLists({}, {});
  EXPECT_EQ(backend().sync(), 0);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

TEST_F(AutopowerTest, ADisabledEntryGivesNoLine) {
  setLists({{0, 127, 7, 30}}, {{0, 127, 22, 0}});
  EXPECT_EQ(backend().sync(), 0);
  EXPECT_EQ(powerCalls(), syncCalls(0));
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  EXPECT_EQ(alarm(), "");
  EXPECT_EQ(powerList(kOn), (Entries{{0, 127, 7, 30}})) << "it stays in the list";
}

TEST_F(AutopowerTest, AMachineWithoutACrontabIsServedAsLongAsNoLineIsWanted) {
  std::filesystem::remove(kCrontab);
  setLists({kDailyOn}, {{0, 127, 22, 0}});
  EXPECT_EQ(backend().sync(), 0);
  EXPECT_FALSE(fileExists(kCrontab));
  setLists({}, {kWorkdaysOff});
  EXPECT_EQ(backend().sync(), -1);
  EXPECT_EQ(logged(), (Lines{line("ZELOScheduleSet Error 2304"),
                             line("Set Power Off Schedule ERROR! [0x0900 line_file.cpp:N]")}));
}

TEST_F(AutopowerTest, AtMostAHundredLinesAreRemoved) {
  std::string crontab;
  for (int i = 0; i < 102; ++i) crontab += std::string("1 1 * * * root ") + kKey + "\n";
  writeFile(kCrontab, crontab);
  EXPECT_EQ(backend().sync(), 0);
  EXPECT_EQ(crontabLines().size(), 2U);
  EXPECT_EQ(powerCalls(), syncCalls(99));
}

// A call to the platform that fails in the middle of an operation, and what that leads to.
struct FailedStep {
  const char *operation;
  std::string call;             // of the power schedule; or of a hash, and the key that it is for
  Lines told;                   // where a text ends with a space, the log says there what failed
  std::optional<Entries> on{};  // the power-on times afterwards; those that there were
  const char *lines = "123";    // which of the three power-off lines stand then
  unsigned from = 1;

  void arrange() const {
    const size_t space = call.find(' ');
    if (!call.starts_with("QLIBC")) {
      failPowerCall(call, {.from = from, .code = kInjectedCode});
    } else if (space == std::string::npos) {
      failCall(call, {.code = kInjectedCode});
    } else {
      failCallFor(call.substr(0, space), call.substr(space + 1), {.code = kInjectedCode});
    }
  }
};

TEST_F(AutopowerTest, AStepThatFailsIsTheLastOfItsOperationAndIsReported) {
  const Entry early{1, 2, 5, 0};
  const Lines allLines = {kWorkdaysOffLine, std::string("1\t1\t*\t*\t0\troot\t") + kKey,
                          std::string("2\t2\t*\t*\t1\troot\t") + kKey};
  const std::map<std::string, std::function<int()>> operations = {
      {"default", [] { return backend().get_default(fresh()); }},
      {"list", [] { return list().result; }},
      {"find on", [] { return backend().get_by_id(kDailyOnId, fresh()); }},
      {"find off", [] { return backend().get_by_id(kWorkdaysOffId, fresh()); }},
      {"create", [&] { return create("poweron", early); }},
      {"edit", [&] { return edit(kDailyOnId, "poweron", early); }},
      {"remove", [] { return backend().remove(kDailyOnId); }},
      {"sync", [] { return backend().sync(); }},
  };
  const std::string noDefault = "Get default failed. ";
  const std::string noList = "Get auto poweron conf failed. ";
  const std::string noClock = "set auto poweron failed. ";
  const std::string noSync = "sync power hw failed. ";
  const std::string noLines = "Set Power Off Schedule ERROR! ";
  const std::string notAdded = "set task failed. [70020500] ";
  const std::string notSet = "set task failed. [71270730] ";
  const FailedStep steps[] = {
      {"default", "QLIBCSzHashAlloc", {"Alloc hash failed. "}},
      {"default", "QLIBCSzHashSetValue start year", {"Get hash value failed. key:[start year]. "}},
      {"list", "ConfGet 0", {noList}},
      {"list", "ConfGet 1", {noList}},
      {"list", "QLIBCSzHashSetValue name", {"Get hash value failed. key:[name]. ", noDefault}},
      {"find on", "QLIBCSzHashSetValue name", {"Get hash value failed. key:[name]. ", noDefault}},
      {"find off", "ConfGet 1", {noList}},
      {"create", "ConfGet 0", {noList, notAdded}},
      {"create", "ConfSet 0", {"ZELOAutoPowerConfSet failed. num:[2] ", notAdded}},
      {"create", "PoweronSet", {noClock, noSync}, Entries{kDailyOn, early}},
      {"edit", "ConfSet 0", {"ZELOAutoPowerConfSet failed. num:[1] ", notSet}},
      {"edit", "PoweronSet", {noClock, "sync hw autopower failed. "}, Entries{early}},
      {"remove", "ConfGet 0", {noList, notSet}},
      {"remove", "ConfSet 0", {"ZELOAutoPowerConfSet failed. num:[0] ", notSet}},
      {"remove", "PoweronSet", {noClock, noSync}, Entries{}},
      {"sync", "PoweronSet", {noClock}},
      {"sync", "ConfGet 1", {"get auto power off failed. "}},
      {"sync", "SetLine", {"Failed to remove line in crontab (0x900)", noLines}, {}, "23", 2},
      {"sync", "UpdateCrontab", {"Failed to kill crontab task (0x900)", noLines}, {}, ""},
      {"sync", "ScheduleSet", {"ZELOScheduleSet Error 2304", noLines}, {}, "1", 2},
  };
  for (const FailedStep &step : steps) {
    SCOPED_TRACE(std::string(step.operation) + ": " + step.call);
    const auto &operation = operations.at(step.operation);
    const auto startWithTasks = [] {
      startAnew();
      setLists({kDailyOn}, {kWorkdaysOff, {1, 1, 1, 1}, {1, 2, 2, 2}});
      EXPECT_EQ(backend().sync(), 0);
      resetPowerCalls();
    };
    startWithTasks();
    EXPECT_GE(operation(), 0);
    Lines calls = powerCalls();
    startWithTasks();
    step.arrange();
    EXPECT_EQ(operation(), -1);
    Lines told;
    for (const std::string &text : step.told) {
      told.push_back(line(text) + (text.ends_with(' ') ? kInjected : ""));
    }
    EXPECT_EQ(logged(), told);
    EXPECT_EQ(loggedPriorities(), std::vector<int>(told.size(), 3));
    EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
    // All as ever up to that step, and nothing behind it.
    if (!step.call.starts_with("QLIBC")) {
      ASSERT_FALSE(powerCalls().empty());
      EXPECT_TRUE(powerCalls().back().starts_with(step.call)) << powerCalls().back();
    }
    ASSERT_LE(powerCalls().size(), calls.size());
    calls.resize(powerCalls().size());
    EXPECT_EQ(powerCalls(), calls);
    resetPowerCalls();
    EXPECT_EQ(powerList(kOn), step.on.value_or(Entries{kDailyOn}));
    Lines lines;
    for (const char *digit = step.lines; *digit != '\0'; ++digit) {
      lines.push_back(allLines[static_cast<size_t>(*digit - '1')]);
    }
    EXPECT_EQ(crontabLines(), lines);
  }
}

TEST_F(AutopowerTest, TheBitOfTheDayNamesGoesOnFromEntryToEntry) {
  PowerDayNames names;
  EXPECT_STREQ(names.of(127).c_str(), ",Sun,Mon,Tue,Wed,Thu,Fri,Sat");
  for (int i = 0; i < 100; ++i) EXPECT_STREQ(names.of(127).c_str(), "") << i;
  PowerDayNames next;
  EXPECT_STREQ(next.of(0b1000010).c_str(), ",Mon,Sat");
  EXPECT_FALSE(PowerDayNames().of(127).wasCut()) << "the longest text fits";
}

// ---- running

class AutopowerRunTest : public AutopowerTest {
 protected:
  struct Ran {
    int result;
    int status;
    std::string comment;
  };
  static Ran run(const char *appArgs, size_t capacity = 1024) {
    const Task task = powerTask(appArgs, kDailyOn);
    int status = -7;
    char comment[1024] = "untouched";
    const int result = backend().run(task.get(), &status, comment, capacity);
    return {result, status, comment};
  }
};

TEST_F(AutopowerRunTest, APowerOnTaskIsFinishedWithoutACheck) {
  for (const char *appArgs : {"poweron", "", "poweroff "}) {
    SCOPED_TRACE(appArgs);
    const Ran ran = run(appArgs);
    EXPECT_EQ(ran.result, 0);
    EXPECT_EQ(ran.status, ZELO_SCHED_STATUS_FINISHED);
    EXPECT_EQ(ran.comment, "");
  }
  EXPECT_EQ(recordedSystemCommands(), Lines{});
}

TEST_F(AutopowerRunTest, APowerOffTaskRunsTheCheckAndReportsHowItEnded) {
  struct End {
    long waitStatus;
    int status;
    const char *comment;
  };
  for (const End &end :
       {End{0, ZELO_SCHED_STATUS_FINISHED, ""}, End{-1, ZELO_SCHED_STATUS_NOT_STARTED, ""},
        End{9, ZELO_SCHED_STATUS_KILLED, "9"}, End{0x80 | 11, ZELO_SCHED_STATUS_KILLED, "11"},
        End{1 << 8, ZELO_SCHED_STATUS_EXIT_NONZERO, "1"},
        End{255 << 8, ZELO_SCHED_STATUS_EXIT_NONZERO, "255"},
        End{(19 << 8) | 0x7F, ZELO_SCHED_STATUS_EXIT_NONZERO, "19"}}) {
    SCOPED_TRACE(end.waitStatus);
    resetFailingCalls();
    failCall("system", {.result = end.waitStatus});
    const Ran ran = run("poweroff");
    EXPECT_EQ(ran.result, 0);
    EXPECT_EQ(ran.status, end.status);
    EXPECT_EQ(ran.comment, end.comment);
    EXPECT_EQ(recordedSystemCommands(), Lines{kKey});
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AutopowerRunTest, TheCommentHasRoomForThreeDigitsWhateverTheCallerSays) {
  failCall("system", {.result = 255 << 8});
  EXPECT_EQ(run("poweroff", 1).comment, "255");
}

TEST_F(AutopowerRunTest, ARealCheckIsAsked) {
  writeFile(kKey, "#!/bin/sh\nexit 3\n", 0755);
  EXPECT_EQ(run("poweroff").comment, "3");
  std::filesystem::remove(kKey);
  EXPECT_EQ(run("poweroff").comment, "127") << "there is none";
}

// ---- the exported calls, with ordinary tasks beside

class PowerTasksTest : public AutopowerTest {};

TEST_F(PowerTasksTest, TheyAreListedAfterTheOrdinaryOnes) {
  saveTask(makeTask("ordinary", "/bin/true"));
  setLists({kDailyOn}, {kWorkdaysOff});
  ZELO_SCHED_TASK *head = nullptr;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), 3);
  const TaskList tasks(head);
  EXPECT_EQ(namesOf(head), (Lines{"ordinary", "PowerOff task 0", "PowerOn task 0"}));
}

TEST_F(PowerTasksTest, TheyAreSavedFoundEditedAndRemoved) {
  const Task task = powerTask("poweroff", kWorkdaysOff);
  EXPECT_EQ(ZELOSchedTaskSave(task.get()), 0);
  EXPECT_EQ(task->ID, kWorkdaysOffId);
  const Task found = loadTask(kWorkdaysOffId);
  EXPECT_STREQ(found->Name, "Poweroff 0");
  EXPECT_EQ(found->Backend, -3);
  found->RunHour = 21;
  EXPECT_EQ(ZELOSchedTaskSave(found.get()), 0);
  EXPECT_EQ(powerList(kOff), (Entries{{1, 62, 21, 15}}));
  EXPECT_EQ(crontabLines(), Lines{std::string("15\t21\t*\t*\t1,2,3,4,5\troot\t") + kKey});
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(ZELOSchedTaskRemove(kWorkdaysOffId), -1) << "it has another id now";
  EXPECT_EQ(errorRecord().code, 0x2000);
  EXPECT_EQ(ZELOSchedTaskRemove(90622115), 0);
  EXPECT_EQ(powerList(kOff), Entries{});
  EXPECT_EQ(crontabLines(), Lines{});
}

TEST_F(PowerTasksTest, ARunIsRecorded) {
  setLists({}, {kWorkdaysOff});
  writeFile(kKey, "#!/bin/sh\nexit 5\n", 0755);
  EXPECT_EQ(ZELOSchedTaskRun(kWorkdaysOffId, 0, 0), 0);
  waitForChildRuns();
  std::filesystem::remove(kKey);
  const auto rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].taskId, kWorkdaysOffId);
  EXPECT_EQ(rows[0].app, "ZELO.TOV.TaskScheduler.AutoPower");
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_EXIT_NONZERO);
  EXPECT_EQ(rows[0].comment, "5");
}

TEST_F(PowerTasksTest, TheInstalledCheckDoesNotStandInItsOwnWay) {
  setLists({}, {kWorkdaysOff});
  std::filesystem::copy_file(ZELO_SOURCE_DIR "/packaging/zelo_poweroff_feasible_check", kKey);
  EXPECT_EQ(ZELOSchedTaskRun(kWorkdaysOffId, 0, 0), 0);
  waitForChildRuns();
  std::filesystem::remove(kKey);
  const auto rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(PowerTasksTest, ASyncWritesBothBackendsOut) {
  saveTask(makeTask("ordinary", "/bin/true"));
  setLists({}, {kWorkdaysOff});
  writeFile(kCrontab, kPlainCrontab);
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(crontabLines(),
            (Lines{"0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=1", kWorkdaysOffLine}));
}

TEST_F(PowerTasksTest, TheHundredAndFirstIsRefusedUntilOneIsRemoved) {
  Entries full;
  for (unsigned char i = 0; i < 100; ++i) full.push_back({0, i, 1, 1});
  setLists(full, {});
  clearLog();
  EXPECT_EQ(ZELOSchedTaskSave(powerTask("poweron", kDailyOn).get()), -1);
  EXPECT_EQ(logged().front(),
            line("ZELOAutoPowerConfSet failed. num:[101] [0x0D00 power_schedule.cpp:N]"));
  EXPECT_EQ(powerList(kOn), full);
  ASSERT_EQ(ZELOSchedTaskRemove(60000101), 0);
  EXPECT_EQ(ZELOSchedTaskSave(powerTask("poweron", kDailyOn).get()), 0);
  EXPECT_EQ(powerList(kOn).size(), 100U);
  EXPECT_EQ(list().result, 100);
}

}  // namespace
}  // namespace support

// A record that is dropped must not be freed.
#if !defined(__SANITIZE_ADDRESS__)
extern "C" void __libc_free(void *memory);
extern "C" __attribute__((visibility("default"))) void free(void *memory) noexcept {
  if (memory != nullptr && memory == support::watchedRecord) {
    support::watchedWasFreed = true;
  }
  __libc_free(memory);
}
#endif
