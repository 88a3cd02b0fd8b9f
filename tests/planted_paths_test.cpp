// "/tmp" is everybody's. Whatever an ordinary user puts there under a name that the library uses:
// files of his, links of both kinds, pipes, directories. Each operation ends, writes through
// nothing, and starts nothing of his as root.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <functional>
#include <string>
#include <thread>

#include "captured_log.h"
#include "sandbox_fixture.h"
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
constexpr std::chrono::seconds kLongest(60);

std::string scratchName() {
  return "/tmp/scheduled_tasks.tmp." + std::to_string(getpid());
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
    {"LockFile", [] { return std::string(kLockDirectory) + "/lock_sched_run"; }},
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
       writeFile(path, hostileStore());
       chmod(path.c_str(), kForAll);
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
  }
  return cases;
}

class PlantedPathsTest : public SandboxTest, public testing::WithParamInterface<Case> {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    REQUIRE_OTHER_USERS();
  }
  void TearDown() override {
    for (const char *path : {kVictim, kHostileMark, kOwnMark, "/usr/zelo/made_by_a_link"}) {
      std::filesystem::remove_all(path);
    }
    SandboxTest::TearDown();
  }

  // Two tasks of root's, a row in the status database, and the run lock.
  static void makeWorld() {
    cleanWorld();
    writeFile(kVictim, kVictimText, kPrivate);
    for (const char *mark : {kOwnMark, kHostileMark}) std::filesystem::remove(mark);
    saveTask(makeTask("first", std::string("/bin/touch ") + kOwnMark));
    saveTask(makeTask("second", "/bin/true"));
    record();
    std::filesystem::create_directory(kLockDirectory);
    writeFile(std::string(kLockDirectory) + "/lock_sched_run", "", kPrivate);
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
      act();
      waitForChildRuns();
      _exit(0);
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
    EXPECT_FALSE(fileExists(kHostileMark)) << "a command of his was run";
    const std::string crontab = readFile(kCrontab);
    EXPECT_TRUE(crontab.starts_with(kPlainCrontab)) << crontab;
  }
};

TEST_P(PlantedPathsTest, DoNoHarm) {
  for (const Operation &operation : kOperations) {
    SCOPED_TRACE(operation.name);
    makeWorld();
    EXPECT_TRUE(ends(plant, GetParam(), operation.act)) << "it hangs";
    expectNoHarm();
    std::filesystem::remove_all(GetParam().place.path());
  }
}

INSTANTIATE_TEST_SUITE_P(Each, PlantedPathsTest, testing::ValuesIn(allCases()),
                         [](const testing::TestParamInfo<Case> &param) {
                           return std::string(param.param.place.name) + param.param.plant.name;
                         });

}  // namespace
}  // namespace support
