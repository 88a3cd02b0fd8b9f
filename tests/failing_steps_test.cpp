// Each call that a function of the library makes fails, one after the other: once, and from then
// on. Whatever fails, the function returns success or its failure value, acknowledged changes are
// stored, the store and the crontab are whole (the old or the new), no temporary file is left, and
// no memory leaks.
//
// Prints for each function how many points it can fail at.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <set>

#include "captured_log.h"
#include "expected_leak.h"
#include "failing_calls.h"
#include "plugins.h"
#include "power.h"
#include "power_calls.h"
#include "sandbox_fixture.h"
#include "soak.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"
#include "zelosched.h"

namespace support {
namespace {

constexpr int kTasks = 3;

// ---- the files, before and after

using Files = std::map<std::string, std::string>;

const char *const kKept[] = {kStore, kPersistentStore, kPowerSchedule, kCrontab, kWakeAlarm};
// These change atomically. So does the crontab, but it may be changed several times, and lacks the
// line of a task that could not be read; the alarm is off while it is set.
const char *const kAtOneStroke[] = {kStore, kPersistentStore, kPowerSchedule};

Files keptFiles() {
  Files files;
  for (const char *path : kKept) {
    if (fileExists(path)) files[path] = readFile(path);
  }
  return files;
}

void putBack(const Files &files) {
  for (const char *path : kKept) {
    const auto found = files.find(path);
    if (found == files.end()) {
      std::filesystem::remove(path);
    } else if (readFile(path) != found->second) {
      writeFile(path, found->second);
    }
  }
}

std::set<std::string> namesIn(const char *directory) {
  std::set<std::string> names;
  for (const auto &entry : std::filesystem::directory_iterator(directory)) {
    names.insert(entry.path());
  }
  return names;
}

std::set<std::string> temporaryFiles() {
  std::set<std::string> found;
  for (const char *directory : {"/tmp", "/etc", "/usr/zelo/etc"}) {
    for (const std::string &name : namesIn(directory)) {
      const bool isKept = std::find(std::begin(kKept), std::end(kKept), name) != std::end(kKept);
      if (!isKept && !name.starts_with(kStatusDatabase)) found.insert(name);
    }
  }
  return found;
}

// ---- what is called

// A database whose table cannot be made stays open: the interface says so.
enum class Memory { kGivenBack, kLost };

enum class Plugins { kNone, kOne };

struct Scenario {
  const char *name;
  std::function<long()> act;  // what the function answers
  std::set<long> good;
  std::set<long> bad;
  Memory memory = Memory::kGivenBack;
  Plugins plugins = Plugins::kNone;
};

std::ostream &operator<<(std::ostream &out, const Scenario &scenario) {
  return out << scenario.name;
}

long listAll(ZELO_SCHED_TASK_FILTER filter = nullptr) {
  ZELO_SCHED_TASK *head = nullptr;
  const long count = ZELOSchedTaskListGet(&head, filter);
  ZELOSchedTaskListFree(&head);
  return count;
}

// What the scenarios work on is there before any call fails.
ZELO_SCHED_TASK record;
PSZHASH hash;
char text[1 << 16];

const ZELO_SCHED_TASK &aTask(int id = -1) {
  record = {};
  record.Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  record.ID = id;
  std::strcpy(record.Name, "changed");
  std::strcpy(record.App, "app");
  std::strcpy(record.AppName, "an app");
  std::strcpy(record.Action, "an action");
  std::strcpy(record.Command, "exit 0");
  std::strcpy(record.Week, "1111111");
  record.State = ZELO_SCHED_STATE_ENABLED;
  record.Type = ZELO_SCHED_TYPE_DAILY;
  record.CanRunAppSameTime = 1;
  return record;
}

ZELO_SCHED_TASK *aPowerTask(int id = -1) {
  aTask(id);
  record.Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  std::strcpy(record.AppArgs, "poweroff");
  record.RunHour = 22;
  return &record;
}

ZELO_SCHED_TASK *edited(int id = -1) {
  aTask(id);
  return &record;
}

std::string jsonOfATask() {
  const OwnWork own;
  ZELOSchedTaskConvertToJson(edited(), text, sizeof(text));
  return text;
}

// Open before any call fails, in the scenarios that have one.
sqlite3 *database = nullptr;

long runToEnd(long id, int onlyWhenDue = 0) {
  const long result = ZELOSchedTaskRun(id, onlyWhenDue, onlyWhenDue);
  const OwnWork own;
  waitForChildRuns();
  return result;
}

long hookAction() {
  ZELO_SCHED_PLUGIN plugin = {};
  if (ZELOSchedTaskPluginInit(&plugin, "task_edit", edited(1), edited(1)) < 0) return -1;
  const int before = ZELOSchedTaskPlugin(ZELO_SCHED_PLUGIN_PRE, &plugin);
  const int after = ZELOSchedTaskPlugin(ZELO_SCHED_PLUGIN_POST, &plugin);
  const int exit = ZELOSchedTaskPluginExit(&plugin);
  return before < 0 || after < 0 || exit < 0 ? -1 : 0;
}

const Scenario kScenarios[] = {
    {"ZELOSchedBackendInit", [] { return long{ZELOSchedBackendInit()}; }, {0}, {-1}},
    {"ZELOSchedInitHashFromTask",
     [] { return long{ZELOSchedInitHashFromTask(&hash, edited(1))}; },
     {0},
     {-1}},
    {"ZELOSchedInitTaskFromHash",
     [] {
       static ZELO_SCHED_TASK filled;
       return long{ZELOSchedInitTaskFromHash(&filled, hash)};
     },
     {0},
     {-1}},
    {"ZELOSchedNextTriggerTime",
     [] { return long{ZELOSchedNextTriggerTime(edited(1))}; },
     {0},
     {-1}},
    {"ZELOSchedDateGet",
     [] {
       ZELO_SCHED_DATE date;
       return long{ZELOSchedDateGet(&date)};
     },
     {0},
     {-1}},
    {"ZELOSchedDateNormalize",
     [] {
       ZELO_SCHED_DATE date = {2026, 14, 35, 0, 0, 0};
       return long{ZELOSchedDateNormalize(&date)};
     },
     {0},
     {-1}},
    {"ZELOSchedTaskAlloc",
     [] {
       ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
       if (task == nullptr) return 0L;
       ZELOSchedTaskFree(task);
       return 1L;
     },
     {1},
     {0}},
    {"ZELOSchedTaskGetDefault", [] { return long{ZELOSchedTaskGetDefault(edited())}; }, {0}, {-1}},
    {"ZELOSchedTaskGetByID", [] { return long{ZELOSchedTaskGetByID(2, edited())}; }, {0}, {-1}},
    {"ZELOSchedTaskLoad", [] { return long{ZELOSchedTaskLoad(2, edited())}; }, {0}, {-1}},
    // A backend that cannot be listed is passed over, and so is a section.
    {"ZELOSchedTaskListGet", [] { return listAll(); }, {kTasks + 1, 0, 1, 2, 3}, {-1}},
    {"ZELOSchedTaskListSort",
     [] {
       ZELO_SCHED_TASK *head = nullptr;
       {
         const OwnWork own;
         ZELOSchedTaskListGet(&head, nullptr);
       }
       const long result = ZELOSchedTaskListSort(&head, "name", 1);
       ZELOSchedTaskListFree(&head);
       return result;
     },
     {0},
     {-1}},
    {"ZELOSchedTaskCreate", [] { return long{ZELOSchedTaskCreate(edited())}; }, {0}, {-1}},
    {"ZELOSchedTaskEdit", [] { return long{ZELOSchedTaskEdit(edited(2))}; }, {0}, {-1}},
    {"ZELOSchedTaskSave", [] { return long{ZELOSchedTaskSave(edited(3))}; }, {0}, {-1}},
    {"ZELOSchedTaskRemove", [] { return long{ZELOSchedTaskRemove(1)}; }, {0}, {-1}},
    {"ZELOSchedTaskSync", [] { return long{ZELOSchedTaskSync()}; }, {0}, {-1}},
    {"ZELOSchedTaskCreate (power)",
     [] { return long{ZELOSchedTaskCreate(aPowerTask())}; },
     {0},
     {-1}},
    {"ZELOSchedTaskEdit (power)",
     [] {
       aPowerTask(91272130);
       record.RunHour = 23;
       return long{ZELOSchedTaskEdit(&record)};
     },
     {0},
     {-1}},
    {"ZELOSchedTaskRemove (power)", [] { return long{ZELOSchedTaskRemove(91272130)}; }, {0}, {-1}},
    {"ZELOSchedTaskConvertToJson",
     [] { return long{ZELOSchedTaskConvertToJson(edited(1), text, sizeof(text))}; },
     {0},
     {-1}},
    {"ZELOSchedTaskConvertToJsonById",
     [] { return long{ZELOSchedTaskConvertToJsonById(2, text, sizeof(text))}; },
     {0},
     {-1}},
    {"ZELOSchedTaskSaveFromJson",
     [] {
       static const std::string json = jsonOfATask();
       return long{ZELOSchedTaskSaveFromJson(json.c_str(), 1)};
     },
     {kTasks + 1},
     {-1}},
    {"ZELOSchedTaskPlugin", hookAction, {0}, {-1}, Memory::kGivenBack, Plugins::kOne},
    {"ZELOSchedMultiSelectFromText",
     [] {
       static const char *const kNames[] = {"one", "two", "three"};
       const char *chosen = ZELOSchedMultiSelectFromText("three,one", kNames, 3);
       return chosen != nullptr ? 1L : 0L;
     },
     {1},
     {0}},
    {"ZELOSchedDBInit",
     [] {
       const ExpectedLeak handleLeftOpen;
       sqlite3 *opened = ZELOSchedDBInit();
       if (opened == nullptr) return 0L;
       sqlite3_close(opened);
       return 1L;
     },
     {1},
     {0},
     Memory::kLost},
    {"ZELOSchedDBAddRecord",
     [] {
       int id = 0;
       return long{ZELOSchedDBAddRecord(database, edited(1), &id)};
     },
     {0},
     {-1}},
    {"ZELOSchedDBSetStatus",
     [] { return long{ZELOSchedDBSetStatus(database, 1, 2, 3, "done")}; },
     {0},
     {-1}},
    {"ZELOSchedDBGetStatusByStatusID",
     [] {
       int code = 0;
       char comment[16];
       return long{ZELOSchedDBGetStatusByStatusID(database, 1, &code, comment, sizeof(comment))};
     },
     {1},
     {-1}},
    {"ZELOSchedDBGetStatusByTaskID",
     [] {
       long timestamp = 0;
       int code = 0;
       char comment[16];
       return long{
           ZELOSchedDBGetStatusByTaskID(database, 1, &timestamp, &code, comment, sizeof(comment))};
     },
     {1},
     {-1}},
    {"ZELOSchedDBIsTaskRunning",
     [] {
       ZELO_SCHED_STATUS status = {};
       return long{ZELOSchedDBIsTaskRunning(database, 1, &status)};
     },
     {0},
     {-1}},
    {"ZELOSchedDBIsAppRunning",
     [] {
       ZELO_SCHED_STATUS status = {};
       return long{ZELOSchedDBIsAppRunning(database, "app", &status)};
     },
     {0},
     {-1}},
    {"ZELOSchedTaskRun", [] { return runToEnd(2); }, {0}, {-1}},
    {"ZELOSchedTaskRun (of another owner)", [] { return runToEnd(kTasks); }, {0}, {-1}},
    {"ZELOSchedTaskRun (when due)", [] { return runToEnd(2, 1); }, {0}, {-1}},
    {"ZELOSchedTaskRun (power)", [] { return runToEnd(91272130); }, {0}, {-1}},
};

class FailingStepsTest : public SandboxTest, public testing::WithParamInterface<Scenario> {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    haveClock();
    if (GetParam().plugins == Plugins::kOne) installPlugin("a", "exit 0");
    std::filesystem::remove_all(kPowerSchedule);
    hash = QLIBCSzHashAlloc(64);
    for (int i = 0; i < kTasks; ++i) {
      const Task task = makeTask("task", "exit 0");
      if (i == kTasks - 1 && otherUsersExist()) task->Owner = 65534;
      saveTask(task);
    }
    ASSERT_EQ(ZELOSchedInitHashFromTask(&hash, edited(1)), 0);
    setPowerList(kOff, {{1, 127, 21, 30}});
    ASSERT_EQ(ZELOSchedTaskSync(), 0);
    std::filesystem::remove_all(kStatusDatabase);
    addStatusRow({.pid = 1, .timestamp = 5, .app = "app", .taskId = 1, .statusCode = 3});
    database = ZELOSchedDBInit();
    ASSERT_NE(database, nullptr);
    before_ = keptFiles();

    GetParam().act();  // what is made once, in a process's life or a boot's, is there now
    putBack(before_);
    temporary_ = temporaryFiles();
    const long result = GetParam().act();
    ASSERT_EQ(GetParam().good.count(result), 1U) << result;
    after_ = keptFiles();
    putBack(before_);
    ASSERT_EQ(temporaryFiles(), temporary_);
    descriptors_ = openDescriptors();
  }
  void TearDown() override {
    QLIBCSzHashFree(hash);
    sqlite3_close(database);
    std::filesystem::remove_all(kPowerSchedule);
    SandboxTest::TearDown();
  }

  // The name of the call that failed, "" when there are fewer.
  std::string step(unsigned nth, bool onwards) {
    clearLog();
    resetPowerCalls();
    QLIBCErrSetEx(0, "", 0);
    long result = 0;
    std::string failed;
    {
      const FailingStep failing(nth, onwards, error_);
      result = GetParam().act();
      failed = failing.failed();
    }
    SCOPED_TRACE(failed + " failed, call " + std::to_string(nth) + (onwards ? " and on" : ""));
    check(result, failed, onwards);
    putBack(before_);
    forgetRuns();
    return failed;
  }

  // A run that could not record its end would be checked by each later run.
  static void forgetRuns() {
    EXPECT_EQ(sqlite3_exec(database, "DELETE FROM task_status WHERE status_id>1", nullptr, nullptr,
                           nullptr),
              SQLITE_OK);
  }

  void check(long result, const std::string &failed, bool onwards) {
    const bool succeeded = GetParam().good.count(result) == 1;
    // A task that cannot be converted counts as missing, and its id is given to the next.
    const bool isGivenAway = failed == "ZELOEncodingBase64Decode";
    EXPECT_TRUE(succeeded || isGivenAway || GetParam().bad.count(result) == 1)
        << "answer " << result;
    const Files files = keptFiles();
    for (const char *path : kAtOneStroke) {
      const bool isOld = same(files, before_, path);
      const bool isNew = same(files, after_, path);
      EXPECT_TRUE(isOld || isNew || isGivenAway) << path << " is neither the old nor the new";
    }
    if (succeeded && !isGivenAway) {
      for (const char *path : {kStore, kPersistentStore}) {
        EXPECT_TRUE(same(files, after_, path)) << path << " lacks what was acknowledged";
      }
    }
    checkCrontab(failed);
    EXPECT_TRUE(changeLockIsFree());
    EXPECT_EQ(pfLock, nullptr);
    EXPECT_EQ(geteuid(), 0U);
    if (GetParam().memory == Memory::kGivenBack) {
      EXPECT_EQ(openDescriptors(), descriptors_);
    }
    if (failed == "unlink" || onwards) {
      removeTemporaryFiles();  // the library could not
    }
    EXPECT_EQ(temporaryFiles(), temporary_);
  }

  void removeTemporaryFiles() const {
    for (const std::string &name : temporaryFiles()) {
      if (temporary_.count(name) == 0) std::filesystem::remove(name);
    }
  }

  // A task that could not be read has no line, and lines of power times are changed one by one.
  void checkCrontab(const std::string &failed) const {
    const std::string crontab = readFile(kCrontab);
    EXPECT_TRUE(crontab.starts_with(kPlainCrontab));
    const std::vector<std::string> lines = crontabLines();
    for (const std::string &line : lines) {
      EXPECT_TRUE(holdsLine(before_, line) || holdsLine(after_, line)) << line;
    }
    EXPECT_GE(lines.size() + 1, std::min(linesIn(before_), linesIn(after_))) << failed;
  }

  static size_t linesIn(const Files &files) {
    return linesOf(files.at(kCrontab)).size() - linesOf(kPlainCrontab).size();
  }

  static bool changeLockIsFree() {
    const int lock = open("/run/zeloscheduler.lock", O_RDONLY | O_CLOEXEC);
    const bool isFree = lock < 0 || flock(lock, LOCK_EX | LOCK_NB) == 0;
    if (lock >= 0) close(lock);
    return isFree;
  }

  static bool holdsLine(const Files &files, const std::string &line) {
    return files.at(kCrontab).find("\n" + line + "\n") != std::string::npos;
  }

  static bool same(const Files &a, const Files &b, const char *path) {
    const auto inA = a.find(path);
    const auto inB = b.find(path);
    if (inA == a.end() || inB == b.end()) return inA == a.end() && inB == b.end();
    return inA->second == inB->second;
  }

  static std::set<int> openDescriptors() {
    constexpr int kMost = 256;
    std::set<int> open;
    for (int i = 0; i < kMost; ++i) {
      if (fcntl(i, F_GETFD) >= 0) open.insert(i);
    }
    return open;
  }

  static bool watchesMemory() {
    return kAllocationsCanFail && GetParam().memory == Memory::kGivenBack;
  }

  // Only a leak that repeats with the step counts.
  bool losesMemory(unsigned nth) {
    constexpr int kMost = 12;
    size_t used = 0;
    for (int i = 0; i < kMost; ++i) {
      step(nth, false);
      const size_t now = mallinfo2().uordblks + mallinfo2().hblkhd;
      if (i > 0 && now <= used) return false;
      used = now;
    }
    return true;
  }

  int error_ = EIO;
  Files before_;
  Files after_;
  std::set<std::string> temporary_;
  std::set<int> descriptors_;
};

unsigned stride() {
  constexpr unsigned kInShortRun = 5;
  return isShortRun() ? kInShortRun : 1;
}

TEST_P(FailingStepsTest, WhicheverCallFails) {
  unsigned points = 0;
  for (const bool onwards : {false, true}) {
    unsigned nth = 1;
    while (!step(nth, onwards).empty()) {
      if (!onwards && watchesMemory() && losesMemory(nth)) {
        ADD_FAILURE() << "memory is lost at call " << nth << ", " << step(nth, false);
      }
      if (HasFailure()) return;
      nth += stride();
    }
    points = nth - 1;
  }
  printf("%-32s %u points of failure\n", GetParam().name, points);
}

// A full disk, a spent quota and a file system that has become read-only. (The one above is the
// disk that fails.)
TEST_P(FailingStepsTest, WhicheverCallFindsNoRoom) {
  // In a short run one of them stands for all.
  const std::vector<int> errors =
      isShortRun() ? std::vector<int>{ENOSPC} : std::vector<int>{ENOSPC, EDQUOT, EROFS};
  for (const int error : errors) {
    SCOPED_TRACE(strerrorname_np(error));
    error_ = error;
    for (const bool onwards : {false, true}) {
      for (unsigned nth = 1; !step(nth, onwards).empty() && !HasFailure(); nth += stride()) {
      }
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Each, FailingStepsTest, testing::ValuesIn(kScenarios),
                         [](const testing::TestParamInfo<Scenario> &param) {
                           std::string name = param.param.name;
                           std::erase_if(name, [](char c) { return std::isalnum(c) == 0; });
                           return name;
                         });

}  // namespace
}  // namespace support
