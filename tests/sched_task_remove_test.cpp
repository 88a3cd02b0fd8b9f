// Deleting a stored task, with plugins told before and after.
#include <gtest/gtest.h>

#include <algorithm>

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
using Lines = std::vector<std::string>;

constexpr long kId = 7;

class TaskRemoveTest : public support::SandboxTest {
 protected:
  // "int RESULT=..." of each hook call, in order.
  static Lines toldResults() {
    Lines calls = hookCalls();
    std::erase_if(calls, [](const std::string &call) { return !call.starts_with("int RESULT="); });
    return calls;
  }
};

TEST_F(TaskRemoveTest, AnIdThatNobodyHoldsFailsBeforeAnyHook) {
  EXPECT_EQ(ZELOSchedTaskRemove(kId), -1);
  EXPECT_EQ(
      logged(),
      (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
             "sched_task_remove.cpp:N get task failed. id:[7] [0x2000 sched_task_get.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_EQ(hookCalls(), Lines{});
}

TEST_F(TaskRemoveTest, TheBackendThatHoldsTheTaskRemovesIt) {
  FakeBackends fakes(2);
  fakes[1].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "get_by_id 0 id 7", "owns_id 1 id 7",
                                  "get_by_id 1 id 7", "remove 1 id 7"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskRemoveTest, ABackendThatFoundNothingToRemoveHasSucceeded) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  for (const int result : {0, 1, 5}) {
    SCOPED_TRACE(result);
    fakes[0].remove = result;
    EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  }
}

TEST_F(TaskRemoveTest, OfTwoBackendsWithTheIdTheFirstRemoves) {
  FakeBackends fakes(3);
  fakes[1].get_by_id = 1;
  SchedBackends[2].id = SchedBackends[1].id;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(fakes.calls().back(), "remove 1 id 7");
}

TEST_F(TaskRemoveTest, AnEntryWithAnEmptySlotIsPassedOverForALaterOneWithItsId) {
  FakeBackends fakes(3);
  fakes[1].get_by_id = 1;
  SchedBackends[1].remove = nullptr;
  SchedBackends[2].id = SchedBackends[1].id;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(fakes.calls().back(), "remove 2 id 7");
}

TEST_F(TaskRemoveTest, AFailureOfTheBackendIsReported) {
  FakeBackends fakes(2);
  fakes[1].get_by_id = 1;
  fakes[1].remove = -5;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_remove.cpp:N Failed to remove for backend [1] id:[7] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskRemoveTest, ABackendThatOffersNoRemovalIsNotFound) {
  FakeBackends fakes(2);
  fakes[0].get_by_id = 1;
  SchedBackends[0].remove = nullptr;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_remove.cpp:N No remove backend is found for task [7] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_remove.cpp"}));
  EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=-1"}));
}

TEST_F(TaskRemoveTest, BackendsThatCannotBeRegisteredForTheRemovalAreReported) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  support::failBackendInit(2);
  EXPECT_EQ(ZELOSchedTaskRemove(kId), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_remove.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls().back(), "get_by_id 0 id 7");
  EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=-1"}));
}

TEST_F(TaskRemoveTest, PluginsAreToldOfTheOldTaskAndTheResultOnly) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  const Lines arguments = {"int RESULT=0",
                           "arg ORG_TASK_ID=7",
                           "arg ORG_BACKEND=-2",
                           "arg ORG_OWNER=0",
                           "arg ORG_NAME=stored by 0",
                           "arg ORG_STATE=0",
                           "arg ORG_TYPE=0",
                           "arg ORG_APP=",
                           "arg ORG_YEAR=0",
                           "arg ORG_MONTH=0",
                           "arg ORG_DAY=0",
                           "arg ORG_HOUR=0",
                           "arg ORG_MIN=0",
                           "arg ORG_REPEAT_HOUR=0",
                           "arg ORG_LAST_WORK_HOUR=0",
                           "arg ORG_WEEK="};
  Lines expected = {"init task_scheduler task_remove"};
  expected.insert(expected.end(), arguments.begin(), arguments.end());
  expected.push_back("action 4");
  expected.insert(expected.end(), arguments.begin(), arguments.end());
  expected.push_back("action 5");
  expected.push_back("exit");
  EXPECT_EQ(hookCalls(), expected);
}

TEST_F(TaskRemoveTest, WhatTheBackendGaveIsToldAsZeroOrMinusOne) {
  for (const auto &[removed, told] : {std::pair{1, "0"}, std::pair{0, "0"}, std::pair{-5, "-1"}}) {
    SCOPED_TRACE(removed);
    support::resetFailingCalls();
    FakeBackends fakes(1);
    fakes[0].get_by_id = 1;
    fakes[0].remove = removed;
    ZELOSchedTaskRemove(kId);
    EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", std::string("int RESULT=") + told}));
  }
}

TEST_F(TaskRemoveTest, APluginThatFailsBeforehandCannotVeto) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  support::failCallFor("QLIBPluginAction", "4");
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(logged(), Lines{"sched_task_remove.cpp:N Fail to execute task plugin (PRE)"});
  EXPECT_EQ(fakes.calls().back(), "remove 0 id 7");
}

TEST_F(TaskRemoveTest, APluginThatFailsAfterwardsDoesNotChangeTheResult) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  support::failCallFor("QLIBPluginAction", "5");
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(logged(), Lines{"sched_task_remove.cpp:N Fail to execute task plugin (POST)"});
  EXPECT_EQ(hookCalls().back(), "exit");
}

TEST_F(TaskRemoveTest, NothingIsRemovedWhenPluginsCannotBePrepared) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  support::failCall("QLIBPluginInit", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedTaskRemove(kId), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]",
                   "sched_task_remove.cpp:N Fail to execute task plugin (POST)",
                   "sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"}));
  EXPECT_EQ(fakes.calls().back(), "get_by_id 0 id 7");
}

TEST_F(TaskRemoveTest, InstalledPluginsSeeTheStoreBeforeAndAfterTheRemoval) {
  const long id = support::saveTask(support::makeTask("doomed", "/bin/true"));
  support::installPlugin(
      "teller", "echo $1 $2 $RESULT $ORG_NAME `grep ^name= /tmp/scheduled_tasks` >> /tmp/told");
  EXPECT_EQ(ZELOSchedTaskRemove(id), 0);
  EXPECT_EQ(support::toldPlugins(),
            (Lines{"task_remove pre 0 doomed name=\"doomed\"", "task_remove post 0 doomed"}));
}

TEST_F(TaskRemoveTest, ARemovedTaskIsGoneAndTheOthersStay) {
  const long first = support::saveTask(support::makeTask("first", "/bin/true"));
  const long second = support::saveTask(support::makeTask("second", "/bin/true"));
  EXPECT_EQ(ZELOSchedTaskRemove(first), 0);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(support::loadTask(first)->State, ZELO_SCHED_STATE_NOT_EXISTED);
  EXPECT_STREQ(support::loadTask(second)->Name, "second");
}

TEST_F(TaskRemoveTest, WhyARemovalFailedOutlivesAPluginThatFailsToo) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  fakes[0].remove = -7;
  support::installPlugin("failing", "exit 1");
  EXPECT_EQ(ZELOSchedTaskRemove(7), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

}  // namespace
