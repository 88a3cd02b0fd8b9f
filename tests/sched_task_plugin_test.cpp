// Hooks: the action, stage and variables that plugins get at a change of a task.
#include <gtest/gtest.h>
#include <zelocore.h>

#include <cstddef>
#include <limits>

#include "captured_log.h"
#include "failing_calls.h"
#include "plugins.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::kNoError;
using support::logged;
using support::setText;
using Lines = std::vector<std::string>;

constexpr int kPre = ZELO_SCHED_PLUGIN_PRE;
constexpr int kPost = ZELO_SCHED_PLUGIN_POST;
const ErrorRecord kBadArgument{0x0D00, "sched_task_plugin.cpp"};

Lines operator+(Lines first, const Lines &second) {
  first.insert(first.end(), second.begin(), second.end());
  return first;
}

ZELO_SCHED_TASK oldTask() {
  ZELO_SCHED_TASK task = {};
  task.Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  task.ID = 12;
  task.Owner = 1000;
  setText(task.Name, "backup");
  task.State = 1;
  task.Type = 4;
  setText(task.App, "ZELO.App");
  task.StartYear = 2013;
  task.StartMonth = 5;
  task.StartDay = 7;
  task.RunHour = 8;
  task.RunMin = 30;
  task.RepeatHour = 2;
  task.LastWorkHour = 17;
  setText(task.Week, "0111110");
  return task;
}

const Lines kOldArguments = {
    "arg ORG_TASK_ID=12",    "arg ORG_BACKEND=-2",
    "arg ORG_OWNER=1000",    "arg ORG_NAME=backup",
    "arg ORG_STATE=1",       "arg ORG_TYPE=4",
    "arg ORG_APP=ZELO.App",  "arg ORG_YEAR=2013",
    "arg ORG_MONTH=5",       "arg ORG_DAY=7",
    "arg ORG_HOUR=8",        "arg ORG_MIN=30",
    "arg ORG_REPEAT_HOUR=2", "arg ORG_LAST_WORK_HOUR=17",
    "arg ORG_WEEK=0111110",
};

// Numbers at the ends of their ranges.
ZELO_SCHED_TASK newTask() {
  constexpr uint32_t kMost = std::numeric_limits<uint32_t>::max();
  ZELO_SCHED_TASK task = {};
  task.Backend = std::numeric_limits<int32_t>::min();
  task.ID = std::numeric_limits<int32_t>::max();
  task.State = std::numeric_limits<int32_t>::min();
  task.Type = -1;
  for (uint32_t *number : {&task.Owner, &task.StartYear, &task.StartMonth, &task.StartDay,
                           &task.RunHour, &task.RunMin, &task.RepeatHour, &task.LastWorkHour}) {
    *number = kMost;
  }
  return task;
}

const Lines kNewArguments = {
    "arg NEW_TASK_ID=2147483647",
    "arg NEW_BACKEND=-2147483648",
    "arg NEW_OWNER=4294967295",
    "arg NEW_NAME=",
    "arg NEW_STATE=-2147483648",
    "arg NEW_TYPE=-1",
    "arg NEW_APP=",
    "arg NEW_YEAR=4294967295",
    "arg NEW_MONTH=4294967295",
    "arg NEW_DAY=4294967295",
    "arg NEW_HOUR=4294967295",
    "arg NEW_MIN=4294967295",
    "arg NEW_REPEAT_HOUR=4294967295",
    "arg NEW_LAST_WORK_HOUR=4294967295",
    "arg NEW_WEEK=",
};

class TaskPluginTest : public support::SandboxTest {
 protected:
  void TearDown() override {
    if (hook_.framework[0] != nullptr) ZELOSchedTaskPluginExit(&hook_);
    SandboxTest::TearDown();
  }

  void init(const ZELO_SCHED_TASK *org, const ZELO_SCHED_TASK *next) {
    ASSERT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_edit", org, next), 0);
  }

  // The calls of one hook, without that of the init.
  static Lines hookCalls() {
    Lines calls = support::hookCalls();
    if (!calls.empty() && calls.front().starts_with("init ")) calls.erase(calls.begin());
    return calls;
  }

  const ZELO_SCHED_TASK old_ = oldTask();
  const ZELO_SCHED_TASK new_ = newTask();
  ZELO_SCHED_PLUGIN hook_ = {};
};

TEST_F(TaskPluginTest, TheContextHasItsFieldsInOrder) {
  EXPECT_EQ(offsetof(ZELO_SCHED_PLUGIN, framework), 0U);
  EXPECT_EQ(offsetof(ZELO_SCHED_PLUGIN, result), 3 * sizeof(void *));
  EXPECT_EQ(offsetof(ZELO_SCHED_PLUGIN, pOrg), 4 * sizeof(void *));
  EXPECT_EQ(offsetof(ZELO_SCHED_PLUGIN, pNew), 5 * sizeof(void *));
}

// ---- init

TEST_F(TaskPluginTest, InitNeedsAContext) {
  EXPECT_EQ(ZELOSchedTaskPluginInit(nullptr, "task_edit", &old_, &new_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_plugin.cpp:N Bad parameters"});
  EXPECT_EQ(support::loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), kBadArgument);
  EXPECT_EQ(support::hookCalls(), Lines{});
}

TEST_F(TaskPluginTest, InitNeedsAnActionName) {
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, nullptr, &old_, &new_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_plugin.cpp:N Bad parameters"});
  EXPECT_EQ(errorRecord(), kBadArgument);
}

TEST_F(TaskPluginTest, InitNeedsOneOfTheTasks) {
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_edit", nullptr, nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_plugin.cpp:N Bad parameters"});
  EXPECT_EQ(errorRecord(), kBadArgument);
}

TEST_F(TaskPluginTest, InitThatIsRefusedLeavesTheContextDead) {
  int garbage = 0;
  hook_.framework[0] = &garbage;
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_edit", nullptr, nullptr), -1);
  EXPECT_EQ(hook_.framework[0], nullptr);
}

TEST_F(TaskPluginTest, InitPreparesTheContext) {
  int garbage = 0;
  hook_ = {{&garbage, &garbage, &garbage}, 9, nullptr, nullptr};
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_edit", &old_, &new_), 0);
  EXPECT_NE(hook_.framework[0], nullptr);
  EXPECT_EQ(hook_.result, 0);
  EXPECT_EQ(hook_.pOrg, &old_);
  EXPECT_EQ(hook_.pNew, &new_);
  EXPECT_EQ(support::hookCalls(), Lines{"init task_scheduler task_edit"});
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

TEST_F(TaskPluginTest, InitPassesTheActionNameOn) {
  for (const char *action : {"task_create", "task_edit", "task_remove"}) {
    support::resetFailingCalls();
    ASSERT_EQ(ZELOSchedTaskPluginInit(&hook_, action, &old_, nullptr), 0);
    EXPECT_EQ(support::hookCalls(), Lines{std::string("init task_scheduler ") + action});
    ASSERT_EQ(ZELOSchedTaskPluginExit(&hook_), 0);
  }
}

TEST_F(TaskPluginTest, InitWithEitherTaskAloneWorks) {
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_remove", &old_, nullptr), 0);
  EXPECT_EQ(hook_.pNew, nullptr);
  ASSERT_EQ(ZELOSchedTaskPluginExit(&hook_), 0);
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_create", nullptr, &new_), 0);
  EXPECT_EQ(hook_.pOrg, nullptr);
}

TEST_F(TaskPluginTest, AFailureOfThePlatformsInitIsReported) {
  int garbage = 0;
  hook_.framework[0] = &garbage;
  support::failCall("QLIBPluginInit", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedTaskPluginInit(&hook_, "task_edit", &old_, &new_), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "injected.cpp"}));
  EXPECT_EQ(hook_.framework[0], nullptr);
}

// ---- the hook call

TEST_F(TaskPluginTest, AHookNeedsAContext) {
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, nullptr), -1);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

TEST_F(TaskPluginTest, AHookOnAContextThatWasNotPreparedFailsWithoutAWord) {
  hook_.pOrg = &old_;
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), -1);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
  EXPECT_EQ(support::hookCalls(), Lines{});
}

TEST_F(TaskPluginTest, AHookNeedsOneOfTheTasks) {
  init(&old_, nullptr);
  hook_.pOrg = nullptr;
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), -1);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kBadArgument);
  EXPECT_EQ(hookCalls(), Lines{});
}

TEST_F(TaskPluginTest, AHookTellsTheResultTheOldAndTheNewTaskInThisOrder) {
  init(&old_, &new_);
  hook_.result = -1;
  EXPECT_EQ(ZELOSchedTaskPlugin(kPost, &hook_), 0);
  EXPECT_EQ(hookCalls(),
            Lines{"int RESULT=-1"} + kOldArguments + kNewArguments + Lines{"action 5"});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskPluginTest, WithoutANewTaskOnlyTheOldOneIsTold) {
  init(&old_, nullptr);
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(hookCalls(), Lines{"int RESULT=0"} + kOldArguments + Lines{"action 4"});
}

TEST_F(TaskPluginTest, WithoutAnOldTaskOnlyTheNewOneIsTold) {
  init(nullptr, &new_);
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(hookCalls(), Lines{"int RESULT=0"} + kNewArguments + Lines{"action 4"});
}

TEST_F(TaskPluginTest, TextsAreCutToThirtyOneCharacters) {
  ZELO_SCHED_TASK task = {};
  setText(task.Name, std::string(31, 'n') + "x");
  setText(task.App, std::string(1000, 'a'));
  init(&task, nullptr);
  ASSERT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  const Lines calls = hookCalls();
  EXPECT_EQ(calls[4], "arg ORG_NAME=" + std::string(31, 'n'));
  EXPECT_EQ(calls[7], "arg ORG_APP=" + std::string(31, 'a'));
}

TEST_F(TaskPluginTest, ATextOfThirtyOneCharactersIsToldWhole) {
  ZELO_SCHED_TASK task = {};
  setText(task.Name, std::string(30, 'n') + "x");
  init(&task, nullptr);
  ASSERT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(hookCalls()[4], "arg ORG_NAME=" + std::string(30, 'n') + "x");
}

TEST_F(TaskPluginTest, ATextIsNoFormat) {
  ZELO_SCHED_TASK task = {};
  setText(task.Name, "100%n %s");
  init(&task, nullptr);
  ASSERT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(hookCalls()[4], "arg ORG_NAME=100%n %s");
}

TEST_F(TaskPluginTest, AResultThatCannotBeSetEndsTheHook) {
  init(&old_, &new_);
  support::failCall("QLIBPluginSetArgByInt", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), -1);
  EXPECT_EQ(hookCalls(), Lines{"int RESULT=0"});
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "injected.cpp"}));
}

TEST_F(TaskPluginTest, AnArgumentThatCannotBeSetEndsTheHookAtOnce) {
  const Lines arguments = kOldArguments + kNewArguments;
  for (size_t i = 0; i < arguments.size(); ++i) {
    SCOPED_TRACE(arguments[i]);
    support::resetFailingCalls();
    init(&old_, &new_);
    const size_t prefix = std::string("arg ").size();
    const std::string key = arguments[i].substr(prefix, arguments[i].find('=') - prefix);
    support::failCallFor("QLIBPluginSetArg", key, {.code = 0x0200});
    EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), -1);
    const Lines told(arguments.begin(), arguments.begin() + static_cast<std::ptrdiff_t>(i) + 1);
    EXPECT_EQ(hookCalls(), Lines{"int RESULT=0"} + told);
    EXPECT_EQ(logged(), Lines{});
    ASSERT_EQ(ZELOSchedTaskPluginExit(&hook_), 0);
  }
}

TEST_F(TaskPluginTest, TheVerdictOfThePluginsIsGiven) {
  init(&old_, &new_);
  for (const int verdict : {3, 0, -5}) {
    support::failCall("QLIBPluginAction", {.result = verdict});
    EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), verdict);
  }
  EXPECT_EQ(logged(), Lines{});
}

// ---- exit

TEST_F(TaskPluginTest, ExitNeedsAContext) {
  EXPECT_EQ(ZELOSchedTaskPluginExit(nullptr), -1);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kBadArgument);
  EXPECT_EQ(support::hookCalls(), Lines{});
}

TEST_F(TaskPluginTest, ExitReleasesTheContext) {
  init(&old_, &new_);
  EXPECT_EQ(ZELOSchedTaskPluginExit(&hook_), 0);
  EXPECT_EQ(hookCalls(), Lines{"exit"});
  EXPECT_EQ(hook_.framework[0], nullptr);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskPluginTest, AFailureOfThePlatformsExitIsReported) {
  init(&old_, &new_);
  support::failCall("QLIBPluginExit", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedTaskPluginExit(&hook_), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_plugin.cpp:N Fail to do plugin exit[0x0200 injected.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "injected.cpp"}));
}

TEST_F(TaskPluginTest, ExitOfAContextThatWasNotPreparedIsAFailureOfThePlatforms) {
  EXPECT_EQ(ZELOSchedTaskPluginExit(&hook_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"});
}

// ---- installed plugins

TEST_F(TaskPluginTest, AnInstalledPluginGetsActionStageAndArguments) {
  support::installPlugin("teller",
                         "echo \"$# $1 $2\" >> /tmp/told\n"
                         "tr '\\0' '\\n' < /proc/$$/environ | sort >> /tmp/told");
  init(&old_, nullptr);
  hook_.result = -1;
  EXPECT_EQ(ZELOSchedTaskPlugin(kPost, &hook_), 0);
  Lines told = support::toldPlugins();
  std::erase_if(told, [](const std::string &line) { return line.starts_with("PATH="); });
  EXPECT_EQ(told, (Lines{"2 task_edit post", "ORG_APP=ZELO.App", "ORG_BACKEND=-2", "ORG_DAY=7",
                         "ORG_HOUR=8", "ORG_LAST_WORK_HOUR=17", "ORG_MIN=30", "ORG_MONTH=5",
                         "ORG_NAME=backup", "ORG_OWNER=1000", "ORG_REPEAT_HOUR=2", "ORG_STATE=1",
                         "ORG_TASK_ID=12", "ORG_TYPE=4", "ORG_WEEK=0111110", "ORG_YEAR=2013",
                         "RESULT=-1"}));
}

TEST_F(TaskPluginTest, EveryInstalledPluginIsToldBeforeAndAfterInNameOrder) {
  support::installPlugin("20-second", "echo second $2 $RESULT >> /tmp/told");
  support::installPlugin("10-first", "echo first $2 $RESULT >> /tmp/told");
  init(&old_, &new_);
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  hook_.result = 5;
  EXPECT_EQ(ZELOSchedTaskPlugin(kPost, &hook_), 0);
  EXPECT_EQ(support::toldPlugins(),
            (Lines{"first pre 0", "second pre 0", "first post 5", "second post 5"}));
}

TEST_F(TaskPluginTest, APluginThatFailsMakesTheVerdictNegativeAndTheOthersAreToldStill) {
  support::installPlugin("10-failing", "exit 3");
  support::installPlugin("20-second", "echo second $2 >> /tmp/told");
  init(&old_, &new_);
  EXPECT_LT(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(support::toldPlugins(), Lines{"second pre"});
}

TEST_F(TaskPluginTest, HostileTextsReachAPluginAsText) {
  ZELO_SCHED_TASK task = {};
  setText(task.Name, "a'b\"c`id`$(id);\n=x");
  support::installPlugin("teller", "printf '%s' \"$ORG_NAME\" >> /tmp/told");
  init(&task, nullptr);
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(support::readFile(support::kToldFile), "a'b\"c`id`$(id);\n=x");
}

TEST_F(TaskPluginTest, WithoutAnInstalledPluginTheVerdictIsGood) {
  init(&old_, &new_);
  EXPECT_EQ(ZELOSchedTaskPlugin(kPre, &hook_), 0);
  EXPECT_EQ(errorRecord(), kNoError);
}

}  // namespace
