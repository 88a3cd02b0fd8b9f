// Creating a task.
#include <gtest/gtest.h>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "plugins.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::FakeBackends;
using support::hookCalls;
using support::logged;
using support::taskOf;
using Lines = std::vector<std::string>;

constexpr int32_t kFirst = ZELO_SCHED_BACKEND_SCHEDULE;
constexpr int32_t kSecond = ZELO_SCHED_BACKEND_AUTOPOWER;
constexpr int32_t kNobody = -9;
constexpr char kNotFoundLine[] =
    "sched_task_create.cpp:N No create backend (-9) is found for task [-1] ";

class TaskCreateTest : public support::SandboxTest {};

TEST_F(TaskCreateTest, ATaskMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskCreate(nullptr), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_create.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_create.cpp"}));
}

TEST_F(TaskCreateTest, BackendsThatCannotBeRegisteredAreReportedWithoutAHook) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kFirst, -1);
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_create.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
  EXPECT_EQ(hookCalls(), Lines{});
}

TEST_F(TaskCreateTest, TheBackendOfTheTaskCreatesItAndItsResultIsGiven) {
  FakeBackends fakes(3);
  fakes[1].create = 5;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), 5);
  EXPECT_EQ(fakes.calls(), Lines{"create 1 id -1"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskCreateTest, OfTwoBackendsWithTheIdTheFirstCreates) {
  FakeBackends fakes(3);
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"create 1 id -1"});
}

TEST_F(TaskCreateTest, AnEntryWithAnEmptySlotIsPassedOverForALaterOneWithItsId) {
  FakeBackends fakes(3);
  SchedBackends[1].create = nullptr;
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), 0);
  EXPECT_EQ(fakes.calls(), Lines{"create 2 id -1"});
}

TEST_F(TaskCreateTest, AFailureOfTheBackendIsReportedAndItsResultGiven) {
  FakeBackends fakes(2);
  fakes[1].create = -7;
  ZELO_SCHED_TASK task = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -7);
  EXPECT_EQ(logged(), Lines{"sched_task_create.cpp:N Failed to create for backend [1] id:[-1] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskCreateTest, NoPluginHearsOfATaskThatABackendTook) {
  for (const int result : {0, 5, -1}) {
    SCOPED_TRACE(result);
    FakeBackends fakes(1);
    fakes[0].create = result;
    ZELO_SCHED_TASK task = taskOf(kFirst, -1);
    EXPECT_EQ(ZELOSchedTaskCreate(&task), result);
    EXPECT_EQ(hookCalls(), Lines{});
  }
}

TEST_F(TaskCreateTest, ATaskThatNobodyTakesIsNotFound) {
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(logged(), Lines{kNotFoundLine});
  EXPECT_EQ(support::loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_create.cpp"}));
}

TEST_F(TaskCreateTest, PluginsHearOfATaskThatNobodyTookAfterwardsOnly) {
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  support::setText(task.Name, "orphan");
  support::setText(task.App, "app");
  support::setText(task.Week, "0000010");
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(
      hookCalls(),
      (Lines{"init task_scheduler task_create", "int RESULT=-1", "arg NEW_TASK_ID=-1",
             "arg NEW_BACKEND=-9", "arg NEW_OWNER=0", "arg NEW_NAME=orphan", "arg NEW_STATE=0",
             "arg NEW_TYPE=0", "arg NEW_APP=app", "arg NEW_YEAR=0", "arg NEW_MONTH=0",
             "arg NEW_DAY=0", "arg NEW_HOUR=0", "arg NEW_MIN=0", "arg NEW_REPEAT_HOUR=0",
             "arg NEW_LAST_WORK_HOUR=0", "arg NEW_WEEK=0000010", "action 5", "exit"}));
}

TEST_F(TaskCreateTest, AnInstalledPluginHearsOfATaskThatNobodyTook) {
  support::installPlugin("teller", "echo $1 $2 $RESULT $NEW_NAME >> /tmp/told");
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  support::setText(task.Name, "orphan");
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(support::toldPlugins(), Lines{"task_create post -1 orphan"});
}

TEST_F(TaskCreateTest, APluginThatFailsIsLoggedOnly) {
  support::failCallFor("QLIBPluginAction", "5");
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(logged(),
            (Lines{kNotFoundLine, "sched_task_create.cpp:N Fail to execute task plugin (POST)"}));
  EXPECT_EQ(hookCalls().back(), "exit");
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_create.cpp"}));
}

TEST_F(TaskCreateTest, PluginsThatCannotBePreparedAreLogged) {
  support::failCall("QLIBPluginInit", {.code = 0x0200});
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  EXPECT_EQ(ZELOSchedTaskCreate(&task), -1);
  EXPECT_EQ(
      logged(),
      (Lines{kNotFoundLine, "sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]",
             "sched_task_create.cpp:N Fail to execute task plugin (POST)",
             "sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"}));
  EXPECT_EQ(hookCalls(), (Lines{"init task_scheduler task_create", "exit"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_create.cpp"}));
}

TEST_F(TaskCreateTest, TheBackendAssignsTheIdIntoTheTask) {
  const support::Task task = support::makeTask("backup", "/bin/true");
  EXPECT_GE(ZELOSchedTaskCreate(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  EXPECT_STREQ(support::loadTask(1)->Name, "backup");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskCreateTest, TheIdThatTheTaskCarriesDoesNotMatter) {
  const support::Task task = support::makeTask("backup", "/bin/true");
  task->ID = 12;
  EXPECT_GE(ZELOSchedTaskCreate(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
}

}  // namespace
