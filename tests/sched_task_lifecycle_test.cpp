// Creating, editing, saving, loading, reading, removing, listing and synchronising tasks: which
// backend is asked, what its answer becomes, and what is logged. What the operations that go to one
// backend have in common is in the table kOperations, whose tests run for each of them.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>

#include "captured_log.h"
#include "expected_leak.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "plugins.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr long kId = 7;
constexpr int32_t kFirst = ZELO_SCHED_BACKEND_SCHEDULE;
constexpr int32_t kSecond = ZELO_SCHED_BACKEND_AUTOPOWER;
constexpr int32_t kNobody = -9;
const ErrorRecord kFakesError{kFakeError, kFakeFile};

void expectFailure(int result, const Lines &log, const ErrorRecord &error) {
  EXPECT_EQ(result, -1);
  EXPECT_EQ(logged(), log);
  EXPECT_EQ(errorRecord(), error);
}

// The word and the value of "int RESULT=..." of each hook call, in order.
Lines toldResults() {
  Lines calls = hookCalls();
  std::erase_if(calls, [](const std::string &call) { return !call.starts_with("int RESULT="); });
  return calls;
}

class LifecycleTest : public SandboxTest {};

TEST_F(LifecycleTest, AnArgumentThatIsMissingIsRefusedBeforeABackendIsAsked) {
  FakeBackends fakes(1);
  ZELO_SCHED_TASK task = taskOf(kFirst, 0);
  const std::string noTask = "((void *)0) != pTask";
  expectRefused("sched_task_create.cpp", {{noTask, [] { return ZELOSchedTaskCreate(nullptr); }}});
  expectRefused("sched_task_edit.cpp", {{noTask, [] { return ZELOSchedTaskEdit(nullptr); }}});
  expectRefused("sched_task_save.cpp", {{noTask, [] { return ZELOSchedTaskSave(nullptr); }}});
  expectRefused("sched_task_get.cpp", {{noTask, [] { return ZELOSchedTaskGetByID(kId, nullptr); }},
                                       {noTask, [] { return ZELOSchedTaskGetDefault(nullptr); }}});
  expectRefused(
      "sched_task_load.cpp",
      {{"-1 <= id", [&] { return ZELOSchedTaskLoad(-2, &task); }},
       {"-1 <= id", [&] { return ZELOSchedTaskLoad(-1000, &task); }},
       {"-1 <= id", [&] { return ZELOSchedTaskLoad(static_cast<long>(-5'000'000'000), &task); }},
       {"-1 <= id", [] { return ZELOSchedTaskLoad(-2, nullptr); }},
       {"NULL != pTask", [] { return ZELOSchedTaskLoad(7, nullptr); }}});
  expectRefused(
      "sched_task_list_get.cpp",
      {{"((void *)0) != pTaskList", [] { return ZELOSchedTaskListGet(nullptr, nullptr); }}});
  expectRefused("sched_task_alloc.cpp", {{noTask, [] { return ZELOSchedTaskFree(nullptr); }}});
  EXPECT_EQ(fakes.calls(), Lines{});
}

// ---- what goes to the backend of one task -------------------------------------------------------

struct Operation {
  const char *word;  // in log lines, and of a fake's call
  const char *unit;
  int (*call)(ZELO_SCHED_TASK *task);
  int FakeBackend::*answer;
  void (*emptySlot)(ZELO_SCHED_BACKEND *entry);
  bool readsFirst;     // the stored task, from whichever backend has it
  bool givesAnswer;    // or zero and -1
  const char *nobody;  // how it names a backend that is not there
};

template <auto slot>
void emptySlot(ZELO_SCHED_BACKEND *entry) {
  entry->*slot = nullptr;
}

constexpr Operation kOperations[] = {
    {"create", "sched_task_create.cpp", ZELOSchedTaskCreate, &FakeBackend::create,
     emptySlot<&ZELO_SCHED_BACKEND::create>, false, true, " (-9)"},
    {"edit", "sched_task_edit.cpp", ZELOSchedTaskEdit, &FakeBackend::edit,
     emptySlot<&ZELO_SCHED_BACKEND::edit>, true, true, " (-9)"},
    {"remove", "sched_task_remove.cpp",
     [](ZELO_SCHED_TASK *task) { return ZELOSchedTaskRemove(task->ID); }, &FakeBackend::remove,
     emptySlot<&ZELO_SCHED_BACKEND::remove>, true, false, ""},
    {"get_default", "sched_task_get.cpp", ZELOSchedTaskGetDefault, &FakeBackend::get_default,
     emptySlot<&ZELO_SCHED_BACKEND::get_default>, false, true, " (-9)"},
};

class OperationTest : public SandboxTest, public testing::WithParamInterface<Operation> {
 protected:
  // The fakes have entry `reader` read the stored task, which is its own then.
  void holdTask(size_t reader) {
    if (GetParam().readsFirst) fakes_[reader].get_by_id = 1;
  }

  int callFor(int32_t backend) {
    task_ = taskOf(backend, kId);
    return GetParam().call(&task_);
  }

  std::string backendCall(size_t index) const {
    return std::string(GetParam().word) + " " + std::to_string(index) + " id 7";
  }

  Lines line(const std::string &text) const {
    return {std::string(GetParam().unit) + ":N " + text};
  }

  FakeBackends fakes_{3};
  ZELO_SCHED_TASK task_ = {};
};

INSTANTIATE_TEST_SUITE_P(Lifecycle, OperationTest, testing::ValuesIn(kOperations),
                         [](const auto &test) { return std::string(test.param.word); });

TEST_P(OperationTest, TheBackendOfTheTaskIsAskedAndItsAnswerGiven) {
  for (const int answer : {0, 1, 5}) {
    SCOPED_TRACE(answer);
    holdTask(1);
    fakes_[1].*GetParam().answer = answer;
    EXPECT_EQ(callFor(kSecond), GetParam().givesAnswer ? answer : 0);
    EXPECT_EQ(fakes_.calls().back(), backendCall(1));
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_P(OperationTest, BackendsThatCannotBeRegisteredAreReported) {
  holdTask(0);
  failBackendInit(GetParam().readsFirst ? 2 : 1);
  EXPECT_EQ(callFor(kFirst), -1);
  EXPECT_EQ(logged(), line("Init backend failed. [0x0000 :N]"));
  EXPECT_EQ(fakes_.calls(),
            GetParam().readsFirst ? (Lines{"owns_id 0 id 7", "get_by_id 0 id 7"}) : Lines{});
  EXPECT_EQ(toldResults(),
            GetParam().readsFirst ? (Lines{"int RESULT=0", "int RESULT=-1"}) : Lines{});
}

TEST_P(OperationTest, OfTwoBackendsWithTheIdTheFirstIsAsked) {
  holdTask(1);
  SchedBackends[2].id = kSecond;
  EXPECT_EQ(callFor(kSecond), 0);
  EXPECT_EQ(fakes_.calls().back(), backendCall(1));
}

TEST_P(OperationTest, AnEntryWithAnEmptySlotIsPassedOverForALaterOneWithItsId) {
  holdTask(1);
  GetParam().emptySlot(&SchedBackends[1]);
  SchedBackends[2].id = kSecond;
  EXPECT_EQ(callFor(kSecond), 0);
  EXPECT_EQ(fakes_.calls().back(), backendCall(2));
}

TEST_P(OperationTest, AFailureOfTheBackendIsReported) {
  holdTask(1);
  fakes_[1].*GetParam().answer = -7;
  EXPECT_EQ(callFor(kSecond), GetParam().givesAnswer ? -7 : -1);
  EXPECT_EQ(logged(), line("Failed to " + std::string(GetParam().word) +
                           " for backend [1] id:[7] [0x4321 fake.cpp:N]"));
  EXPECT_EQ(errorRecord(), kFakesError);
}

// An entry without the operation is nobody, and so is one behind those in use.
TEST_P(OperationTest, ATaskThatNobodyTakesIsNotFound) {
  holdTask(0);
  for (const size_t entry : {0U, 3U}) SchedBackends[entry].id = kNobody;
  GetParam().emptySlot(&SchedBackends[0]);
  EXPECT_EQ(callFor(kNobody), -1);
  EXPECT_EQ(logged(), line("No " + std::string(GetParam().word) + " backend" + GetParam().nobody +
                           " is found for task [7] "));
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, GetParam().unit}));
  if (GetParam().readsFirst) {
    EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=-1"}));
  }
}

// ---- changes with plugins told before and after -------------------------------------------------

class HookedOperationTest : public OperationTest {
 protected:
  void SetUp() override {
    OperationTest::SetUp();
    holdTask(0);
  }
};

INSTANTIATE_TEST_SUITE_P(Lifecycle, HookedOperationTest,
                         testing::Values(kOperations[1], kOperations[2]),
                         [](const auto &test) { return std::string(test.param.word); });

TEST_P(HookedOperationTest, AnIdThatNobodyHoldsFailsBeforeAnyHook) {
  fakes_[0].get_by_id = 0;
  EXPECT_EQ(callFor(kFirst), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                   line("get task failed. id:[7] [0x2000 sched_task_get.cpp:N]").front()}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  EXPECT_EQ(hookCalls(), Lines{});
}

TEST_P(HookedOperationTest, TheResultIsToldAfterwards) {
  for (const int answer : {5, 0, -7}) {
    SCOPED_TRACE(answer);
    resetFailingCalls();
    fakes_[0].*GetParam().answer = answer;
    const int result = callFor(kFirst);
    EXPECT_EQ(toldResults(), (Lines{"int RESULT=0", "int RESULT=" + std::to_string(result)}));
  }
}

TEST_P(HookedOperationTest, APluginThatFailsBeforehandCannotVeto) {
  failCallFor("QLIBPluginAction", "4");
  EXPECT_EQ(callFor(kFirst), GetParam().givesAnswer ? fakes_[0].*GetParam().answer : 0);
  EXPECT_EQ(logged(), line("Fail to execute task plugin (PRE)"));
  EXPECT_EQ(fakes_.calls().back(), backendCall(0));
  EXPECT_EQ(hookCalls().at(hookCalls().size() - 2), "action 5");
}

TEST_P(HookedOperationTest, APluginThatFailsAfterwardsDoesNotChangeTheResult) {
  fakes_[0].*GetParam().answer = 5;
  failCallFor("QLIBPluginAction", "5");
  EXPECT_EQ(callFor(kFirst), GetParam().givesAnswer ? 5 : 0);
  EXPECT_EQ(logged(), line("Fail to execute task plugin (POST)"));
  EXPECT_EQ(hookCalls().back(), "exit");
}

TEST_P(HookedOperationTest, AHookThatCannotBeClosedDoesNotChangeTheResult) {
  const ExpectedLeak hookLeftOpen;
  failCall("QLIBPluginExit", {.code = 0x0200});
  fakes_[0].*GetParam().answer = 5;
  EXPECT_EQ(callFor(kFirst), GetParam().givesAnswer ? 5 : 0);
  EXPECT_EQ(logged(),
            Lines{"sched_task_plugin.cpp:N Fail to do plugin exit[0x0200 injected.cpp:N]"});
}

TEST_P(HookedOperationTest, NothingIsChangedWhenPluginsCannotBePrepared) {
  failCall("QLIBPluginInit", {.code = 0x0200});
  EXPECT_EQ(callFor(kFirst), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]",
                   line("Fail to execute task plugin (POST)").front(),
                   "sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"}));
  EXPECT_EQ(fakes_.calls().back(), "get_by_id 0 id 7");
  EXPECT_EQ(hookCalls(),
            (Lines{"init task_scheduler task_" + std::string(GetParam().word), "exit"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
}

TEST_P(HookedOperationTest, WhyItFailedOutlivesAPluginThatFailsToo) {
  fakes_[0].*GetParam().answer = -7;
  installPlugin("failing", "exit 1");
  EXPECT_LT(callFor(kFirst), 0);
  EXPECT_EQ(errorRecord(), kFakesError);
}

// ---- create -------------------------------------------------------------------------------------

class TaskCreateTest : public SandboxTest {
 protected:
  void expectNotFound(const Lines &more) {
    EXPECT_EQ(ZELOSchedTaskCreate(&orphan_), -1);
    Lines lines = {"sched_task_create.cpp:N No create backend (-9) is found for task [-1] "};
    lines.insert(lines.end(), more.begin(), more.end());
    EXPECT_EQ(logged(), lines);
    EXPECT_EQ(hookCalls().back(), "exit");
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_create.cpp"}));
  }

  ZELO_SCHED_TASK orphan_ = taskOf(kNobody, -1);
};

TEST_F(TaskCreateTest, NoPluginHearsOfATaskThatABackendTook) {
  for (const int result : {0, 5, -1}) {
    FakeBackends fakes(1);
    fakes[0].create = result;
    ZELO_SCHED_TASK task = taskOf(kFirst, -1);
    EXPECT_EQ(ZELOSchedTaskCreate(&task), result);
    EXPECT_EQ(hookCalls(), Lines{});
  }
}

TEST_F(TaskCreateTest, PluginsHearOfATaskThatNobodyTookAfterwardsOnly) {
  setText(orphan_.Name, "orphan");
  setText(orphan_.App, "app");
  setText(orphan_.Week, "0000010");
  expectNotFound({});
  EXPECT_EQ(
      hookCalls(),
      (Lines{"init task_scheduler task_create", "int RESULT=-1", "arg NEW_TASK_ID=-1",
             "arg NEW_BACKEND=-9", "arg NEW_OWNER=0", "arg NEW_NAME=orphan", "arg NEW_STATE=0",
             "arg NEW_TYPE=0", "arg NEW_APP=app", "arg NEW_YEAR=0", "arg NEW_MONTH=0",
             "arg NEW_DAY=0", "arg NEW_HOUR=0", "arg NEW_MIN=0", "arg NEW_REPEAT_HOUR=0",
             "arg NEW_LAST_WORK_HOUR=0", "arg NEW_WEEK=0000010", "action 5", "exit"}));
}

TEST_F(TaskCreateTest, AnInstalledPluginHearsOfATaskThatNobodyTook) {
  installPlugin("teller", "echo $1 $2 $RESULT $NEW_NAME >> /tmp/told");
  setText(orphan_.Name, "orphan");
  expectNotFound({});
  EXPECT_EQ(toldPlugins(), Lines{"task_create post -1 orphan"});
}

TEST_F(TaskCreateTest, APluginThatFailsIsLoggedOnly) {
  failCallFor("QLIBPluginAction", "5");
  expectNotFound({"sched_task_create.cpp:N Fail to execute task plugin (POST)"});
}

TEST_F(TaskCreateTest, PluginsThatCannotBePreparedAreLogged) {
  failCall("QLIBPluginInit", {.code = 0x0200});
  expectNotFound({"sched_task_plugin.cpp:N Fail to do plugin init[0x0200 injected.cpp:N]",
                  "sched_task_create.cpp:N Fail to execute task plugin (POST)",
                  "sched_task_plugin.cpp:N Fail to do plugin exit[0x0D00 plugin.cpp:N]"});
  EXPECT_EQ(hookCalls(), (Lines{"init task_scheduler task_create", "exit"}));
}

TEST_F(TaskCreateTest, TheBackendAssignsTheIdIntoTheTaskWhateverItCarries) {
  const Task task = makeTask("backup", "/bin/true");
  task->ID = 12;
  EXPECT_GE(ZELOSchedTaskCreate(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  EXPECT_STREQ(loadTask(1)->Name, "backup");
  EXPECT_EQ(logged(), Lines{});
}

// ---- edit ---------------------------------------------------------------------------------------

// Every entry of a table of fakes says that it holds the task, so entry 0 is the one that is read.
class TaskEditTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    stored_ = makeTask("before", "/bin/true");
    saveTask(stored_);
    setText(stored_->Name, "after");
  }

  Task stored_;
};

TEST_F(TaskEditTest, TheStoredTaskIsReadThenTheGivenOneEditedByItsOwnBackend) {
  FakeBackends fakes(2);
  fakes[0].get_by_id = 1;
  ZELO_SCHED_TASK task = taskOf(kSecond, 7);
  setText(task.Name, "given");
  EXPECT_EQ(ZELOSchedTaskEdit(&task), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "get_by_id 0 id 7", "edit 1 id 7"}));
  EXPECT_STREQ(task.Name, "given");
}

TEST_F(TaskEditTest, PluginsAreToldBeforeAndAfterWithTheOldAndTheNewTask) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  ZELO_SCHED_TASK task = taskOf(kFirst, 7);
  setText(task.Name, "given");
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

TEST_F(TaskEditTest, InstalledPluginsSeeTheStoreBeforeAndAfterTheChange) {
  installPlugin(
      "teller",
      "echo $1 $2 $RESULT $ORG_NAME $NEW_NAME `grep ^name= /tmp/scheduled_tasks` >> /tmp/told");
  EXPECT_EQ(ZELOSchedTaskEdit(stored_.get()), 0);
  EXPECT_EQ(toldPlugins(), (Lines{"task_edit pre 0 before after name=\"before\"",
                                  "task_edit post 0 before after name=\"after\""}));
}

TEST_F(TaskEditTest, AnInstalledPluginThatFailsCannotVeto) {
  installPlugin("vetoer", "exit 1");
  EXPECT_EQ(ZELOSchedTaskEdit(stored_.get()), 0);
  EXPECT_EQ(logged(), (Lines{"sched_task_edit.cpp:N Fail to execute task plugin (PRE)",
                             "sched_task_edit.cpp:N Fail to execute task plugin (POST)"}));
  EXPECT_STREQ(loadTask(stored_->ID)->Name, "after");
}

// ---- remove -------------------------------------------------------------------------------------

class TaskRemoveTest : public SandboxTest {};

TEST_F(TaskRemoveTest, TheBackendThatHoldsTheTaskRemovesIt) {
  FakeBackends fakes(2);
  fakes[1].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id 7", "get_by_id 0 id 7", "owns_id 1 id 7",
                                  "get_by_id 1 id 7", "remove 1 id 7"}));
}

TEST_F(TaskRemoveTest, PluginsAreToldOfTheOldTaskAndTheResultOnly) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  EXPECT_EQ(ZELOSchedTaskRemove(kId), 0);
  const Lines told = linesOf(
      "int RESULT=0\narg ORG_TASK_ID=7\narg ORG_BACKEND=-2\narg ORG_OWNER=0\n"
      "arg ORG_NAME=stored by 0\narg ORG_STATE=0\narg ORG_TYPE=0\narg ORG_APP=\n"
      "arg ORG_YEAR=0\narg ORG_MONTH=0\narg ORG_DAY=0\narg ORG_HOUR=0\narg ORG_MIN=0\n"
      "arg ORG_REPEAT_HOUR=0\narg ORG_LAST_WORK_HOUR=0\narg ORG_WEEK=\n");
  Lines expected = {"init task_scheduler task_remove"};
  for (const char *action : {"action 4", "action 5"}) {
    expected.insert(expected.end(), told.begin(), told.end());
    expected.emplace_back(action);
  }
  expected.emplace_back("exit");
  EXPECT_EQ(hookCalls(), expected);
}

TEST_F(TaskRemoveTest, InstalledPluginsSeeTheStoreBeforeAndAfterTheRemoval) {
  const long id = saveTask(makeTask("doomed", "/bin/true"));
  installPlugin("teller",
                "echo $1 $2 $RESULT $ORG_NAME `grep ^name= /tmp/scheduled_tasks` >> /tmp/told");
  EXPECT_EQ(ZELOSchedTaskRemove(id), 0);
  EXPECT_EQ(toldPlugins(),
            (Lines{"task_remove pre 0 doomed name=\"doomed\"", "task_remove post 0 doomed"}));
}

TEST_F(TaskRemoveTest, ARemovedTaskIsGoneAndTheOthersStay) {
  const long first = saveTask(makeTask("first", "/bin/true"));
  const long second = saveTask(makeTask("second", "/bin/true"));
  EXPECT_EQ(ZELOSchedTaskRemove(first), 0);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(loadTask(first)->State, ZELO_SCHED_STATE_NOT_EXISTED);
  EXPECT_STREQ(loadTask(second)->Name, "second");
}

// ---- reading one --------------------------------------------------------------------------------

class TaskGetByIdTest : public SandboxTest {
 protected:
  ZELO_SCHED_TASK task_ = {};
};

TEST_F(TaskGetByIdTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  failBackendInit();
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

// Which backends are asked, in a table of three.
struct Search {
  const char *what;
  void (*change)(FakeBackends &fakes);
  Lines calls;
};

TEST_F(TaskGetByIdTest, BackendsAreAskedInOrderUntilOneHasTheTask) {
  const Lines both = {"owns_id 0 id 7", "get_by_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"};
  const Search searches[] = {
      {"in order", [](FakeBackends &) {}, both},
      {"not one that cannot own it",
       [](FakeBackends &fakes) { fakes[0].owns_id = 0; },
       {"owns_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}},
      {"2 is no 0", [](FakeBackends &fakes) { fakes[0].owns_id = 2; }, both},
      {"nor is -1", [](FakeBackends &fakes) { fakes[0].owns_id = -1; }, both},
      {"one that owns every id",
       [](FakeBackends &) { SchedBackends[0].owns_id = nullptr; },
       {"get_by_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}},
      {"not one that reads none",
       [](FakeBackends &) { SchedBackends[0].get_by_id = nullptr; },
       {"owns_id 0 id 7", "owns_id 1 id 7", "get_by_id 1 id 7"}},
      {"2 is not found", [](FakeBackends &fakes) { fakes[0].get_by_id = 2; }, both},
      {"nor is 100", [](FakeBackends &fakes) { fakes[0].get_by_id = 100; }, both},
  };
  for (const Search &search : searches) {
    SCOPED_TRACE(search.what);
    FakeBackends fakes(3);
    fakes[1].get_by_id = 1;
    search.change(fakes);
    EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), 0);
    EXPECT_EQ(fakes.calls(), search.calls);
    EXPECT_EQ(task_.Backend, SchedBackends[1].id);
    EXPECT_STREQ(task_.Name, "stored by 1");
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskGetByIdTest, ABackendThatFailsEndsTheSearch) {
  FakeBackends fakes(3);
  fakes[1].get_by_id = -5;
  fakes[2].get_by_id = 1;
  expectFailure(ZELOSchedTaskGetByID(kId, &task_),
                {"sched_task_get.cpp:N Failed to get_by_id for backend [1] id:[7] "
                 "[0x4321 fake.cpp:N]"},
                kFakesError);
  EXPECT_EQ(fakes.calls().back(), "get_by_id 1 id 7");
}

TEST_F(TaskGetByIdTest, AnIdThatNobodyHoldsIsNotFoundAndReachesTheBackendsWhole) {
  for (const long id : {0L, kId, 60000000L, static_cast<long>(0x1'0000'0007)}) {
    const std::string number = std::to_string(id);
    clearLog();
    FakeBackends fakes(1);
    expectFailure(ZELOSchedTaskGetByID(id, &task_),
                  {"sched_task_get.cpp:N No get_by_id backend is found for task [" + number + "] "},
                  {0x2000, "sched_task_get.cpp"});
    EXPECT_EQ(fakes.calls(), (Lines{"owns_id 0 id " + number, "get_by_id 0 id " + number}));
  }
}

TEST_F(TaskGetByIdTest, AStoredTaskComesBackWithItsBackendAndNoOther) {
  const long id = saveTask(makeTask("backup", "/bin/true"));
  EXPECT_EQ(ZELOSchedTaskGetByID(id, &task_), 0);
  EXPECT_EQ(task_.ID, id);
  EXPECT_EQ(task_.Backend, kFirst);
  EXPECT_STREQ(task_.Name, "backup");
  EXPECT_STREQ(task_.Command, "/bin/true");
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(ZELOSchedTaskGetByID(kId, &task_), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
}

// ---- save and load, by the id alone -------------------------------------------------------------

class TaskSaveTest : public SandboxTest {};
class TaskLoadTest : public SandboxTest {};

// A save or load that goes on to another call, with backend 0 holding every task.
struct Passed {
  int (*call)(ZELO_SCHED_TASK *task, int32_t id);
  int32_t id;
  int FakeBackend::*answer;
  const char *unit;  // of the call that it goes on to
  const char *word;
  int32_t idThere;
  const char *toldLast;  // when that fails
};

int save(ZELO_SCHED_TASK *task, int32_t id) {
  *task = taskOf(kFirst, id);
  return ZELOSchedTaskSave(task);
}

int load(ZELO_SCHED_TASK *task, int32_t id) {
  *task = taskOf(kFirst, 3);
  return ZELOSchedTaskLoad(id, task);
}

constexpr Passed kPassed[] = {
    {save, -1, &FakeBackend::create, "create", "create", -1, "save.cpp:N Add task failed. "},
    {save, 0, &FakeBackend::edit, "edit", "edit", 0, "save.cpp:N Set task failed. [0] "},
    {save, 7, &FakeBackend::edit, "edit", "edit", 7, "save.cpp:N Set task failed. [7] "},
    {save, -2, &FakeBackend::edit, "edit", "edit", -2, "save.cpp:N Set task failed. [-2] "},
    {load, -1, &FakeBackend::get_default, "get", "get_default", 3,
     "load.cpp:N get default task failed. "},
    {load, 0, &FakeBackend::get_by_id, "get", "get_by_id", 0, "load.cpp:N get task failed. [0] "},
};

TEST_F(TaskSaveTest, AndLoadGoOnByTheIdAndGiveZeroOrMinusOne) {
  for (const Passed &passed : kPassed) {
    const std::string word = passed.word;
    const std::string id = std::to_string(passed.idThere);
    const std::string error = "[0x4321 fake.cpp:N]";
    SCOPED_TRACE(word + " " + id);
    const Lines whenItFails = {std::string("sched_task_") + passed.unit + ".cpp:N Failed to " +
                                   word + " for backend [0] id:[" + id + "] " + error,
                               std::string("sched_task_") + passed.toldLast + error};
    for (const int answer : {1, -7}) {
      clearLog();
      FakeBackends fakes(1);
      fakes[0].get_by_id = 1;
      fakes[0].*passed.answer = answer;
      ZELO_SCHED_TASK task = {};
      EXPECT_EQ(passed.call(&task, passed.id), answer < 0 ? -1 : 0);
      EXPECT_EQ(fakes.calls().back(), word + " 0 id " + id);
      EXPECT_EQ(logged(), answer < 0 ? whenItFails : Lines{});
      if (answer < 0) {
        EXPECT_EQ(errorRecord(), kFakesError);
      }
    }
  }
}

TEST_F(TaskSaveTest, AnUnknownIdFailsInTheFirstStepOfTheEdit) {
  ZELO_SCHED_TASK task = {};
  expectFailure(save(&task, 7),
                {"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                 "sched_task_edit.cpp:N get task failed. id:[7] [0x2000 sched_task_get.cpp:N]",
                 "sched_task_save.cpp:N Set task failed. [7] [0x2000 sched_task_get.cpp:N]"},
                {0x2000, "sched_task_get.cpp"});
  EXPECT_FALSE(hasStoredTasks());
}

TEST_F(TaskLoadTest, AnUnknownIdOrBackendIsReported) {
  ZELO_SCHED_TASK task = taskOf(kNobody, -1);
  expectFailure(ZELOSchedTaskLoad(-1, &task),
                {"sched_task_get.cpp:N No get_default backend (-9) is found for task [-1] ",
                 "sched_task_load.cpp:N get default task failed. [0x2000 sched_task_get.cpp:N]"},
                {0x2000, "sched_task_get.cpp"});
  clearLog();
  expectFailure(ZELOSchedTaskLoad(7, &task),
                {"sched_task_get.cpp:N No get_by_id backend is found for task [7] ",
                 "sched_task_load.cpp:N get task failed. [7] [0x2000 sched_task_get.cpp:N]"},
                {0x2000, "sched_task_get.cpp"});
}

TEST_F(TaskSaveTest, ASavedTaskCanBeLoadedAndSavedAgainUnderItsId) {
  const Task task = makeTask("first", "/bin/true");
  ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  ZELO_SCHED_TASK loaded = taskOf(kSecond, -1);
  EXPECT_EQ(ZELOSchedTaskLoad(1, &loaded), 0);
  EXPECT_STREQ(loaded.Name, "first");
  EXPECT_EQ(loaded.Backend, kFirst);
  setText(task->Name, "second");
  ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  EXPECT_STREQ(loadTask(1)->Name, "second");
  EXPECT_EQ(logged(), Lines{});
}

// ---- lists --------------------------------------------------------------------------------------

Lines namesOf(ZELO_SCHED_TASK *task) {
  Lines names;
  for (; task != nullptr; task = ZELOSchedTaskNext(task)) names.emplace_back(task->Name);
  return names;
}

class TaskListGetTest : public SandboxTest {
 protected:
  // What the head holds before is not part of the list, and stays when nothing is listed.
  void expectList(int result, const Lines &names, ZELO_SCHED_TASK_FILTER filter = nullptr) {
    ZELO_SCHED_TASK own = {};
    ZELO_SCHED_TASK *head = &own;
    EXPECT_EQ(ZELOSchedTaskListGet(&head, filter), result);
    EXPECT_EQ(own.next, nullptr);
    if (result <= 0) {
      EXPECT_EQ(head, &own);
      return;
    }
    const TaskList list(head);
    EXPECT_EQ(namesOf(head), names);
  }
};

TEST_F(TaskListGetTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  fakes[0].tasks = {"a"};
  failBackendInit();
  expectList(-1, {});
  EXPECT_EQ(logged(), Lines{"sched_task_list_get.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

std::string failedList(int index) {
  return "sched_task_list_get.cpp:N Failed to list_get for backend [" + std::to_string(index) +
         "] [0x4321 fake.cpp:N]";
}

constexpr int kFails = -5;
constexpr int kHasNone = -100;  // the backend offers no list

struct Backends {
  Lines tasks[3];
  int answers[3];
  int result;
  Lines names;
  Lines log;
};

// A backend without a list counts the one before it again, also when that has failed.
TEST_F(TaskListGetTest, TasksComeBackendByBackendInTheirOrder) {
  const Backends cases[] = {
      {{{"a", "b"}, {"c"}, {"d", "e"}}, {}, 5, {"a", "b", "c", "d", "e"}, {}},
      {{}, {}, 0, {}, {}},
      {{{"a"}, {}, {"b"}}, {0, kFails, 0}, 2, {"a", "b"}, {failedList(1)}},
      {{}, {kFails, kFails, 0}, 0, {}, {failedList(0), failedList(1)}},
      {{{"a", "b"}, {}, {"c"}}, {0, kHasNone, 0}, 5, {"a", "b", "c"}, {}},
      {{{}, {"a"}, {}}, {kHasNone, 0, 0}, 1, {"a"}, {}},
      {{{"a", "b"}, {}, {}}, {0, -1, kHasNone}, 1, {"a", "b"}, {failedList(1)}},
  };
  for (const Backends &given : cases) {
    SCOPED_TRACE(&given - cases);
    clearLog();
    FakeBackends fakes(3);
    Lines calls;
    for (size_t i = 0; i < 3; ++i) {
      fakes[i].tasks = given.tasks[i];
      fakes[i].list_get = given.answers[i];
      if (given.answers[i] == kHasNone) {
        SchedBackends[i].list_get = nullptr;
      } else {
        calls.push_back("list_get " + std::to_string(i));
      }
    }
    expectList(given.result, given.names);
    EXPECT_EQ(logged(), given.log);
    EXPECT_EQ(fakes.calls(), calls);
    if (!given.log.empty()) {
      EXPECT_EQ(errorRecord(), kFakesError);
    }
  }
}

TEST_F(TaskListGetTest, EveryRegisteredBackendOffersAList) {
  ASSERT_EQ(ZELOSchedBackendInit(), 0);
  for (uint32_t i = 0; i < cBackend; ++i) EXPECT_NE(SchedBackends[i].list_get, nullptr) << i;
  expectList(0, {});
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskListGetTest, TheFilterReachesEveryBackend) {
  FakeBackends fakes(2);
  fakes[0].tasks = {"keep 1", "drop 1"};
  fakes[1].tasks = {"drop 2", "keep 2"};
  expectList(2, {"keep 1", "keep 2"}, [](const ZELO_SCHED_TASK *task) {
    return std::strncmp(task->Name, "keep", 4) == 0 ? 5 : 0;
  });
}

TEST_F(TaskListGetTest, StoredTasksAreListedWithTheirBackend) {
  saveTask(makeTask("a", "/bin/true"));
  saveTask(makeTask("b", "/bin/true"));
  ZELO_SCHED_TASK *head = nullptr;
  ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), 2);
  const TaskList list(head);
  ASSERT_EQ(namesOf(head).size(), 2U);
  for (; head != nullptr; head = head->next) EXPECT_EQ(head->Backend, kFirst);
  EXPECT_EQ(logged(), Lines{});
  expectList(0, {}, [](const ZELO_SCHED_TASK *) { return 0; });
}

TEST_F(TaskListGetTest, TheNextRecordIsGiven) {
  ZELO_SCHED_TASK second = {};
  ZELO_SCHED_TASK first = {};
  first.next = &second;
  EXPECT_EQ(ZELOSchedTaskNext(&first), &second);
  EXPECT_EQ(ZELOSchedTaskNext(&second), nullptr);
  EXPECT_EQ(ZELOSchedTaskNext(nullptr), nullptr);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

TEST_F(TaskListGetTest, TheHeadOfAFreedListEndsEmpty) {
  FakeBackends fakes(1);
  fakes[0].tasks = {"a", "b", "c"};
  ZELO_SCHED_TASK *head = nullptr;
  ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), 3);
  for (int times = 0; times < 2; ++times) {
    ZELOSchedTaskListFree(&head);
    EXPECT_EQ(head, nullptr);
  }
  ZELOSchedTaskListFree(nullptr);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

// ---- sync ---------------------------------------------------------------------------------------

class TaskSyncTest : public SandboxTest {};

TEST_F(TaskSyncTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  failBackendInit();
  EXPECT_EQ(ZELOSchedTaskSync(), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_sync.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskSyncTest, EveryBackendThatOffersItIsSynchronisedInOrder) {
  FakeBackends fakes(4);
  fakes[1].sync = 5;
  SchedBackends[2].sync = nullptr;
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"sync 0", "sync 1", "sync 3"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskSyncTest, ABackendThatFailsIsReportedAndTheOthersFollow) {
  FakeBackends fakes(3);
  fakes[0].sync = -1;
  fakes[2].sync = -5;
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(fakes.calls(), (Lines{"sync 0", "sync 1", "sync 2"}));
  EXPECT_EQ(logged(),
            (Lines{"sched_task_sync.cpp:N Failed to sync for backend [0] [0x4321 fake.cpp:N]",
                   "sched_task_sync.cpp:N Failed to sync for backend [2] [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(loggedPriorities(), (std::vector<int>{3, 3}));
  EXPECT_EQ(errorRecord(), kFakesError);
}

TEST_F(TaskSyncTest, AFailureOfZeloscheduleIsReportedAndTheCallSucceeds) {
  saveTask(makeTask("a", "/bin/true"));
  failCall("QLIBCFileEnumSection", {.code = 0x0B00});
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(),
            "sched_task_sync.cpp:N Failed to sync for backend [0] [0x0B00 injected.cpp:N]");
}

TEST_F(TaskSyncTest, LinesOfTheCrontabThatWereLostAreWrittenAgain) {
  saveTask(makeTask("a", "/bin/true"));
  const Lines lines = crontabLines();
  ASSERT_EQ(lines.size(), 1U);
  writeFile(kCrontab, kPlainCrontab);
  EXPECT_EQ(ZELOSchedTaskSync(), 0);
  EXPECT_EQ(crontabLines(), lines);
  EXPECT_EQ(logged(), Lines{});
}

// ---- new records --------------------------------------------------------------------------------

class TaskAllocTest : public SandboxTest {};

TEST_F(TaskAllocTest, ANewTaskHasTheDefaultsOfZeloscheduleAndTheNextFreeId) {
  for (const char *name : {"Task 1", "Task 2"}) {
    const Task task(ZELOSchedTaskAlloc());
    ASSERT_NE(task, nullptr);
    ZELO_SCHED_TASK defaults = taskOf(kFirst, 0);
    ASSERT_GE(ZELOSchedTaskGetDefault(&defaults), 0);
    EXPECT_EQ(std::memcmp(task.get(), &defaults, sizeof(defaults)), 0);
    EXPECT_EQ(task->Backend, kFirst);
    EXPECT_EQ(task->ID, ZELO_SCHED_ID_NEW);
    EXPECT_STREQ(task->Name, name);
    saveTask(makeTask("first", "/bin/true"));
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskAllocTest, ZeloscheduleIsAskedForTheDefaultsAndWhatItDoesNotFillIsZero) {
  FakeBackends fakes(2);
  std::swap(SchedBackends[0].id, SchedBackends[1].id);
  const Task task(ZELOSchedTaskAlloc());
  ASSERT_NE(task, nullptr);
  EXPECT_EQ(fakes.calls(), Lines{"get_default 1 id 0"});
  const ZELO_SCHED_TASK expected = taskOf(kFirst, 0);
  EXPECT_EQ(std::memcmp(task.get(), &expected, sizeof(expected)), 0);
}

TEST_F(TaskAllocTest, MemoryThatIsShortIsReported) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  ZELO_SCHED_TASK *task = nullptr;
  {
    const FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)});
    task = ZELOSchedTaskAlloc();
  }
  EXPECT_EQ(task, nullptr);
  EXPECT_EQ(logged(), Lines{"sched_task_alloc.cpp:N Allocate ZELO_SCHED_TASK failed. "
                            "Cannot allocate memory"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "sched_task_alloc.cpp"}));
}

TEST_F(TaskAllocTest, DefaultsThatCannotBeHadAreReported) {
  FakeBackends fakes(1);
  fakes[0].get_default = -7;
  EXPECT_EQ(ZELOSchedTaskAlloc(), nullptr);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N Failed to get_default for backend [0] id:[0] "
                   "[0x4321 fake.cpp:N]",
                   "sched_task_alloc.cpp:N Init task to default failed. [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(errorRecord(), kFakesError);
}

TEST_F(TaskAllocTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  failBackendInit();
  EXPECT_EQ(ZELOSchedTaskAlloc(), nullptr);
  EXPECT_EQ(logged(), (Lines{"sched_task_get.cpp:N Init backend failed. [0x0000 :N]",
                             "sched_task_alloc.cpp:N Init task to default failed. [0x0000 :N]"}));
}

TEST_F(TaskAllocTest, AFreedTaskLeavesTheRestOfItsListAlone) {
  const Task second(ZELOSchedTaskAlloc());
  ZELO_SCHED_TASK *first = ZELOSchedTaskAlloc();
  ASSERT_NE(first, nullptr);
  first->next = second.get();
  EXPECT_EQ(ZELOSchedTaskFree(first), 0);
  EXPECT_STREQ(second->Name, "Task 1");
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), kNoError);
}

}  // namespace
}  // namespace support
