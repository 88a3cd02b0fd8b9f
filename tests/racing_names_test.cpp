// Another user creates and removes files under the names of the library in "/tmp", in a loop, while
// root calls the library with these names free. Nothing of his is shown, run or kept, and each call
// ends. (planted_paths_test has files that stay.)
#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include "captured_log.h"
#include "failing_calls.h"
#include "run_program.h"
#include "sandbox_fixture.h"
#include "soak.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

constexpr uid_t kOther = 65534;
constexpr char kHis[] = "/tmp/his";
constexpr char kModels[] = "/usr/zelo/models";
constexpr char kHostileMark[] = "/tmp/his/ran";
constexpr char kLockFile[] = "/tmp/lock/lock_sched_run";
constexpr char kJournal[] = "/tmp/sched_status.sqlite-journal";
constexpr int kUsualCalls = 1400;
constexpr int kHisTask = 1;

std::string scratchName(pid_t pid) {
  return "/tmp/scheduled_tasks.tmp." + std::to_string(pid);
}

// ---- what he has ------------------------------------------------------------------------------

// A store with a task of his for root, and a database in which every task is running.
void makeHisStore(const std::string &path) {
  const Task task = makeTask("hostile", std::string("/bin/touch ") + kHostileMark);
  task->ID = kHisTask;
  PSZHASH hash = QLIBCSzHashAlloc(1);
  EXPECT_EQ(ZELOSchedInitHashFromTask(&hash, task.get()), 0);
  EXPECT_GE(QLIBCFileAddSection(path.c_str(), "1", hash, 0), 0);
  QLIBCSzHashFree(hash);
}

pid_t inForgedRows = 0;

void makeHisDatabase(const std::string &path) {
  inForgedRows = getpid();
  sqlite3 *db = nullptr;
  EXPECT_EQ(sqlite3_open(path.c_str(), &db), SQLITE_OK);
  const std::string rows =
      "CREATE TABLE task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, timestamp INTEGER, "
      "app STRING, task_id INTEGER, status_code INTEGER, comment STRING);"
      "INSERT INTO task_status VALUES(NULL, " +
      std::to_string(inForgedRows) + ", 1, 'forged', 1, 2, 'forged')";
  EXPECT_EQ(sqlite3_exec(db, rows.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
  sqlite3_close(db);
}

// The models of his files, and his own directory.
void makeHisThings() {
  const std::string models = std::string(kModels) + "/";
  std::filesystem::create_directories(kModels);
  makeHisStore(models + "store");
  makeHisDatabase(models + "database");
  writeFile(models + "program", std::string("#!/bin/sh\n/bin/touch ") + kHostileMark + "\n", 0755);
  std::filesystem::create_symlink(models + "store", models + "link");
  std::filesystem::create_directory(models + "directory");
  writeFile(models + "directory/lock_sched_run", "");
  std::filesystem::create_directory(kHis);
  EXPECT_EQ(chown(kHis, kOther, kOther), 0);
}

// Makes a file again that root has moved away.
void haveAgain(const std::string &kind) {
  const std::string his = std::string(kHis) + "/" + kind;
  if (fileExists(his)) return;
  if (kind == "pipe") {
    mkfifo(his.c_str(), 0666);
    return;
  }
  std::error_code ignored;
  std::filesystem::copy(
      std::string(kModels) + "/" + kind, his,
      std::filesystem::copy_options::copy_symlinks | std::filesystem::copy_options::recursive,
      ignored);
}

constexpr const char *kHisKinds[] = {"store", "database", "program", "link", "pipe", "directory"};

// Moves each of his files there and back, and then makes and removes a hard link to it.
void toggle(const std::string &name) {
  for (const char *kind : kHisKinds) {
    haveAgain(kind);
    const std::string his = std::string(kHis) + "/" + kind;
    rename(his.c_str(), name.c_str());
    rename(name.c_str(), his.c_str());
    if (link(his.c_str(), name.c_str()) == 0) unlink(name.c_str());
  }
}

// The process that does so, until the object is destroyed.
class Rival {
 public:
  explicit Rival(std::vector<std::string> names) : pid_(fork()) {
    if (pid_ != 0) return;
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (setgid(kOther) != 0 || setuid(kOther) != 0) _exit(1);
    for (;;) {
      for (const std::string &name : names) toggle(name);
    }
  }
  ~Rival() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
  }
  Rival(const Rival &) = delete;
  Rival &operator=(const Rival &) = delete;

 private:
  pid_t pid_;
};

// ---- what root does ---------------------------------------------------------------------------

std::string textOf(const std::string &path) {
  struct stat info = {};
  return lstat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode) && info.st_uid == 0
             ? readFile(path)
             : "";
}

void listTasks() {
  ZELO_SCHED_TASK *head = nullptr;
  ZELOSchedTaskListGet(&head, nullptr);
  for (ZELO_SCHED_TASK *task = head; task != nullptr; task = ZELOSchedTaskNext(task)) {
    EXPECT_STRNE(task->Name, "hostile");
  }
  ZELOSchedTaskListFree(&head);
}

void getTask() {
  const Task task = makeTask("", "");
  const bool isFound = ZELOSchedTaskGetByID(kHisTask, task.get()) == 0;
  EXPECT_FALSE(isFound && task->Name == std::string("hostile"));
}

void useDatabase() {
  const std::unique_ptr<sqlite3, int (*)(sqlite3 *)> db(ZELOSchedDBInit(), sqlite3_close);
  if (db == nullptr) return;
  ZELO_SCHED_STATUS status = {};
  ZELOSchedDBIsTaskRunning(db.get(), kHisTask, &status);
  // A genuine run of an earlier call may be recorded only now, with another process id.
  EXPECT_FALSE(status.found != 0 && status.pid == inForgedRows);
  int code = 0;
  char comment[16] = "";
  if (ZELOSchedDBGetStatusByTaskID(db.get(), kHisTask, nullptr, &code, comment, sizeof comment) >
      0) {
    EXPECT_STRNE(comment, "forged");
  }
}

int createTask() {
  const Task task = makeTask("own", "/bin/true");
  task->CanRunTaskSameTime = 0;
  return ZELOSchedTaskCreate(task.get());
}

void addRecord() {
  const std::unique_ptr<sqlite3, int (*)(sqlite3 *)> db(ZELOSchedDBInit(), sqlite3_close);
  if (db == nullptr) return;
  int id = 0;
  if (ZELOSchedDBAddRecord(db.get(), makeTask("own", "").get(), &id) == 0) {
    ZELOSchedDBSetStatus(db.get(), id, 2, 3, "own");
  }
  ZELO_SCHED_STATUS status = {};
  ZELOSchedDBIsAppRunning(db.get(), "forged", &status);
  EXPECT_EQ(status.found, 0);
}

void editTask() {
  const Task task = makeTask("own", "/bin/true");
  task->ID = kHisTask;
  ZELOSchedTaskSave(task.get());
  EXPECT_STRNE(task->Name, "hostile");
}

void loadTask() {
  const Task task = makeTask("", "");
  const bool isFound = ZELOSchedTaskLoad(kHisTask, task.get()) == 0;
  EXPECT_FALSE(isFound && task->Name == std::string("hostile"));
}

void convertTask() {
  static char text[ZELO_SCHED_JSON_SIZE_ANY];
  if (ZELOSchedTaskConvertToJsonById(kHisTask, text, sizeof text) < 0) return;
  EXPECT_EQ(std::string(text).find("hostile"), std::string::npos);
}

void saveFromJson() {
  static char text[ZELO_SCHED_JSON_SIZE_ANY];
  const Task task = makeTask("own", "/bin/true");
  EXPECT_EQ(ZELOSchedTaskConvertToJson(task.get(), text, sizeof text), 0);
  ZELOSchedTaskSaveFromJson(text, 0);
}

void createPowerTask() {
  const Task task = makeTask("", "");
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  setText(task->AppArgs, "poweroff");
  setText(task->Week, "1111111");
  ZELOSchedTaskCreate(task.get());
  ZELOSchedTaskRemove(task->ID);
}

void createAndRun() {
  if (createTask() == 0) ZELOSchedTaskRun(kHisTask, 0, 0);
  waitForChildRuns();
}

struct Call {
  const char *name;
  std::function<void()> act;
};

const Call kCalls[] = {
    {"ZELOSchedTaskListGet", listTasks},
    {"ZELOSchedTaskGetByID", getTask},
    {"ZELOSchedTaskRun", [] { EXPECT_EQ(ZELOSchedTaskRun(kHisTask, 0, 0), -1); }},
    {"ZELOSchedTaskCreate", [] { createTask(); }},
    {"ZELOSchedTaskRemove", [] { ZELOSchedTaskRemove(kHisTask); }},
    {"ZELOSchedTaskSync", [] { ZELOSchedTaskSync(); }},
    {"ZELOSchedTaskLoad", loadTask},
    {"ZELOSchedTaskSave", editTask},
    {"ZELOSchedTaskAlloc", [] { ZELOSchedTaskFree(ZELOSchedTaskAlloc()); }},
    {"ZELOSchedTaskConvertToJsonById", convertTask},
    {"ZELOSchedTaskSaveFromJson", saveFromJson},
    {"ZELOSchedTaskCreate (power)", createPowerTask},
    {"ZELOSchedDBInit", useDatabase},
    {"ZELOSchedDBAddRecord", addRecord},
    {"ZELOSchedTaskCreate and ZELOSchedTaskRun", createAndRun},
};

class RacingNamesTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    REQUIRE_OTHER_USERS();
    removeHisThings();
    makeHisThings();
  }
  void TearDown() override {
    removeHisThings();
    SandboxTest::TearDown();
  }

  static void removeHisThings() {
    for (const char *path : {kHis, kModels}) std::filesystem::remove_all(path);
  }

  static std::vector<std::string> allNames(pid_t root) {
    return {kStore,
            kTaskProgram,
            kLockDirectory,
            kLockFile,
            kStatusDatabase,
            kJournal,
            std::string(kStatusDatabase) + "-wal",
            std::string(kStatusDatabase) + "-shm",
            scratchName(root)};
  }

  // As before the first use.
  static void freeNames(const std::vector<std::string> &names) {
    std::error_code ignored;
    for (const std::string &name : names) std::filesystem::remove_all(name, ignored);
    std::filesystem::remove(kPersistentStore, ignored);
    writeFile(kCrontab, kPlainCrontab);
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
      if (entry.path().filename().string().starts_with("zeloscheduler.")) {
        std::filesystem::remove_all(entry.path(), ignored);
      }
    }
    clearLog();
  }

  // In a process of its own, whose children are the runs alone.
  static void raceOf(const std::function<void(const Call &)> &act) {
    const int calls = timesSoaked(kUsualCalls);
    const pid_t root = fork();
    if (root == 0) {
      alarm(static_cast<unsigned>(60 + calls / 20));  // a call that hangs ends it
      prctl(PR_SET_CHILD_SUBREAPER, 1);
      const std::vector<std::string> names = allNames(getpid());
      for (int i = 0; i < calls && !HasFailure(); ++i) {
        const Call &call = kCalls[static_cast<size_t>(i) % std::size(kCalls)];
        SCOPED_TRACE(call.name + std::string(", call ") + std::to_string(i));
        freeNames(names);
        act(call);
        expectNothingOfHis();
      }
      _exit(HasFailure() ? 1 : 0);
    }
    const Rival rival(allNames(root));
    int status = -1;
    EXPECT_EQ(waitpid(root, &status, 0), root);
    EXPECT_EQ(status, 0);
  }

  static void expectNothingOfHis() {
    for (const char *path : {kStore, kPersistentStore, kLastGoodStore}) {
      EXPECT_EQ(textOf(path).find("hostile"), std::string::npos) << path;
    }
    EXPECT_FALSE(fileExists(kHostileMark)) << "a command of his was run";
    if (readFile(kCrontab).find(kTaskProgram) == std::string::npos) return;
    struct stat info = {};
    EXPECT_EQ(lstat(kTaskProgram, &info), 0);
    EXPECT_EQ(info.st_uid, 0U) << "cron would start a program of his";
  }
};

TEST_F(RacingNamesTest, NothingOfHisIsShownRunOrKept) {
  raceOf([](const Call &call) { call.act(); });
}

// It takes all names.
TEST_F(RacingNamesTest, NorIsItByTheFirstCallOfAProcess) {
  raceOf([](const Call &call) {
    const pid_t caller = fork();
    if (caller == 0) {
      call.act();
      _exit(HasFailure() ? 1 : 0);
    }
    int status = -1;
    EXPECT_EQ(waitpid(caller, &status, 0), caller);
    EXPECT_EQ(status, 0);
  });
}

// He makes directories under a name as fast as he can.
TEST_F(RacingNamesTest, ARestoreWinsAgainstALoopThatMakesDirectories) {
  constexpr char kRestore[] = ZELO_BIN_DIR "/zelosched";
  if (!fileExists(kRestore)) GTEST_SKIP() << "zelosched is not part of this build";
  ASSERT_EQ(createTask(), 0);
  const std::vector<std::string> names = {kStore, kTaskProgram, kLockDirectory, kStatusDatabase,
                                          kJournal};
  for (int i = 0; i < timesSoaked(20) && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    std::error_code ignored;
    for (const std::string &name : names) std::filesystem::remove_all(name, ignored);
    const pid_t maker = fork();
    if (maker == 0) {
      prctl(PR_SET_PDEATHSIG, SIGKILL);
      if (setgid(kOther) != 0 || setuid(kOther) != 0) _exit(1);
      for (;;) {
        for (const std::string &name : names) {
          mkdir(name.c_str(), 0755);
          mkdir((name + "/his").c_str(), 0755);
        }
      }
    }
    const Outcome outcome = runProgram({kRestore, "restore"});
    kill(maker, SIGKILL);
    waitpid(maker, nullptr, 0);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    for (const std::string &name : names) {
      struct stat info = {};
      EXPECT_EQ(lstat(name.c_str(), &info), 0);
      EXPECT_EQ(info.st_uid, 0U) << name;
    }
  }
}

// While one is free, he can move a file there that is root's, as a copy of a text of his is.
TEST_F(RacingNamesTest, AfterTheFirstUseNoNameIsFree) {
  const std::vector<std::string> names = {kStore,    kTaskProgram,    kLockDirectory,
                                          kLockFile, kStatusDatabase, kJournal};
  freeNames(names);
  const Outcome outcome = runProgram({ZELO_BIN_DIR "/../tests/demo_tasks", "0", "/dev/null"});
  EXPECT_EQ(outcome.status, 0) << outcome.err;
  for (const std::string &name : names) EXPECT_TRUE(fileExists(name)) << name;
}

}  // namespace
}  // namespace support
