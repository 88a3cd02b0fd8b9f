// Processes change tasks of both backends at once: each change is there afterwards, in the store,
// in the power schedule and in the crontab.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <set>

#include "captured_log.h"
#include "failing_calls.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kWriters = 3;
constexpr int kChanges = 6;

class ChangeTurnsTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    haveClock();
    realSleep(true);  // a process that waits for the lock yields to the others
  }
  void TearDown() override {
    realSleep(false);
    SandboxTest::TearDown();
  }

  static bool addOrdinary(int writer, int i) {
    const Task task = makeTask("task " + std::to_string(writer) + "." + std::to_string(i), "true");
    return ZELOSchedTaskSave(task.get()) == 0;
  }

  static bool addPowerOff(int writer, int i) {
    const Task task = makeTask("", "");
    task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
    setText(task->AppArgs, "poweroff");
    setText(task->Week, "1111111");
    task->RunHour = static_cast<uint32_t>(writer);
    task->RunMin = static_cast<uint32_t>(i);
    return ZELOSchedTaskSave(task.get()) == 0;
  }

  static pid_t startWriter(const std::function<bool(int)> &change) {
    const pid_t pid = fork();
    if (pid == 0) {
      int done = 0;
      for (int i = 0; i < kChanges; ++i) done += change(i) ? 1 : 0;
      _exit(done == kChanges ? 0 : 1);
    }
    return pid;
  }

  static long linesWith(const std::string &text) {
    const Lines lines = crontabLines();
    return std::count_if(lines.begin(), lines.end(), [&](const std::string &line) {
      return line.find(text) != std::string::npos;
    });
  }
};

TEST_F(ChangeTurnsTest, NoChangeOfSeveralProcessesIsLost) {
  std::vector<pid_t> writers;
  for (int writer = 0; writer < kWriters; ++writer) {
    writers.push_back(startWriter([&](int i) { return addOrdinary(writer, i); }));
    writers.push_back(startWriter([&](int i) { return addPowerOff(writer, i); }));
  }
  for (const pid_t pid : writers) {
    int status = -1;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(powerList(kOff).size(), size_t{kWriters * kChanges});
  ZELO_SCHED_TASK *head = nullptr;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), 2 * kWriters * kChanges);
  ZELOSchedTaskListFree(&head);
  EXPECT_EQ(linesWith("/tmp/zeloschedtask"), kWriters * kChanges);
  EXPECT_EQ(linesWith("zelo_poweroff_feasible_check"), kWriters * kChanges);
  EXPECT_EQ(logged(), Lines{});
}

// When changes take long, some processes time out. Each acknowledged task is stored under an id of
// its own, and no other.
TEST_F(ChangeTurnsTest, OfManyWritersOfALargeStoreEachIsStoredOrToldThatItIsNot) {
  constexpr int kStored = 1000;
  constexpr size_t kMany = 60;
  constexpr int kNoTurn = 0x0400;
  realSleep(true, 50);  // 0.6 seconds, in place of thirty
  const Task stored = makeTask("stored", "true");
  for (int id = 1; id <= kStored; ++id) {
    stored->ID = id;
    PSZHASH hash = QLIBCSzHashAlloc(1);
    EXPECT_EQ(ZELOSchedInitHashFromTask(&hash, stored.get()), 0);
    const std::string section = std::to_string(id);
    EXPECT_GE(QLIBCFileAddSection("/run/stored", section.c_str(), hash, 0), 0);
    QLIBCSzHashFree(hash);
  }
  std::filesystem::copy("/run/stored", kStore);
  std::vector<pid_t> writers;
  for (size_t i = 0; i < kMany; ++i) {
    const pid_t pid = fork();
    if (pid == 0) {
      const Task task = makeTask("new", "true");
      const bool isSaved = ZELOSchedTaskSave(task.get()) == 0;
      _exit(isSaved ? task->ID - kStored : QLIBCErrGet() == kNoTurn ? 0 : 255);
    }
    writers.push_back(pid);
  }
  std::set<int> saved;
  size_t refused = 0;
  for (const pid_t pid : writers) {
    int status = -1;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    ASSERT_TRUE(WIFEXITED(status));
    const int id = WEXITSTATUS(status);
    ASSERT_NE(id, 255) << "failed for another reason";
    if (id == 0) {
      ++refused;
    } else {
      EXPECT_TRUE(saved.insert(id).second) << "id " << id << " was given twice";
    }
  }
  EXPECT_EQ(saved.size() + refused, kMany);
  EXPECT_GT(saved.size(), 0U);
  ZELO_SCHED_TASK *head = nullptr;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), kStored + static_cast<int>(saved.size()));
  ZELOSchedTaskListFree(&head);
  std::filesystem::remove("/run/stored");
  printf("%zu writers beside %d tasks: %zu had their turn\n", kMany, kStored, saved.size());
}

TEST_F(ChangeTurnsTest, NobodyElseCanKeepTheOthersWaiting) {
  REQUIRE_OTHER_USERS();
  ASSERT_TRUE(addOrdinary(0, 0));
  const pid_t other = fork();
  if (other == 0) {
    constexpr uid_t kOther = 65534;
    const bool became = setresuid(kOther, kOther, kOther) == 0;
    _exit(became && open("/run/zeloscheduler.lock", O_RDONLY) < 0 ? 0 : 1);
  }
  int status = -1;
  ASSERT_EQ(waitpid(other, &status, 0), other);
  EXPECT_EQ(status, 0);
}

}  // namespace
}  // namespace support
