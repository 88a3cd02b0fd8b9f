// Every user can write to "/tmp". Whatever an ordinary user puts there under a name of the library
// (files, links of both kinds, pipes, directories), each operation ends, follows no link of his in
// writing, and starts nothing of his as root.
#include <fcntl.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <functional>
#include <string>
#include <thread>

#include "captured_log.h"
#include "run_program.h"
#include "sandbox_fixture.h"
#include "shared_memory.h"
#include "status_db.h"
#include "tasks.h"
#include "zelocore.h"

namespace support {
namespace {

constexpr uid_t kOther = 65534;
constexpr char kVictim[] = "/tmp/victim";  // on the same file system, for hard links
constexpr char kVictimText[] = "root's own\n";
constexpr char kHostileMark[] = "/tmp/hostile.ran";
constexpr char kOwnMark[] = "/tmp/own.ran";
constexpr mode_t kPrivate = 0600;
constexpr mode_t kForAll = 0666;
constexpr mode_t kRunByAll = 0777;
constexpr std::chrono::seconds kLongest(60);

std::string scratchName() {
  return "/tmp/scheduled_tasks.tmp." + std::to_string(getpid());
}

// What cron starts as root, by the lines that the library writes.
constexpr char kTaskProgram[] = "/tmp/zeloschedtask";

std::string lockFile() {
  return std::string(kLockDirectory) + "/lock_sched_run";
}

struct Place {
  const char *name;
  std::function<std::string()> path;
};

const Place kPlaces[] = {
    {"Store", [] { return std::string(kStore); }},
    {"Scratch", [] { return scratchName(); }},
    {"Database", [] { return std::string(kStatusDatabase); }},
    {"Journal", [] { return std::string(kStatusDatabase) + "-journal"; }},
    {"Wal", [] { return std::string(kStatusDatabase) + "-wal"; }},
    {"Shm", [] { return std::string(kStatusDatabase) + "-shm"; }},
    {"LockDirectory", [] { return std::string(kLockDirectory); }},
    {"LockFile", [] { return lockFile(); }},
    {"TaskProgram", [] { return std::string(kTaskProgram); }},
};

// What a store of his would start.
std::string hostileStore() {
  const Task task = makeTask("hostile", std::string("/bin/touch ") + kHostileMark);
  task->ID = 1;
  PSZHASH hash = QLIBCSzHashAlloc(1);
  EXPECT_EQ(ZELOSchedInitHashFromTask(&hash, task.get()), 0);
  const std::string path = "/usr/zelo/hostile";
  EXPECT_GE(QLIBCFileAddSection(path.c_str(), "1", hash, 0), 0);
  QLIBCSzHashFree(hash);
  const std::string text = readFile(path);
  std::filesystem::remove(path);
  return text;
}

std::string hostileProgram() {
  return std::string("#!/bin/sh\n/bin/touch ") + kHostileMark + "\n";
}

void giveAway(const std::string &path) {
  EXPECT_EQ(lchown(path.c_str(), kOther, kOther), 0) << path;
}

struct Plant {
  const char *name;
  std::function<void(const std::string &path)> put;
};

const Plant kPlants[] = {
    {"File",
     [](const std::string &path) {
       writeFile(path, path == kTaskProgram ? hostileProgram() : hostileStore());
       chmod(path.c_str(), path == kTaskProgram ? kRunByAll : kForAll);
       giveAway(path);
     }},
    {"Link",
     [](const std::string &path) {
       std::filesystem::create_symlink(kVictim, path);
       giveAway(path);
     }},
    {"LinkToNothing",
     [](const std::string &path) {
       std::filesystem::create_symlink("/usr/zelo/made_by_a_link", path);
       giveAway(path);
     }},
    {"HardLink", [](const std::string &path) { std::filesystem::create_hard_link(kVictim, path); }},
    {"Pipe",
     [](const std::string &path) {
       EXPECT_EQ(mkfifo(path.c_str(), kForAll), 0);
       giveAway(path);
     }},
    {"Directory",
     [](const std::string &path) {
       std::filesystem::create_directory(path);
       giveAway(path);
     }},
};

// ---- what only the run lock can be

// Takes on the rights of another user, for good.
void becomeOther() {
  if (setgroups(0, nullptr) != 0 || setgid(kOther) != 0 || setuid(kOther) != 0) std::abort();
}

// The process that holds a lock of his, which outlives the one that planted it.
pid_t &holder() {
  static auto *pid = static_cast<pid_t *>(sharedMemory(sizeof(pid_t)));
  return *pid;
}

[[noreturn]] void holdLock(const std::string &path, int telling) {
  holder() = getpid();
  becomeOther();
  const int descriptor = open(path.c_str(), O_RDWR | O_CLOEXEC);
  const bool isHeld = descriptor >= 0 && flock(descriptor, LOCK_EX | LOCK_NB) == 0;
  if (!isHeld || write(telling, "", 1) != 1) std::abort();
  close(telling);
  for (;;) pause();
}

// A file of his, whose lock he holds until endHolder.
void putHeldFile(const std::string &path) {
  writeFile(path, "", kForAll);
  giveAway(path);
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  const pid_t between = fork();
  if (between == 0) {
    if (fork() == 0) holdLock(path, ends[1]);
    _exit(0);
  }
  waitpid(between, nullptr, 0);
  close(ends[1]);
  char told = 0;
  EXPECT_EQ(read(ends[0], &told, 1), 1) << "he does not hold the lock";
  close(ends[0]);
}

void endHolder() {
  if (holder() == 0) return;
  kill(holder(), SIGKILL);
  waitpid(holder(), nullptr, 0);
  holder() = 0;
}

const Plant kHeldFile = {"FileWhoseLockHeHolds", putHeldFile};

// A directory of his in the place of the lock's, with something of his under the lock's name.
Plant inDirectory(const char *name, const Plant &what) {
  return {name, [what](const std::string &path) {
            std::filesystem::create_directory(path);
            what.put(path + "/lock_sched_run");
            chmod(path.c_str(), kRunByAll);
            giveAway(path);
          }};
}

constexpr char kElsewhere[] = "/usr/zelo/elsewhere";  // a directory of root's

const Plant kLockDirectoryPlants[] = {
    {"LinkToDirectory",
     [](const std::string &path) {
       std::filesystem::create_symlink(kElsewhere, path);
       giveAway(path);
     }},
    inDirectory("DirectoryWithFile", kPlants[0]),
    inDirectory("DirectoryWithLink", kPlants[1]),
    inDirectory("DirectoryWithLinkToNothing", kPlants[2]),
    inDirectory("DirectoryWithHardLink", kPlants[3]),
    inDirectory("DirectoryWithPipe", kPlants[4]),
    inDirectory("DirectoryWithDirectory", kPlants[5]),
    inDirectory("DirectoryWithFileWhoseLockHeHolds", kHeldFile),
};

struct Operation {
  const char *name;
  std::function<void()> act;
};

void editFirst() {
  const Task task = makeTask("edited", "/bin/true");
  task->ID = 1;
  ZELOSchedTaskEdit(task.get());
}

void list() {
  ZELO_SCHED_TASK *tasks = nullptr;
  ZELOSchedTaskListGet(&tasks, nullptr);
  ZELOSchedTaskListFree(&tasks);
}

void record() {
  if (sqlite3 *database = ZELOSchedDBInit()) {
    int id = 0;
    ZELOSchedDBAddRecord(database, makeTask("recorded", "/bin/true").get(), &id);
    sqlite3_close(database);
  }
}

const Operation kOperations[] = {
    {"create", [] { ZELOSchedTaskCreate(makeTask("new", "/bin/true").get()); }},
    {"edit", editFirst},
    {"remove", [] { ZELOSchedTaskRemove(2); }},
    {"list", list},
    {"sync", [] { ZELOSchedTaskSync(); }},
    {"run", [] { ZELOSchedTaskRun(1, 0, 0); }},
    {"record", record},
};

struct Case {
  Place place;
  Plant plant;
};

void PrintTo(const Case &it, std::ostream *out) {
  *out << it.place.name << " " << it.plant.name;
}

std::vector<Case> allCases() {
  std::vector<Case> cases;
  for (const Place &place : kPlaces) {
    for (const Plant &plant : kPlants) cases.push_back({place, plant});
    if (std::string(place.name) == "LockFile") cases.push_back({place, kHeldFile});
    if (std::string(place.name) != "LockDirectory") continue;
    for (const Plant &plant : kLockDirectoryPlants) cases.push_back({place, plant});
  }
  return cases;
}

class PlantsTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    REQUIRE_OTHER_USERS();
    holder() = 0;  // maps the shared memory before any process is forked
  }
  void TearDown() override {
    endHolder();
    for (const char *path :
         {kVictim, kHostileMark, kOwnMark, kElsewhere, "/usr/zelo/made_by_a_link"}) {
      std::filesystem::remove_all(path);
    }
    // What a restore has moved away too.
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
      const std::string path = entry.path();
      if (path.starts_with(kTaskProgram)) std::filesystem::remove_all(path);
    }
    SandboxTest::TearDown();
  }

  // Two tasks of root's, a row in the status database, and the run lock.
  static void makeWorld() {
    cleanWorld();
    writeFile(kVictim, kVictimText, kPrivate);
    std::filesystem::create_directory(kElsewhere);
    for (const char *mark : {kOwnMark, kHostileMark}) std::filesystem::remove(mark);
    saveTask(makeTask("first", std::string("/bin/touch ") + kOwnMark));
    saveTask(makeTask("second", "/bin/true"));
    record();
    std::filesystem::create_directory(kLockDirectory);
    writeFile(lockFile(), "", kPrivate);
  }

  static void plant(const Case &it) {
    const std::string path = it.place.path();
    std::filesystem::remove_all(path);
    it.plant.put(path);
  }

  // In a process of its own, which is ended when it hangs.
  static bool ends(const std::function<void(const Case &)> &plantFor, const Case &it,
                   const std::function<void()> &act) {
    const pid_t pid = fork();
    if (pid == 0) {
      setpgid(0, 0);
      plantFor(it);
      prctl(PR_SET_CHILD_SUBREAPER, 1);  // for the runs, not for who holds a lock
      act();
      waitForChildRuns();
      _exit(testing::Test::HasFailure() ? 1 : 0);
    }
    const auto deadline = std::chrono::steady_clock::now() + kLongest;
    int status = 0;
    while (waitpid(pid, &status, WNOHANG) == 0) {
      if (std::chrono::steady_clock::now() > deadline) {
        kill(-pid, SIGKILL);
        waitpid(pid, &status, 0);
        return false;
      }
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
  }

  static void expectNoHarm() {
    struct stat victim = {};
    ASSERT_EQ(lstat(kVictim, &victim), 0);
    EXPECT_EQ(readFile(kVictim), kVictimText);
    EXPECT_EQ(victim.st_mode & 07777U, kPrivate);
    EXPECT_EQ(victim.st_uid, 0U);
    EXPECT_FALSE(fileExists("/usr/zelo/made_by_a_link"));
    EXPECT_TRUE(std::filesystem::is_empty(kElsewhere));
    EXPECT_FALSE(fileExists(kHostileMark)) << "a command of his was run";
    const std::string crontab = readFile(kCrontab);
    EXPECT_TRUE(crontab.starts_with(kPlainCrontab)) << crontab;
  }
};

class PlantedPathsTest : public PlantsTest, public testing::WithParamInterface<Case> {};

TEST_P(PlantedPathsTest, DoNoHarm) {
  for (const Operation &operation : kOperations) {
    SCOPED_TRACE(operation.name);
    makeWorld();
    EXPECT_TRUE(ends(plant, GetParam(), operation.act)) << "it hangs, or nothing was planted";
    endHolder();
    expectNoHarm();
    if (std::string(GetParam().place.name) == "TaskProgram") {
      EXPECT_TRUE(fileExists(kTaskProgram)) << "that is for a restore to replace";
    }
    std::filesystem::remove_all(GetParam().place.path());
    if (HasFailure()) return;
  }
}

INSTANTIATE_TEST_SUITE_P(Each, PlantedPathsTest, testing::ValuesIn(allCases()),
                         [](const testing::TestParamInfo<Case> &param) {
                           return std::string(param.param.place.name) + param.param.plant.name;
                         });

// ---- the program that cron starts

class RootsProgramTest : public PlantsTest {
 protected:
  static constexpr char kRestore[] = ZELO_BIN_DIR "/zelosched";
  static constexpr char kProgram[] = "#!/bin/sh\nexit 0\n";
  static constexpr mode_t kProgramMode = 0755;

  // Whether another user is refused, for want of rights.
  static bool isRefused(const std::function<int()> &act) {
    const pid_t pid = fork();
    if (pid == 0) {
      becomeOther();
      _exit(act() < 0 && (errno == EPERM || errno == EACCES) ? 0 : 1);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
  }

  static void expectProgram(const std::string &contents) {
    struct stat info = {};
    ASSERT_EQ(lstat(kTaskProgram, &info), 0);
    EXPECT_TRUE(S_ISREG(info.st_mode));
    EXPECT_EQ(info.st_mode & 07777U, kProgramMode);
    EXPECT_EQ(info.st_uid, 0U);
    EXPECT_EQ(info.st_nlink, 1U);
    EXPECT_TRUE(readFile(kTaskProgram) == contents);
  }
};

TEST_F(RootsProgramTest, NobodyElseCanReplaceWhatRootHasPutThere) {
  static constexpr char kHis[] = "/tmp/his";
  makeWorld();
  EXPECT_EQ(crontabLines().at(0),
            "0\t0\t*\t*\t*\troot\t" + std::string(kTaskProgram) + " --run id=1");
  writeFile(kTaskProgram, kProgram, kProgramMode);
  writeFile(kHis, hostileProgram(), kRunByAll);
  giveAway(kHis);
  EXPECT_TRUE(isRefused([] { return unlink(kTaskProgram); }));
  EXPECT_TRUE(isRefused([] { return rename(kHis, kTaskProgram); }));
  EXPECT_TRUE(isRefused([] { return rename(kTaskProgram, "/tmp/away"); }));
  EXPECT_TRUE(isRefused([] { return open(kTaskProgram, O_WRONLY | O_CLOEXEC); }));
  EXPECT_TRUE(isRefused([] { return chmod(kTaskProgram, kRunByAll); }));
  expectProgram(kProgram);
  std::filesystem::remove(kHis);
}

class PlantedProgramTest : public RootsProgramTest, public testing::WithParamInterface<Case> {};

TEST_P(PlantedProgramTest, ARestoreTakesThePlaceBack) {
  if (!fileExists(kRestore)) GTEST_SKIP() << "zelosched is not part of this build";
  makeWorld();
  plant(GetParam());
  const Outcome outcome = runProgram({kRestore, "restore"});
  SCOPED_TRACE(outcome.err);
  expectNoHarm();
  expectProgram(readFile(ZELO_BIN_DIR "/zeloschedtask"));
}

std::vector<Case> taskProgramCases() {
  std::vector<Case> cases = allCases();
  std::erase_if(cases, [](const Case &it) { return std::string(it.place.name) != "TaskProgram"; });
  return cases;
}

INSTANTIATE_TEST_SUITE_P(Each, PlantedProgramTest, testing::ValuesIn(taskProgramCases()),
                         [](const testing::TestParamInfo<Case> &param) {
                           return std::string(param.param.plant.name);
                         });

}  // namespace
}  // namespace support
