// Overwriting a stored task, with plugins told before and after.
#include <gtest/gtest.h>

#include <algorithm>

#include "captured_log.h"
#include "expected_leak.h"
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

// Every entry of a table of fakes says that it holds the task, so entry 0 is the one that is read.
class TaskEditTest : public support::SandboxTest {
 protected:
  static void holdTask(FakeBackends *fakes) { (*fakes)[0].get_by_id = 1; }

  static bool toldThePlatform(const std::string &call) {
    const Lines calls = hookCalls();
    return std::find(calls.begin(), calls.end(), call) != calls.end();
  }

  // "int RESULT=..." of each hook call, in order.
  static Lines toldResults() {
    Lines calls = hookCalls();
    std::erase_if(calls, [](const std::string &call) { return !call.starts_with("int RESULT="); });
    return calls;
  }
};

TEST_F(TaskEditTest, ATaskMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskEdit(nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_edit.cpp"}));
}

TEST_F(TaskEditTest, AnIdThatNobodyHoldsFailsBeforeAnyHook) {
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                   "sched_task_edit.cpp:N get task failed. id:[7] [0x2000 sched_task_get.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_EQ(hookCalls(), Lines{});
}

TEST_F(TaskEditTest, TheStoredTaskIsReadThenTheGivenOneEdited) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  fakes[0].edit = 5;
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 5);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "get_by_id 0 id 7", "edit 0 id 7"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskEditTest, TheGivenTaskIsNotOverwrittenByTheStoredOne) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  support::setText(task.Name, "given");
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);
  EXPECT_STREQ(task.Name, "given");
}

TEST_F(TaskEditTest, TheBackendOfTheGivenTaskEditsNotThatOfTheStoredOne) {
  FakeBackends fakes(2);
  holdTask(&fakes);
  ZELO_SCHED_TASK task = taskOf(kSecond, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);
  EXPECT_EQ(fakes.calls().back(), "edit 1 id 7");
}

TEST_F(TaskEditTest, OfTwoBackendsWithTheIdTheFirstEdits) {
  FakeBackends fakes(3);
  holdTask(&fakes);
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);
  EXPECT_EQ(fakes.calls().back(), "edit 1 id 7");
}

TEST_F(TaskEditTest, AnEntryWithAnEmptySlotIsPassedOverForALaterOneWithItsId) {
  FakeBackends fakes(3);
  holdTask(&fakes);
  SchedBackends[1].edit = nullptr;
  SchedBackends[2].id = kSecond;
  ZELO_SCHED_TASK task = taskOf(kSecond, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);
  EXPECT_EQ(fakes.calls().back(), "edit 2 id 7");
}

TEST_F(TaskEditTest, AFailureOfTheBackendIsReportedAndItsResultGiven) {
  FakeBackends fakes(2);
  holdTask(&fakes);
  fakes[1].edit = -7;
  ZELO_SCHED_TASK task = taskOf(kSecond, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -7);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N Failed to edit for backend [1] id:[7] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskEditTest, ATaskThatNobodyTakesIsNotFound) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  ZELO_SCHED_TASK task = taskOf(kNobody, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N No edit backend (-9) is found for task [7] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_edit.cpp"}));
  EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=-1"}));
}

TEST_F(TaskEditTest, BackendsThatCannotBeRegisteredForTheEditAreReported) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  support::failBackendInit(2);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls().back(), "get_by_id 0 id 7");
  EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=-1"}));
}

TEST_F(TaskEditTest, PluginsAreToldBeforeAndAfterWithTheOldAndTheNewTask) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  support::setText(task.Name, "given");
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);

  Lines calls = hookCalls();
  std::erase_if(calls, [](const std::string &call) {
    return call.starts_with("arg ") && call.find("_NAME=") == std::string::npos &&
           call.find("_TASK_ID=") == std::string::npos;
  });
  EXPECT_EQ(calls,
            (Lines{"init task_scheduler task_edit", "int RESULT=0", "arg ORG_TASK_ID=7",
                   "arg ORG_NAME=stored by 0", "arg NEW_TASK_ID=7", "arg NEW_NAME=given",
                   "action 4", "int RESULT=0", "arg ORG_TASK_ID=7", "arg ORG_NAME=stored by 0",
                   "arg NEW_TASK_ID=7", "arg NEW_NAME=given", "action 5", "exit"}));
}

TEST_F(TaskEditTest, TheResultOfTheEditIsToldAfterwards) {
  for (const int result : {5, -7}) {
    SCOPED_TRACE(result);
    support::resetFailingCalls();
    FakeBackends fakes(1);
    holdTask(&fakes);
    fakes[0].edit = result;
    ZELO_SCHED_TASK task = taskOf(kFirst, 7);
    EXPECT_EQ(ZELOSchedTaskEdit(&task), result);
    EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=" + std::to_string(result)}));
  }
}

TEST_F(TaskEditTest, APluginThatFailsBeforehandCannotVeto) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  fakes[0].edit = 5;
  support::failCallFor("QLIBPluginAction", "4");
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 5);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N Fail to execute task plugin (PRE)"});
  EXPECT_EQ(fakes.calls().back(), "edit 0 id 7");
  EXPECT_TRUE(toldThePlatform("action 5"));
}

TEST_F(TaskEditTest, APluginThatFailsAfterwardsDoesNotChangeTheResult) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  fakes[0].edit = 5;
  support::failCallFor("QLIBPluginAction", "5");
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 5);
  EXPECT_EQ(logged(), Lines{"sched_task_edit.cpp:N Fail to execute task plugin (POST)"});
  EXPECT_EQ(hookCalls().back(), "exit");
}

TEST_F(TaskEditTest, AHookThatCannotBeClosedDoesNotChangeTheResult) {
  const support::ExpectedLeak hookLeftOpen;
  FakeBackends fakes(1);
  holdTask(&fakes);
  fakes[0].edit = 5;
  support::failCall("QLIBPluginExit", {.code = 0x0200});
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 5);
  EXPECT_EQ(logged(),
            Lines{"sched_task_plugin.cpp:N Fail to do plugin exit[0x0200 injected.cpp:N]"});
}

TEST_F(TaskEditTest, NothingIsChangedWhenPluginsCannotBePrepared) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  support::failCall("QLIBPluginInit", {.code = 0x0200});
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]",
                   "sched_task_edit.cpp:N Fail to execute task plugin (POST)",
                   "sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"}));
  EXPECT_EQ(fakes.calls().back(), "get_by_id 0 id 7");
  EXPECT_EQ(hookCalls(), (Lines{"init task_scheduler task_edit", "exit"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, support::kInjectedFile}));
}

TEST_F(TaskEditTest, WhyAnEditFailedOutlivesAPluginThatFailsToo) {
  FakeBackends fakes(1);
  holdTask(&fakes);
  fakes[0].edit = -7;
  support::installPlugin("failing", "exit 1");
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  EXPECT_EQ(ZELOSchedTaskEdit(&task), -7);
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskEditTest, InstalledPluginsSeeTheStoreBeforeAndAfterTheChange) {
  const support::Task task = support::makeTask("before", "/bin/true");
  support::saveTask(task);
  support::installPlugin(
      "teller",
      "echo $1 $2 $RESULT $ORG_NAME $NEW_NAME `grep ^name= /tmp/scheduled_tasks` >> /tmp/told");
  support::setText(task->Name, "after");
  EXPECT_EQ(ZELOSchedTaskEdit(task.get()), 0);
  EXPECT_EQ(support::toldPlugins(), (Lines{"task_edit pre 0 before after name=\"before\"",
                                           "task_edit post 0 before after name=\"after\""}));
}

TEST_F(TaskEditTest, AnInstalledPluginThatFailsCannotVeto) {
  const support::Task task = support::makeTask("before", "/bin/true");
  support::saveTask(task);
  support::installPlugin("vetoer", "exit 1");
  support::setText(task->Name, "after");
  EXPECT_EQ(ZELOSchedTaskEdit(task.get()), 0);
  EXPECT_EQ(logged(), (Lines{"sched_task_edit.cpp:N Fail to execute task plugin (PRE)",
                             "sched_task_edit.cpp:N Fail to execute task plugin (POST)"}));
  EXPECT_STREQ(support::loadTask(task->ID)->Name, "after");
}

}  // namespace
