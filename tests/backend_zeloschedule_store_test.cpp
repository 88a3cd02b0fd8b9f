// Ordinary tasks in their store: each operation of the backend, what it copies where, and what
// every failure leaves behind.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;
using Ids = std::vector<long>;

constexpr int kInjectedCode = 0x0B00;
constexpr int kNew = ZELO_SCHED_ID_NEW;
const std::string kInjected = "[0x0B00 injected.cpp:N]";
const std::string kVictim = "/tmp/store_test.victim";

std::string backendLine(const std::string &text) {
  return "backend_zeloschedule.cpp:N " + text;
}

std::string scratchPath() {
  return std::string(kStore) + ".tmp." + std::to_string(getpid());
}

std::string copyCommand(const std::string &from, const std::string &to) {
  return "/bin/cp -f " + from + " " + to;
}

std::string copyFailed(const std::string &from, const std::string &to) {
  return backendLine("Copy sched conf failed. [" + from + "] -> [" + to + "] " + kInjected);
}

// Everything beside the store that begins with its name.
Lines leftovers() {
  Lines names;
  for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
    const std::string path = entry.path();
    if (path.starts_with(kStore) && path != kStore) names.push_back(path);
  }
  return names;
}

class StoreTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    ASSERT_EQ(zeloschedule_init("zeloschedule", &backend_), 0);
    std::filesystem::remove_all(kVictim);
  }

  void TearDown() override {
    EXPECT_EQ(leftovers(), Lines{});
    SandboxTest::TearDown();
  }

  long create(const std::string &name) const {
    const Task task = makeTask(name, "true");
    EXPECT_EQ(backend_.create(task.get()), 0);
    return task->ID;
  }

  int edit(long id, const std::string &name, const std::string &command = "true") const {
    const Task task = makeTask(name, command);
    task->ID = static_cast<int32_t>(id);
    return backend_.edit(task.get());
  }

  Task find(long id) const {
    Task task = makeTask("x", "x");
    EXPECT_EQ(backend_.get_by_id(id, task.get()), 1);
    return task;
  }

  // Each that reads or changes the store, of task 1.
  using Operations = std::vector<std::pair<const char *, std::function<int()>>>;
  Operations reads() const {
    return {{"list", [this] { return failedList(); }},
            {"find", [this] { return backend_.get_by_id(1, makeTask("", "").get()); }}};
  }
  Operations changes() const {
    return {{"create", [this] { return backend_.create(makeTask("new", "true").get()); }},
            {"edit", [this] { return edit(1, "edited"); }},
            {"remove", [this] { return backend_.remove(1); }},
            {"sync", [this] { return backend_.sync(); }}};
  }
  Operations all() const {
    Operations each = reads();
    for (const auto &change : changes()) each.push_back(change);
    return each;
  }
  int failedList() const {
    ZELO_SCHED_TASK *head = nullptr;
    const int count = backend_.list_get(&head, nullptr);
    EXPECT_EQ(head, nullptr);
    return count;
  }
  void expectEachFails(int code) const {
    for (const auto &[name, operation] : all()) {
      SCOPED_TRACE(name);
      QLIBCErrSetEx(0, "", 0);
      EXPECT_EQ(operation(), -1);
      EXPECT_EQ(errorRecord(), (ErrorRecord{code, "backend_zeloschedule.cpp"}));
    }
  }

  // The section of a task, as another process would have left it.
  static void addSection(const std::string &section, int32_t id) {
    const Task task = makeTask("task", "true");
    task->ID = id;
    PSZHASH hash = QLIBCSzHashAlloc(1);
    EXPECT_EQ(ZELOSchedInitHashFromTask(&hash, task.get()), 0);
    EXPECT_GE(QLIBCFileAddSection(kStore, section.c_str(), hash, 0), 0);
    QLIBCSzHashFree(hash);
  }
  static void addSections(std::initializer_list<int32_t> ids) {
    for (const int32_t id : ids) addSection(std::to_string(id), id);
  }

  Ids listedIds(ZELO_SCHED_TASK_FILTER filter = nullptr) const {
    ZELO_SCHED_TASK *head = nullptr;
    const int count = backend_.list_get(&head, filter);
    const TaskList list(head);
    Ids ids;
    for (ZELO_SCHED_TASK *task = head; task != nullptr; task = ZELOSchedTaskNext(task)) {
      ids.push_back(task->ID);
    }
    EXPECT_EQ(static_cast<size_t>(std::max(count, 0)), ids.size());
    return ids;
  }

  // Fails calls from now on; what went before is forgotten.
  static void fail(const std::string &call, const std::string &key, const FailPlan &plan) {
    resetFailingCalls();
    clearLog();
    failCallFor(call, key, plan);
  }

  ZELO_SCHED_BACKEND backend_ = {};
};

TEST_F(StoreTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  const Task task = makeTask("task", "true");
  int code = 0;
  char comment[8];
  expectRefused(
      "backend_zeloschedule.cpp",
      {{"((void *)0) != pTaskList", [&] { return backend_.list_get(nullptr, nullptr); }},
       {"((void *)0) != pTask", [&] { return backend_.get_by_id(1, nullptr); }},
       {"((void *)0) != pTask", [&] { return backend_.get_default(nullptr); }},
       {"((void *)0) != pTask", [&] { return backend_.create(nullptr); }},
       {"((void *)0) != pTask", [&] { return backend_.edit(nullptr); }},
       {"((void *)0) != pTask", [&] { return backend_.run(nullptr, &code, comment, 8); }},
       {"((void *)0) != pStatusCode",
        [&] { return backend_.run(task.get(), nullptr, comment, 8); }},
       {"((void *)0) != szComment", [&] { return backend_.run(task.get(), &code, nullptr, 8); }},
       {"0 < cbComment", [&] { return backend_.run(task.get(), &code, comment, 0); }}});
  EXPECT_EQ(recordedSystemCommands(), Lines{});
  EXPECT_FALSE(fileExists(kStore));
}

// ---- no store

TEST_F(StoreTest, WithoutAStoreThereIsNothingToListFindOrRemove) {
  EXPECT_EQ(backend_.remove(1), 0);
  EXPECT_EQ(recordedExecs(), Lines{});
  EXPECT_FALSE(fileExists(kStore));
  EXPECT_EQ(listedIds(), Ids{});
  std::filesystem::remove(kStore);
  const Task task = makeTask("task", "true");
  EXPECT_EQ(backend_.get_by_id(1, task.get()), 0);
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_NOT_EXISTED);
  EXPECT_EQ(task->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(recordedExecs(), Lines{});
  EXPECT_FALSE(fileExists(kPersistentStore));
}

// While the name is free, another user can move a file there that is root's.
TEST_F(StoreTest, AFreeNameIsTakenByWhoeverReadsIt) {
  const Task task = makeTask("task", "true");
  const std::function<void()> readers[] = {
      [&] { EXPECT_EQ(listedIds(), Ids{}); },
      [&] { EXPECT_EQ(backend_.get_by_id(1, task.get()), 0); },
  };
  for (const auto &read : readers) {
    std::filesystem::remove(kStore);
    read();
    EXPECT_EQ(readFile(kStore), "# The scheduler's tasks.\n");
    struct stat info = {};
    EXPECT_EQ(lstat(kStore, &info), 0);
    EXPECT_EQ(info.st_mode, static_cast<mode_t>(S_IFREG | 0644));
    read();
  }
  EXPECT_EQ(create("first"), 1);
  EXPECT_EQ(recordedExecs().size(), 3U);
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_EQ(logged(), Lines{});
}

// Whether somebody has read it before makes no difference to who comes later.
TEST_F(StoreTest, AFreeNameIsAStoreWithoutTasksAlsoWhileSomeAreKept) {
  create("kept");
  std::filesystem::remove(kStore);
  const Task task = makeTask("new", "true");
  for (int i = 0; i < 2; ++i) {
    EXPECT_EQ(listedIds(), Ids{});
    EXPECT_EQ(backend_.get_by_id(1, task.get()), 0);
    EXPECT_EQ(task->State, ZELO_SCHED_STATE_NOT_EXISTED);
    EXPECT_EQ(backend_.remove(1), 0);
  }
  EXPECT_EQ(create("first"), 1);
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_EQ(logged(), Lines{});
}

// As tmpfiles.d makes it at boot.
TEST_F(StoreTest, AStoreThatOnlyHoldsItsNameIsCopiedOnce) {
  writeFile(kStore, "");
  EXPECT_EQ(create("first"), 1);
  EXPECT_EQ(recordedExecs().size(), 3U);
  EXPECT_EQ(recordedSleeps("usleep"), std::vector<long>{});
}

TEST_F(StoreTest, WithoutAStoreCreateMakesOneWithOneSection) {
  EXPECT_EQ(create("task"), 1);
  PSZLIST names = QLIBCSzListAlloc(1);
  EXPECT_EQ(QLIBCFileEnumSection(kStore, &names), 1);
  EXPECT_STREQ(QLIBCSzListGet(names, 0), "1");
  QLIBCSzListFree(names);
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
  EXPECT_EQ(recordedExecs(), (Lines{copyCommand(scratchPath(), kPersistentStore),
                                    copyCommand(scratchPath(), kStore)}));
  EXPECT_EQ(callCount("QLIBCFileTouch"), 1U);
}

TEST_F(StoreTest, AStoreWithoutSectionsListsNothing) {
  writeFile(kStore, "# nothing\n");
  EXPECT_EQ(listedIds(), Ids{});
  EXPECT_EQ(logged(), Lines{});
}

// ---- listing

TEST_F(StoreTest, TasksAreListedInReverseFileOrder) {
  addSections({3, 1, 2});
  EXPECT_EQ(listedIds(), (Ids{2, 1, 3}));
}

TEST_F(StoreTest, TheListIsAttachedAtTheEndOfTheCallers) {
  addSections({1, 2});
  Task first = makeTask("first", "true");
  Task second = makeTask("second", "true");
  ZELO_SCHED_TASK *head = first.get();
  head->next = second.get();
  EXPECT_EQ(backend_.list_get(&head, nullptr), 2);
  ASSERT_EQ(head, first.get());
  ASSERT_EQ(head->next, second.get());
  const TaskList appended(second->next);
  ASSERT_NE(appended, nullptr);
  EXPECT_EQ(appended->ID, 2);
  ASSERT_NE(appended->next, nullptr);
  EXPECT_EQ(appended->next->ID, 1);
  EXPECT_EQ(appended->next->next, nullptr);
}

TEST_F(StoreTest, AListedTaskHasItsBackendAndItsNextTriggerTime) {
  setClock("2013-05-07 08:30");
  create("task");
  ZELO_SCHED_TASK *head = nullptr;
  ASSERT_EQ(backend_.list_get(&head, nullptr), 1);
  const TaskList list(head);
  EXPECT_EQ(list->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_STREQ(list->NextTriggerTime, "2013-05-08 00:00");
  EXPECT_STREQ(list->Name, "task");
}

TEST_F(StoreTest, AFilterKeepsWhatItAnswersNonZeroFor) {
  addSections({1, 2, 3, 4});
  EXPECT_EQ(listedIds([](const ZELO_SCHED_TASK *task) { return task->ID % 2 == 0 ? -5 : 0; }),
            (Ids{4, 2}));
  EXPECT_EQ(listedIds([](const ZELO_SCHED_TASK *) { return 0; }), Ids{});
}

// A list is of one moment, unless its own filter changes the store.
TEST_F(StoreTest, AListShowsWhatItsFilterChanged) {
  for (int i = 0; i < 3; ++i) {
    create("old");
  }
  ZELO_SCHED_TASK *head = nullptr;
  EXPECT_EQ(backend_.list_get(&head,
                              [](const ZELO_SCHED_TASK *task) {
                                if (task->ID != 1) {
                                  return 1;
                                }
                                ZELO_SCHED_BACKEND backend = {};
                                EXPECT_EQ(zeloschedule_init("zeloschedule", &backend), 0);
                                const Task changed = makeTask("new", "true");
                                changed->ID = 2;
                                EXPECT_EQ(backend.edit(changed.get()), 0);
                                EXPECT_EQ(backend.remove(3), 1);
                                return 1;
                              }),
            2);
  const TaskList list(head);
  EXPECT_STREQ(head->Name, "new");
  EXPECT_EQ(head->ID, 2);
}

TEST_F(StoreTest, ASectionThatCannotBeReadIsReportedAndSkipped) {
  addSections({1, 2, 3});
  fail("QLIBCFileGetSection", "2", {.code = kInjectedCode});
  EXPECT_EQ(listedIds(), (Ids{3, 1}));
  EXPECT_EQ(logged(),
            Lines{backendLine("Get section [2] from [/tmp/scheduled_tasks] failed. " + kInjected)});
}

TEST_F(StoreTest, ASectionThatCannotBeConvertedIsReportedAndSkippedAndStays) {
  addSection("1", 1);
  writeFile(kStore, readFile(kStore) + "[2]\nid=\"2\"\nrun hour=\"0\"\nrun min=\"x\"\n");
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_EQ(logged(), (Lines{"sched_task_convert.cpp:N parm_table[16].fnFromHashStr failed.",
                             backendLine("Init task from hash failed. [0x4000 "
                                         "sched_parm_table.cpp:N]")}));
  EXPECT_NE(readFile(kStore).find("[2]"), std::string::npos);
}

TEST_F(StoreTest, ATaskWithoutANextTriggerTimeIsReportedAndSkipped) {
  addSections({1, 2});
  fail("localtime", "", {.error = EOVERFLOW});
  EXPECT_EQ(listedIds(), Ids{2});
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(), backendLine("Failed to obtain next trigger time. id:[1]. [0x2A00 "
                                         "sched_util.cpp:N]"));
}

TEST_F(StoreTest, OneSectionsKeysDoNotReachTheNext) {
  addSection("1", 1);
  writeFile(kStore, readFile(kStore) + "[2]\nid=\"2\"\n");
  EXPECT_EQ(listedIds(), Ids{1});
  ASSERT_EQ(logged().size(), 2U);
  EXPECT_EQ(logged()[0],
            "sched_task_convert.cpp:N Get hash value failed. key:[run hour]. [0x0000 :N]");
}

// Its id may be somebody's, and a new task under it would take its place.
TEST_F(StoreTest, TheIdOfASectionThatCannotBeReadIsNotFree) {
  addSections({1, 2});
  failCallFor("QLIBCFileGetSection", "1", {.times = kAlways, .code = 0x0B00});
  const Task task = makeTask("new", "true");
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(task->ID, 3);
}

// As on every processor, however wide long is there.
TEST_F(StoreTest, OfTheNameOfASectionThatCannotBeReadTheLowest32BitsCount) {
  addSection("1", 1);
  addSection("4294967298", 2);
  failCallFor("QLIBCFileGetSection", "4294967298", {.times = kAlways, .code = 0x0B00});
  const Task task = makeTask("new", "true");
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(task->ID, 3);
}

TEST_F(StoreTest, TheIdsOfTasksAreNotFreeWhileThereIsNoClock) {
  addSections({1, 2});
  failCall("localtime", {.times = kAlways, .error = EOVERFLOW});
  const Task task = makeTask("new", "true");
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(task->ID, 3);
  EXPECT_EQ(logged()[3], backendLine("Failed to obtain next trigger time. id:[1]. [0x2A00 "
                                     "sched_util.cpp:N]"));
}

TEST_F(StoreTest, ATaskWhoseStateOrTypeHasNoNameIsStoredAndNeverSeenAgain) {
  for (const auto field : {&ZELO_SCHED_TASK::State, &ZELO_SCHED_TASK::Type}) {
    const Task task = makeTask("lost", "true");
    task.get()->*field = 5;
    EXPECT_EQ(backend_.create(task.get()), 0);
    EXPECT_EQ(task->ID, 1);
    ZELO_SCHED_TASK *head = nullptr;
    EXPECT_EQ(backend_.list_get(&head, nullptr), 0);
    EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  }
  const Task task = makeTask("next", "true");
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
}

TEST_F(StoreTest, ARecordThatCannotBeAllocatedFailsTheWholeList) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates itself";
  addSections({1, 2, 3});
  ZELO_SCHED_TASK *head = nullptr;
  {
    const FailingAllocation several("calloc",
                                    {.times = kAlways, .minSize = 2 * sizeof(ZELO_SCHED_TASK)});
    const FailingAllocation one("calloc", {.from = 2, .minSize = sizeof(ZELO_SCHED_TASK)});
    EXPECT_EQ(backend_.list_get(&head, nullptr), -1);
  }
  EXPECT_EQ(head, nullptr);
  EXPECT_EQ(logged(), Lines{backendLine("malloc ZELO_SCHED_TASK failed. key:[2]")});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "backend_zeloschedule.cpp"}));
}

TEST_F(StoreTest, NamesThatCannotBeListedFailTheList) {
  addSection("1", 1);
  for (const char *call : {"QLIBCFileEnumSection", "QLIBCSzListAlloc", "QLIBCSzHashAlloc"}) {
    fail(call, "", {.code = kInjectedCode});
    ZELO_SCHED_TASK *head = nullptr;
    EXPECT_EQ(backend_.list_get(&head, nullptr), -1) << call;
    EXPECT_EQ(head, nullptr);
    EXPECT_EQ(logged(), Lines{});
    EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
  }
}

// ---- one task

TEST_F(StoreTest, AStoredTaskIsFoundByItsId) {
  setClock("2013-05-07 08:30");
  create("first");
  const Task task = find(create("second"));
  EXPECT_STREQ(task->Name, "second");
  EXPECT_STREQ(task->Command, "true");
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_ENABLED);
  EXPECT_EQ(task->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_STREQ(task->NextTriggerTime, "2013-05-08 00:00");
}

TEST_F(StoreTest, AnIdWithoutASectionIsNotFound) {
  create("task");
  for (const long id : {0L, 2L, -1L, -1000000L, LONG_MAX}) {
    const Task task = makeTask("", "");
    EXPECT_EQ(backend_.get_by_id(id, task.get()), 0) << id;
    EXPECT_EQ(task->State, ZELO_SCHED_STATE_NOT_EXISTED);
    EXPECT_EQ(task->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(StoreTest, ATaskThatCannotBeReadIsReported) {
  create("task");
  const Task task = makeTask("", "");
  fail("QLIBCFileGetSection", "1", {.code = kInjectedCode});
  EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  EXPECT_EQ(logged(),
            Lines{backendLine("Get section [1] from [/tmp/scheduled_tasks] failed. " + kInjected)});
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_NOT_EXISTED);

  fail("QLIBCSzHashGetValue", "run hour", {.code = kInjectedCode});
  EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_convert.cpp:N Get hash value failed. key:[run hour]. " + kInjected,
                   backendLine("Init task from hash failed. " + kInjected)}));

  fail("localtime", "", {.error = EOVERFLOW});
  EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  EXPECT_EQ(logged().back(), backendLine("Failed to obtain next trigger time. id:[1]. [0x2A00 "
                                         "sched_util.cpp:N]"));

  fail("QLIBCSzHashAlloc", "", {.code = kInjectedCode});
  EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
}

// ---- "/tmp" is everybody's

// The persistent copy is written as a whole, so nothing is read or changed before its tasks are put
// back.
TEST_F(StoreTest, AStoreThatSomebodyElsePlantedIsMovedAwayAndNotRead) {
  REQUIRE_OTHER_USERS();
  create("own");
  const std::string store = readFile(kStore);
  for (const auto &[name, operation] : all()) {
    SCOPED_TRACE(name);
    writeFile(kStore, store);
    ASSERT_EQ(chown(kStore, 65534, 65534), 0);
    for (int i = 0; i < 2; ++i) {
      QLIBCErrSetEx(0, "", 0);
      EXPECT_EQ(operation(), -1);
      EXPECT_EQ(errorRecord().code, 0x0B00);
      EXPECT_EQ(readFile(kStore), "");
    }
    const std::string moved = movedAway(kStore);
    EXPECT_EQ(readFile(moved), store);
    std::filesystem::remove_all(std::filesystem::path(moved).parent_path());
  }
  EXPECT_EQ(readFile(kPersistentStore), store);
}

TEST_F(StoreTest, AStoreThatCannotBeMovedAwayIsNotRead) {
  create("own");
  ASSERT_EQ(chmod(kStore, 0666), 0);
  failCall("mkdtemp", {.times = kAlways, .error = ENOSPC});
  expectEachFails(0x0900);
  clearLog();
  EXPECT_EQ(backend_.get_by_id(1, makeTask("", "").get()), -1);
  EXPECT_EQ(logged(), Lines{backendLine("Get section [1] from [/tmp/scheduled_tasks] failed. "
                                        "[0x0900 backend_zeloschedule.cpp:N]")});
}

TEST_F(StoreTest, AFirstTaskTakesThePlaceOfAStoreOfSomebodyElse) {
  REQUIRE_OTHER_USERS();
  writeFile(kStore, "[1]\nid=\"1\"\n");
  ASSERT_EQ(chown(kStore, 65534, 65534), 0);
  EXPECT_EQ(edit(1, "first"), 0);
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_NE(movedAway(kStore), "");
}

TEST_F(StoreTest, AStoreThatOthersCanWriteIsNotRead) {
  create("own");
  ASSERT_EQ(chmod(kStore, 0666), 0);
  expectEachFails(0x0B00);
  EXPECT_EQ(readFile(kStore), "");
}

// A forced copy onto a directory would copy into it, through whatever link lies there.
TEST_F(StoreTest, ADirectoryUnderTheScratchNameIsMovedAway) {
  create("own");
  writeFile(kVictim, "untouched");
  std::filesystem::create_directory(scratchPath());
  std::filesystem::create_symlink(kVictim, scratchPath() + "/scheduled_tasks");
  EXPECT_EQ(create("new"), 2);
  EXPECT_EQ(readFile(kVictim), "untouched");
  const std::string away = movedAway(scratchPath());
  EXPECT_TRUE(std::filesystem::is_symlink(away + "/scheduled_tasks"));
  EXPECT_EQ(logged(), Lines{"sched_shared_names.cpp:N " + scratchPath() +
                            " is no regular file: it is now " + away});
}

TEST_F(StoreTest, AnEmptyDirectoryUnderTheScratchNameIsRemoved) {
  std::filesystem::create_directory(scratchPath());
  create("new");
  EXPECT_EQ(movedAway(scratchPath()), "");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(StoreTest, AScratchNameThatCannotBeHadMakesTheChangeFail) {
  create("own");
  const std::string store = readFile(kStore);
  for (const char *call : {"mkdtemp", "renameat2"}) {
    SCOPED_TRACE(call);
    std::filesystem::create_directory(scratchPath());
    resetFailingCalls();
    failCall(call, {.error = EIO});
    EXPECT_EQ(backend_.create(makeTask("new", "").get()), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0900, "backend_zeloschedule.cpp"}));
    EXPECT_EQ(recordedExecs(), Lines{});
    EXPECT_EQ(readFile(kStore), store);
    std::filesystem::remove_all(scratchPath());
  }
}

// What is left when a copy was killed right after it had emptied its target.
// What is left when a copy was killed right after it had emptied its target.
TEST_F(StoreTest, NothingIsBuiltOnAStoreWithoutBytesBesideAPersistentCopyThatHasSome) {
  create("first");
  const std::string whole = readFile(kPersistentStore);
  writeFile(kStore, "");
  expectEachFails(0x0B00);
  EXPECT_EQ(readFile(kPersistentStore), whole);
}

// The power went before the persistent copy was filled again; the last good one has every task.
TEST_F(StoreTest, NothingIsBuiltOnAStoreWithoutBytesBesideAPersistentCopyThatWasCutToNothing) {
  create("first");
  const std::string whole = readFile(kLastGoodStore);
  writeFile(kPersistentStore, "");
  writeFile(kStore, "");
  expectEachFails(0x0B00);
  EXPECT_EQ(readFile(kLastGoodStore), whole);
}

TEST_F(StoreTest, AChangeWaitsForItsTurnAndChangesNothingWithoutIt) {
  create("first");
  const int file = open("/run/zeloscheduler.lock", O_RDWR);
  ASSERT_EQ(flock(file, LOCK_EX), 0);
  clearSleeps();
  onSleep([&](size_t sleeps) {
    if (sleeps == 3) flock(file, LOCK_UN);
  });
  create("second");
  EXPECT_EQ(recordedSleeps().size(), 3U);
  onSleep({});
  ASSERT_EQ(flock(file, LOCK_EX), 0);
  const std::string store = readFile(kStore);
  const std::string crontab = readFile(kCrontab);
  for (const auto &[name, change] : changes()) {
    SCOPED_TRACE(name);
    clearSleeps();
    clearLog();
    resetFailingCalls();
    EXPECT_EQ(change(), -1);
    EXPECT_EQ(recordedSleeps(), std::vector<long>(6000, 5000));
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0400, "sched_store_lock.cpp"}));
    EXPECT_EQ(logged(), Lines{"sched_store_lock.cpp:N Lock [/run/zeloscheduler.lock] failed. "
                              "Process " +
                              std::to_string(getpid()) + " holds it."});
    EXPECT_EQ(recordedExecs(), Lines{});
  }
  close(file);
  EXPECT_EQ(readFile(kStore), store);
  EXPECT_EQ(readFile(kPersistentStore), store);
  EXPECT_EQ(readFile(kCrontab), crontab);
  EXPECT_EQ(create("third"), 3);
}

TEST_F(StoreTest, AChangeWithoutItsLockFileChangesNothing) {
  create("first");
  for (const char *call : {"open", "flock"}) {
    SCOPED_TRACE(call);
    failCall(call, {.error = EACCES});
    clearLog();
    EXPECT_EQ(backend_.create(makeTask("second", "true").get()), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0400, "sched_store_lock.cpp"}));
    EXPECT_EQ(logged(), Lines{"sched_store_lock.cpp:N Lock [/run/zeloscheduler.lock] failed. "
                              "Permission denied"});
    EXPECT_EQ(listedIds(), Ids{1});
  }
}

// Another process would lock the file that is there by then.
TEST_F(StoreTest, ALockFileThatWasReplacedMeanwhileIsLockedAnew) {
  constexpr char kLock[] = "/run/zeloscheduler.lock";
  create("first");
  const int file = open(kLock, O_RDWR);
  ASSERT_EQ(flock(file, LOCK_EX), 0);
  int other = -1;
  onSleep([&](size_t sleeps) {
    if (sleeps == 1) {
      std::filesystem::remove(kLock);
      other = open(kLock, O_RDWR | O_CREAT, 0600);
      EXPECT_EQ(flock(other, LOCK_EX), 0);
      close(file);
    } else if (sleeps == 3) {
      close(other);
    }
  });
  clearSleeps();
  create("second");
  EXPECT_GE(recordedSleeps().size(), 3U);
  onSleep({});
}

// ---- ids

TEST_F(StoreTest, ANewTaskGetsTheSmallestFreeId) {
  const std::pair<std::vector<int32_t>, long> cases[] = {
      {{}, 1},
      {{1}, 2},
      {{2}, 1},
      {{1, 2, 4}, 3},
      {{2, 3}, 1},
      {{1, 2, 3}, 4},
      {{1, 1, 2}, 3},
      {{1, 1, 3}, 2},
      {{4, 2, 1}, 3},
      {{10, 1, 5}, 2},
      {{0}, 1},
      {{0, 2}, 1},
      {{0, 1}, 2},
      {{-1}, 1},
      {{-5, 3}, 1},
      {{-3, -2, 1}, 2},
      {{1, 2147483646}, 2},
      {{2147483647}, 1},
  };
  for (const auto &[taken, wanted] : cases) {
    SCOPED_TRACE(testing::PrintToString(taken));
    cleanWorld();
    int section = 100;
    for (const int32_t id : taken) addSection(std::to_string(section++), id);
    EXPECT_EQ(create("task"), wanted);
  }
}

TEST_F(StoreTest, TheIdOfASectionThatCannotBeConvertedIsGivenAgainAndItsSectionReplaced) {
  writeFile(kStore, "[1]\nid=\"1\"\n[2]\nid=\"2\"\n");
  clearLog();
  EXPECT_EQ(create("task"), 1);
  EXPECT_STREQ(find(1)->Name, "task");
  EXPECT_NE(readFile(kStore).find("[2]\nid=\"2\"\n"), std::string::npos);
}

TEST_F(StoreTest, IdsThatCannotBeAllocatedAreReported) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer allocates itself";
  constexpr int kTasks = 3;
  for (int i = 1; i <= kTasks; ++i) addSection(std::to_string(i), i);
  const std::string wanted = backendLine("Alloc id slot failed. num:[3] [0x0000 :N]");
  // Whichever allocation it is: exactly one of the first has this effect.
  constexpr unsigned kMostAllocations = 20;
  int found = 0;
  for (unsigned nth = 1; nth <= kMostAllocations; ++nth) {
    clearLog();
    QLIBCErrSetEx(0, "", 0);
    const Task task = makeTask("task", "true");
    int result = 0;
    {
      const FailingAllocation scope("calloc", {.from = nth, .minSize = kTasks * sizeof(long)});
      result = backend_.create(task.get());
    }
    if (logged() == Lines{wanted}) {
      EXPECT_EQ(result, -1);
      EXPECT_EQ(task->ID, kNew);
      ++found;
    } else if (result == 0) {
      EXPECT_EQ(backend_.remove(task->ID), 1);
    }
  }
  EXPECT_EQ(found, 1);
}

// ---- creating, editing, removing

TEST_F(StoreTest, ANewTaskWithoutANameIsNamedAfterItsId) {
  const Task first = makeTask("", "true");
  EXPECT_EQ(backend_.create(first.get()), 0);
  EXPECT_EQ(first->ID, 1);
  EXPECT_STREQ(first->Name, "Task 1");
  const Task second = makeTask("", "true");
  EXPECT_EQ(backend_.create(second.get()), 0);
  EXPECT_STREQ(second->Name, "Task 2");
  EXPECT_STREQ(find(2)->Name, "Task 2");
}

TEST_F(StoreTest, CreateGivesAnIdWhateverTheRecordHad) {
  const Task task = makeTask("task", "true");
  task->ID = 42;
  EXPECT_EQ(backend_.create(task.get()), 0);
  EXPECT_EQ(task->ID, 1);
  EXPECT_EQ(listedIds(), Ids{1});
}

TEST_F(StoreTest, EveryWriteCopiesTheStoreAwayAndBothCopiesBackInOrder) {
  create("task");
  for (const auto &[name, change] : changes()) {
    if (name == std::string("sync")) continue;
    SCOPED_TRACE(name);
    resetFailingCalls();
    EXPECT_GE(change(), 0);
    EXPECT_EQ(recordedExecs(), (Lines{copyCommand(kStore, scratchPath()),
                                      copyCommand(scratchPath(), kPersistentStore),
                                      copyCommand(scratchPath(), kStore)}));
  }
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
  EXPECT_EQ(listedIds(), Ids{2});
}

TEST_F(StoreTest, EditReplacesTheSection) {
  create("first");
  const long id = create("second");
  EXPECT_EQ(edit(id, "edited", "false"), 0);
  EXPECT_STREQ(find(id)->Name, "edited");
  EXPECT_STREQ(find(id)->Command, "false");
  EXPECT_EQ(listedIds(), (Ids{2, 1}));
}

TEST_F(StoreTest, EditOfAnIdWithoutASectionAddsIt) {
  create("first");
  EXPECT_EQ(edit(7, "added"), 0);
  EXPECT_EQ(listedIds(), (Ids{7, 1}));
}

TEST_F(StoreTest, EditWithAnEmptyNameKeepsItEmpty) {
  const long id = create("first");
  EXPECT_EQ(edit(id, ""), 0);
  EXPECT_STREQ(find(id)->Name, "");
}

TEST_F(StoreTest, RemoveDeletesTheSectionAndItsCrontabLine) {
  create("first");
  create("second");
  EXPECT_EQ(backend_.remove(1), 1);
  EXPECT_EQ(listedIds(), Ids{2});
  EXPECT_EQ(crontabLines(), Lines{"0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=2"});
}

TEST_F(StoreTest, RemoveOfAnIdWithoutASectionCopiesAndSynchronisesNothing) {
  create("first");
  writeFile(kCrontab, kPlainCrontab);
  const std::string before = readFile(kStore);
  resetFailingCalls();
  EXPECT_EQ(backend_.remove(7), 0);
  EXPECT_EQ(recordedExecs(), Lines{copyCommand(kStore, scratchPath())});
  EXPECT_EQ(readFile(kStore), before);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(StoreTest, CreateEditAndRemoveSynchroniseTheCrontab) {
  const long id = create("task");
  EXPECT_EQ(crontabLines(), Lines{"0\t0\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=1"});
  const Task task = makeTask("task", "true");
  task->ID = static_cast<int32_t>(id);
  task->RunHour = 5;
  EXPECT_EQ(backend_.edit(task.get()), 0);
  EXPECT_EQ(crontabLines(), Lines{"0\t5\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=1"});
  EXPECT_EQ(backend_.remove(id), 1);
  EXPECT_EQ(crontabLines(), Lines{});
}

TEST_F(StoreTest, OtherSectionsAndCommentsSurviveAWrite) {
  writeFile(kStore, "# mine\n[9]\nid=\"9\"\nunknown key=\"kept\"\n");
  create("task");
  const std::string store = readFile(kStore);
  EXPECT_NE(store.find("# mine\n[9]\nid=\"9\"\nunknown key=\"kept\"\n"), std::string::npos)
      << store;
}

// ---- a write that fails

// A step of a change that fails, and what is told of it before "set task failed."
struct FailedStep {
  const char *change;
  const char *call;
  std::string key;
  Lines told;
  int result = 1;  // of a copy
};

// Task 1 is in the store, task 2 is not.
TEST_F(StoreTest, AStepThatFailsEndsTheChangeAndIsReportedAndLeavesTheStoreAsItWas) {
  const std::string scratch = scratchPath();
  const Lines copies = {copyCommand(kStore, scratch), copyCommand(scratch, kPersistentStore),
                        copyCommand(scratch, kStore)};
  const Lines copiesFailed = {copyFailed(kStore, scratch), copyFailed(scratch, kPersistentStore),
                              copyFailed(scratch, kStore)};
  const std::string inScratch = "[" + scratch + "] failed. " + kInjected;
  const std::vector<FailedStep> steps = {
      {"create", "QLIBCFileAddSection", "2", {backendLine("Add section [2] to " + inScratch)}},
      {"edit", "QLIBCExec", copies[0], {copiesFailed[0]}},
      {"edit", "QLIBCExec", copies[0], {copiesFailed[0]}, -1},  // without a program to copy with
      {"edit", "QLIBCSzHashAlloc", "", {backendLine("QLIBCSzHashAlloc failed." + kInjected)}},
      {"edit",
       "QLIBCSzHashSetValue",
       "run hour",
       {"sched_task_convert.cpp:N Set hash value failed. key:[run hour], val:[0]. " + kInjected,
        backendLine("Init hash from task failed. " + kInjected)}},
      {"edit", "QLIBCFileSetSection", "1", {backendLine("Save section [1] to " + inScratch)}},
      {"edit", "QLIBCExec", copies[1], {copiesFailed[1]}},
      {"edit", "QLIBCExec", copies[2], {copiesFailed[2]}},
      {"remove",
       "QLIBCFileRemoveSection",
       "1",
       {backendLine("QLIBCFileRemoveSection [1] from [" + scratch + "] failed." + kInjected)}},
      {"remove", "QLIBCExec", copies[0], {copiesFailed[0]}},
      {"remove", "QLIBCExec", copies[1], {copiesFailed[1]}},
      {"remove", "QLIBCExec", copies[2], {copiesFailed[2]}},
  };
  create("task");
  const std::string before = readFile(kStore);
  for (const FailedStep &step : steps) {
    SCOPED_TRACE(std::string(step.change) + ": " + step.call + " " + step.key);
    const Operations each = changes();
    const auto change = std::find_if(each.begin(), each.end(), [&](const auto &one) {
      return one.first == std::string(step.change);
    });
    const std::string id = step.change == std::string("create") ? "2" : "1";
    const bool isCopy = step.call == std::string("QLIBCExec");
    writeFile(kCrontab, kPlainCrontab);
    fail(step.call, step.key,
         isCopy ? FailPlan{.result = step.result, .code = kInjectedCode}
                : FailPlan{.code = kInjectedCode});
    EXPECT_EQ(change->second(), -1);
    Lines told = step.told;
    told.push_back(backendLine("set task failed. [" + id + "] " + kInjected));
    EXPECT_EQ(logged(), told);
    EXPECT_EQ(loggedPriorities(), std::vector<int>(told.size(), 3));
    EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
    const auto last = isCopy ? std::find(copies.begin(), copies.end(), step.key) : copies.begin();
    EXPECT_EQ(recordedExecs(), Lines(copies.begin(), last + 1));
    EXPECT_EQ(readFile(kStore), before);
    EXPECT_EQ(leftovers(), Lines{});
    EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
  }
}

TEST_F(StoreTest, AScratchFileThatCannotBeMadeIsReported) {
  const Task task = makeTask("task", "true");
  fail("QLIBCFileTouch", "", {.code = kInjectedCode});
  EXPECT_EQ(backend_.create(task.get()), -1);
  EXPECT_EQ(logged(),
            (Lines{backendLine("QLIBCFileTouch [" + scratchPath() + "] failed. " + kInjected),
                   backendLine("set task failed. [1] " + kInjected)}));
  EXPECT_FALSE(fileExists(kStore));
}

TEST_F(StoreTest, ACreateThatCannotListGivesNoId) {
  create("task");
  const Task task = makeTask("", "true");
  fail("QLIBCFileEnumSection", "", {.code = kInjectedCode});
  EXPECT_EQ(backend_.create(task.get()), -1);
  EXPECT_EQ(task->ID, kNew);
  EXPECT_STREQ(task->Name, "");
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(recordedExecs(), Lines{});
}

TEST_F(StoreTest, AFailedCreateLeavesTheRecordNew) {
  for (const std::string name : {"task", ""}) {
    cleanWorld();
    const Task task = makeTask(name, "true");
    fail("QLIBCExec", copyCommand(scratchPath(), kPersistentStore), {.result = 1});
    EXPECT_EQ(backend_.create(task.get()), -1);
    EXPECT_EQ(task->ID, kNew);
    EXPECT_EQ(task->Name, name);
    EXPECT_EQ(backend_.create(task.get()), 0);
    EXPECT_EQ(task->ID, 1);
  }
}

TEST_F(StoreTest, ASecondCopyThatFailsLeavesTheCopiesDifferentUntilTheNextWrite) {
  create("first");
  const Task task = makeTask("second", "true");
  fail("QLIBCExec", copyCommand(scratchPath(), kStore), {.result = 1});
  EXPECT_EQ(backend_.create(task.get()), -1);
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_NE(readFile(kPersistentStore).find("[2]"), std::string::npos);
  create("third");
  EXPECT_EQ(readFile(kStore), readFile(kPersistentStore));
}

TEST_F(StoreTest, ASyncThatCannotListFailsTheChangeThoughItIsStored) {
  const long id = create("task");
  const Lines wanted = {backendLine("get task list failed. " + kInjected),
                        backendLine("sync crontab failed. " + kInjected)};
  const std::string crontab = readFile(kCrontab);

  fail("QLIBCFileEnumSection", "", {.code = kInjectedCode});
  EXPECT_EQ(edit(id, "edited"), -1);
  EXPECT_EQ(logged(), wanted);
  EXPECT_STREQ(find(id)->Name, "edited");

  const Task added = makeTask("added", "true");
  fail("QLIBCFileEnumSection", "", {.from = 2, .code = kInjectedCode});
  EXPECT_EQ(backend_.create(added.get()), -1);
  EXPECT_EQ(logged(), wanted);
  EXPECT_EQ(added->ID, 2);

  fail("QLIBCFileEnumSection", "", {.code = kInjectedCode});
  EXPECT_EQ(backend_.remove(id), -1);
  EXPECT_EQ(logged(), wanted);
  EXPECT_EQ(readFile(kCrontab), crontab);
  EXPECT_EQ(listedIds(), Ids{2});
}

TEST_F(StoreTest, AScratchCopyOfAnotherSizeIsMadeAgain) {
  create("task");
  const std::string whole = readFile(kStore);
  for (const std::string &copied : {whole.substr(0, whole.size() / 2), whole + whole}) {
    resetFailingCalls();
    failCallFor("QLIBCExec", scratchPath(), {.result = 0});
    onExec([copied, isFirst = true](const std::string &) mutable {
      if (isFirst) writeFile(scratchPath(), copied);
      isFirst = false;
    });
    EXPECT_EQ(edit(1, "edited"), 0);
    onExec(nullptr);
    EXPECT_EQ(
        recordedExecs(),
        (Lines{copyCommand(kStore, scratchPath()), copyCommand(kStore, scratchPath()),
               copyCommand(scratchPath(), kPersistentStore), copyCommand(scratchPath(), kStore)}));
    EXPECT_EQ(listedIds(), Ids{1});
  }
}

TEST_F(StoreTest, AStoreThatIsFilledMeanwhileIsNotTakenForEmpty) {
  create("task");
  const std::string whole = readFile(kStore);
  writeFile(kStore, "");
  resetFailingCalls();
  onSleep([&](size_t) { writeFile(kStore, whole); });
  EXPECT_EQ(backend_.remove(7), 0);
  EXPECT_EQ(recordedExecs(), Lines(2, copyCommand(kStore, scratchPath())));
  EXPECT_EQ(listedIds(), Ids{1});
}

// ---- a store in the way

TEST_F(StoreTest, AStoreThatIsADirectoryMakesWayOrIsNotRead) {
  writeFile(std::string(kStore) + "/file", "");
  failCall("renameat2", {.times = kAlways, .error = EIO});
  const Task task = makeTask("task", "true");
  EXPECT_EQ(backend_.get_by_id(1, task.get()), -1);
  EXPECT_EQ(logged(), Lines{backendLine("Get section [1] from [/tmp/scheduled_tasks] failed. "
                                        "[0x0900 backend_zeloschedule.cpp:N]")});
  expectEachFails(0x0900);
  EXPECT_EQ(backend_.get_default(task.get()), -1);
  EXPECT_FALSE(fileExists(kPersistentStore));
  resetFailingCalls();
  EXPECT_EQ(listedIds(), Ids{});
  EXPECT_TRUE(fileExists(movedAway(kStore) + "/file"));
  EXPECT_EQ(create("first"), 1);
}

TEST_F(StoreTest, AStoreThatTheCallerMayNotReadFailsTheOperations) {
  REQUIRE_OTHER_USERS();
  create("task");
  const std::string before = readFile(kStore);
  ASSERT_EQ(chmod(kStore, 0600), 0);
  const Task task = makeTask("task", "true");
  clearLog();
  constexpr uid_t kNobody = 65534;
  ASSERT_EQ(seteuid(kNobody), 0);
  ZELO_SCHED_TASK *head = nullptr;
  const int listed = backend_.list_get(&head, nullptr);
  const int listCode = QLIBCErrGet();
  const int found = backend_.get_by_id(1, task.get());
  const Lines lines = logged();
  const int created = backend_.create(task.get());
  const int removed = backend_.remove(1);
  ASSERT_EQ(seteuid(0), 0);
  EXPECT_EQ(listed, -1);
  EXPECT_EQ(listCode, 0x0900);
  EXPECT_EQ(found, -1);
  EXPECT_EQ(lines, Lines{backendLine("Get section [1] from [/tmp/scheduled_tasks] failed. "
                                     "[0x0900 section_file.cpp:N]")});
  EXPECT_EQ(created, -1);
  EXPECT_EQ(removed, -1);
  EXPECT_EQ(readFile(kStore), before);
}

TEST_F(StoreTest, NobodyBuildsOnAStoreThatIsCutOff) {
  create("first");
  create("second");
  const std::string whole = readFile(kStore);
  const std::string cutOff = whole.substr(0, whole.size() / 2);
  writeFile(kStore, cutOff);
  for (const auto &[name, operation] : all()) {
    SCOPED_TRACE(name);
    QLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(operation(), -1);
    EXPECT_EQ(errorRecord().code, 0x0B00);
  }
  EXPECT_EQ(readFile(kStore), cutOff);
  EXPECT_EQ(readFile(kPersistentStore), whole);
}

TEST_F(StoreTest, ALinkPlantedUnderTheScratchNameIsNotWrittenThrough) {
  ASSERT_EQ(symlink(kVictim.c_str(), scratchPath().c_str()), 0);
  EXPECT_EQ(create("first"), 1);
  EXPECT_FALSE(fileExists(kVictim));
  writeFile(kVictim, "untouched");
  ASSERT_EQ(symlink(kVictim.c_str(), scratchPath().c_str()), 0);
  EXPECT_EQ(create("second"), 2);
  ASSERT_EQ(link(kVictim.c_str(), scratchPath().c_str()), 0);
  EXPECT_EQ(create("third"), 3);
  EXPECT_EQ(readFile(kVictim), "untouched");
  EXPECT_EQ(listedIds(), (Ids{3, 2, 1}));
}

TEST_F(StoreTest, AFilePlantedUnderTheScratchNameIsNotTakenOver) {
  writeFile(scratchPath(), "[9]\nid=\"9\"\ncmd=\"planted\"\n");
  EXPECT_EQ(create("first"), 1);
  EXPECT_EQ(readFile(kStore).find("planted"), std::string::npos);
  writeFile(scratchPath(), "[9]\nid=\"9\"\ncmd=\"planted\"\n", 0666);
  EXPECT_EQ(create("second"), 2);
  EXPECT_EQ(readFile(kStore).find("planted"), std::string::npos);
}

TEST_F(StoreTest, ALinkPlantedWhileTheFirstStoreIsPublishedIsNotWrittenThrough) {
  REQUIRE_OTHER_USERS();
  writeFile(kVictim, "untouched");
  onExec([](const std::string &line) {
    if (line.ends_with(kPersistentStore)) {
      ASSERT_EQ(symlink(kVictim.c_str(), kStore), 0);
      ASSERT_EQ(lchown(kStore, 65534, 65534), 0);
    }
  });
  EXPECT_EQ(create("first"), 1);
  EXPECT_EQ(listedIds(), Ids{1});
  EXPECT_TRUE(std::filesystem::is_symlink(movedAway(kStore)));
  EXPECT_EQ(readFile(kVictim), "untouched");
  EXPECT_NE(readFile(kPersistentStore).find("first"), std::string::npos);
}

// ---- what is acknowledged is on the disk

TEST_F(StoreTest, TheNewTextStandsSyncedBesideThePersistentCopyBeforeThatIsTouched) {
  create("first");
  std::string lastGood;
  std::string before;
  onExec([&](const std::string &line) {
    if (!line.ends_with(kPersistentStore)) return;
    lastGood = readFile(kLastGoodStore);
    before = readFile(kPersistentStore);
  });
  create("second");
  onExec({});
  EXPECT_EQ(lastGood, readFile(kPersistentStore));
  EXPECT_NE(lastGood, before);
  struct stat info = {};
  EXPECT_EQ(lstat(kLastGoodStore, &info), 0);
  EXPECT_EQ(info.st_mode, static_cast<mode_t>(S_IFREG | 0644));
}

TEST_F(StoreTest, AStepThatFailsOnTheWayToTheDiskFailsTheChange) {
  create("first");
  const std::string store = readFile(kStore);
  const std::string failed =
      "Copy sched conf failed. [" + scratchPath() + "] -> [" + kPersistentStore + "] ";
  // The last good copy, its directory, the persistent copy, its directory.
  for (unsigned from = 1; from <= 4; ++from) {
    SCOPED_TRACE(from);
    clearLog();
    failCall("fsync", {.from = from, .error = EIO});
    EXPECT_EQ(backend_.create(makeTask("second", "true").get()), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0B00, "backend_zeloschedule.cpp"}));
    EXPECT_EQ(logged(), (Lines{backendLine(failed + "[0x0B00 backend_zeloschedule.cpp:N]"),
                               backendLine("set task failed. [2] "
                                           "[0x0B00 backend_zeloschedule.cpp:N]")}));
    EXPECT_EQ(readFile(kStore), store);
  }
  resetFailingCalls();
  const std::pair<const char *, int> steps[] = {
      {"mkostemp", 0x0900}, {"fdopen", 0x0900}, {"fflush", 0x0B00},
      {"fchown", 0x0B00},   {"fclose", 0x0B00}, {"rename", 0x2800},
  };
  for (const auto &[call, code] : steps) {
    SCOPED_TRACE(call);
    const std::string persistent = readFile(kPersistentStore);
    failCallFor(
        call,
        call == std::string("rename") || call == std::string("mkostemp") ? kLastGoodStore : "",
        {.error = EIO});
    EXPECT_EQ(backend_.create(makeTask("second", "true").get()), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{code, "backend_zeloschedule.cpp"}));
    EXPECT_EQ(readFile(kPersistentStore), persistent);
    EXPECT_EQ(readFile(kStore), store);
    resetFailingCalls();
  }
  EXPECT_EQ(create("second"), 2);
}

// By another process's copy that is killed.
TEST_F(StoreTest, AStoreThatIsEmptiedWhileItIsTakenIsNotBuiltOn) {
  create("first");
  const std::string persistent = readFile(kPersistentStore);
  onExec([](const std::string &line) {
    if (line.ends_with(scratchPath())) std::filesystem::resize_file(kStore, 0);
  });
  EXPECT_EQ(backend_.create(makeTask("second", "true").get()), -1);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0B00, "backend_zeloschedule.cpp"}));
  EXPECT_EQ(readFile(kPersistentStore), persistent);
}

// ---- the default task

TEST_F(StoreTest, TheDefaultTaskHasEveryFieldSet) {
  Task task = makeTask("other", "other");
  memset(task.get(), 0x55, sizeof(*task));
  ASSERT_EQ(backend_.get_default(task.get()), 0);
  EXPECT_EQ(task->ID, -1);
  EXPECT_STREQ(task->Name, "Task 1");
  for (const int32_t flag :
       {task->CanEditOwner, task->CanEditName, task->Listable, task->CanRunFromUI,
        task->CanDeleteFromUI, task->CanEditFromUI, task->CanRunAppSameTime}) {
    EXPECT_EQ(flag, 1);
  }
  EXPECT_EQ(task->CanRunTaskSameTime, 0);
  EXPECT_EQ(task->SimpleEditForm, 0);
  for (const uint32_t number :
       {task->Owner, task->StartYear, task->StartMonth, task->StartDay, task->RunHour, task->RunMin,
        task->RepeatHour, task->LastWorkHour}) {
    EXPECT_EQ(number, 0U);
  }
  EXPECT_STREQ(task->EditForm, "");
  EXPECT_STREQ(task->EditDialog, "ZELO.TOV.TaskScheduler.EditDialog");
  for (const char *text : {task->App, task->AppName, task->AppArgs, task->Action, task->Command}) {
    EXPECT_STREQ(text, "");
  }
  EXPECT_STREQ(task->Week, "1111111");
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_ENABLED);
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_DAILY);
  EXPECT_STREQ(task->NextTriggerTime, "");
}

// What was copied from under another process's copy would lose the other tasks.
TEST_F(StoreTest, ACopyThatIsNotAsLongAsTheStoreIsTakenAgain) {
  create("first");
  create("second");
  resetFailingCalls();
  failCallFor("QLIBCExec", std::string(kStore) + " " + scratchPath(), {.result = 0});
  create("third");
  Ids ids = listedIds();
  std::sort(ids.begin(), ids.end());
  EXPECT_EQ(ids, (Ids{1, 2, 3}));
  const Lines execs = recordedExecs();
  EXPECT_EQ(std::count(execs.begin(), execs.end(), copyCommand(kStore, scratchPath())), 2);
}

TEST_F(StoreTest, TheDefaultTaskIsNamedAfterTheNextFreeIdAndStaysNew) {
  create("first");
  addSection("3", 3);
  const Task task = makeTask("", "");
  EXPECT_EQ(backend_.get_default(task.get()), 0);
  EXPECT_STREQ(task->Name, "Task 2");
  EXPECT_EQ(task->ID, kNew);
}

TEST_F(StoreTest, ADefaultTaskThatCannotBeMadeIsReported) {
  create("first");
  struct Step {
    const char *call;
    std::string key;
    std::string told;
  };
  std::vector<Step> steps = {
      {"QLIBCSzHashAlloc", "", "Alloc hash failed. "},
      {"QLIBCFileEnumSection", "", "Get next id failed. "},
      {"QLIBCSzHashSetValue", "name", "Set hash value failed. key:[name], val:[Task 2]. "},
      {"QLIBCSzHashSetValue", "type", "Set hash value failed. key:[type], val:[daily]. "},
  };
  for (const char *key :
       {"id", "run hour", "run min", "name", "app", "app name", "action", "cmd", "state", "type"}) {
    steps.push_back(
        {"QLIBCSzHashGetValue", key, "Get hash value failed. key:[" + std::string(key) + "]. "});
  }
  steps.push_back({"ZELOEncodingBase64Decode", "", "Base64 decoding failed. [] "});
  for (const Step &step : steps) {
    SCOPED_TRACE(step.told);
    // With a task in the store, whoever reads that would be the first to ask for the key.
    if (step.call == std::string("QLIBCSzHashGetValue")) std::filesystem::remove(kStore);
    fail(step.call, step.key, {.code = kInjectedCode});
    EXPECT_EQ(backend_.get_default(makeTask("", "").get()), -1);
    EXPECT_EQ(logged(), Lines{backendLine(step.told + kInjected)});
    EXPECT_EQ(errorRecord(), (ErrorRecord{kInjectedCode, kInjectedFile}));
  }
}

// ---- running

class StoreRunTest : public StoreTest {
 protected:
  using Run = std::pair<int, std::string>;  // code and comment

  Run run(const std::string &command) const {
    const Task task = makeTask("task", command);
    int code = -1;
    char comment[1024];
    memset(comment, 'x', sizeof(comment));
    comment[sizeof(comment) - 1] = '\0';
    EXPECT_EQ(backend_.run(task.get(), &code, comment, sizeof(comment)), 0);
    return {code, comment};
  }
};

TEST_F(StoreRunTest, TheShellsWaitStatusBecomesCodeAndComment) {
  struct {
    int waitStatus;
    int code;
    const char *comment;
  } cases[] = {
      {0, 3, ""},         {-1, 4, ""},         {1, 6, "1"},       {9, 6, "9"},
      {15, 6, "15"},      {126, 6, "126"},     {127, 7, "0"},     {0x80, 7, "0"},
      {0x8B, 6, "11"},    {0xFF, 7, "0"},      {0x0100, 7, "1"},  {0x2A00, 7, "42"},
      {0x7F00, 7, "127"}, {0xFF00, 7, "255"},  {0x137F, 7, "19"}, {0x0109, 6, "9"},
      {0x10000, 7, "0"},  {0x1FF00, 7, "255"},
  };
  for (const auto &each : cases) {
    SCOPED_TRACE(each.waitStatus);
    resetFailingCalls();
    failCall("system", {.result = each.waitStatus});
    EXPECT_EQ(run("a command"), (Run{each.code, each.comment}));
    EXPECT_EQ(recordedSystemCommands(), Lines{"a command"});
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(StoreRunTest, RealCommandsEndAsTheySay) {
  EXPECT_EQ(run("exit 0"), (Run{3, ""}));
  EXPECT_EQ(run("exit 255"), (Run{7, "255"}));
  EXPECT_EQ(run("kill -9 $$"), (Run{6, "9"}));
  EXPECT_EQ(run(""), (Run{3, ""}));
  EXPECT_EQ(run("/nonexistent 2> /dev/null"), (Run{7, "127"}));
}

TEST_F(StoreRunTest, TheCommentTakesFourBytesWhateverCapacityIsGiven) {
  const Task task = makeTask("task", "exit 255");
  for (const size_t capacity : {size_t{1}, size_t{2}, size_t{4}, size_t{1024}}) {
    SCOPED_TRACE(capacity);
    char comment[] = "xxxxxxx";
    int code = 0;
    EXPECT_EQ(backend_.run(task.get(), &code, comment, capacity), 0);
    EXPECT_EQ(std::string(comment, sizeof(comment)), std::string("255\0xxx\0", sizeof(comment)));
  }
}

}  // namespace
}  // namespace support
