// While one process creates, edits and removes tasks, another that lists them sees each task that
// exists throughout, in a consistent state, and no error.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <set>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "shared_memory.h"
#include "soak.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kStanding = 10;
const int kPassing = isShortRun() ? 100 : 500;
constexpr int kAliveAtOnce = 8;  // of the tasks that are created and removed
constexpr uint32_t kMinutes = 60;

// One number in fields at the beginning, in the middle and at the end of the record, the long ones
// so that a task is more than a page of the file.
void fill(ZELO_SCHED_TASK *task, uint32_t version) {
  const std::string text = "version " + std::to_string(version);
  setText(task->Name, text + std::string(3000, ' '));
  setText(task->AppArgs, text);
  setText(task->Command, text + std::string(5000, ' '));
  task->RunMin = version % kMinutes;
  task->StartYear = version;
}

std::string versionIn(const char *text) {
  const std::string all = text;
  const size_t last = all.find_last_not_of(' ');
  return last == std::string::npos ? "" : all.substr(0, last + 1);
}

bool isWhole(const ZELO_SCHED_TASK *task) {
  const std::string text = "version " + std::to_string(task->StartYear);
  return versionIn(task->Name) == text && versionIn(task->AppArgs) == text &&
         versionIn(task->Command) == text && task->RunMin == task->StartYear % kMinutes;
}

struct Shared {
  std::atomic<bool> writerIsDone;
  std::atomic<unsigned> lists;
  std::atomic<unsigned> changes;  // lists that differed from the one before
};

SharedLines &complaints() {
  static SharedLines lines(size_t{1} << 20);
  return lines;
}

// The versions listed, as a fingerprint of the whole list.
std::multiset<uint32_t> check(const ZELO_SCHED_TASK *list) {
  std::multiset<uint32_t> versions;
  std::set<int32_t> ids;
  for (; list != nullptr; list = list->next) {
    versions.insert(list->StartYear);
    if (!ids.insert(list->ID).second) complaints().append(list->ID, "listed twice");
    if (!isWhole(list)) complaints().append(list->ID, "half old and half new");
  }
  for (int32_t id = 1; id <= kStanding; ++id) {
    if (!ids.contains(id)) complaints().append(id, "missed");
  }
  return versions;
}

void readUntilDone(Shared *shared) {
  std::multiset<uint32_t> last;
  for (bool done = false; !done;) {
    done = shared->writerIsDone;
    ZELO_SCHED_TASK *head = nullptr;
    if (ZELOSchedTaskListGet(&head, nullptr) < kStanding) complaints().append(0, "too few");
    const TaskList list(head);
    const std::multiset<uint32_t> versions = check(head);
    if (versions != last) ++shared->changes;
    last = versions;
    ++shared->lists;
  }
}

class StoreReaderTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    complaints().clear();
    // A reader waits for copies in progress.
    realSleep(true);
  }
};

TEST_F(StoreReaderTest, AReaderNeverMissesATaskNorSeesATornOne) {
  std::vector<Task> standing;
  uint32_t version = 2000;
  for (int i = 0; i < kStanding; ++i) {
    standing.push_back(makeTask("", ""));
    fill(standing.back().get(), version++);
    saveTask(standing.back());
  }
  auto *shared = static_cast<Shared *>(sharedMemory(sizeof(Shared)));
  const pid_t reader = fork();
  if (reader == 0) {
    readUntilDone(shared);
    _exit(0);
  }
  std::vector<Task> passing;
  for (int i = 0; i < kPassing; ++i) {
    passing.push_back(makeTask("", ""));
    fill(passing.back().get(), version++);
    EXPECT_EQ(ZELOSchedTaskSave(passing.back().get()), 0);
    // Edits one of the lasting tasks, and removes an earlier one of the others.
    const Task &edited =
        i % 2 == 0 ? standing[static_cast<size_t>(i / 2 % kStanding)] : passing.back();
    fill(edited.get(), version++);
    EXPECT_EQ(ZELOSchedTaskSave(edited.get()), 0);
    if (i >= kAliveAtOnce) {
      EXPECT_EQ(ZELOSchedTaskRemove(passing[static_cast<size_t>(i - kAliveAtOnce)]->ID), 0);
    }
  }
  shared->writerIsDone = true;
  int status = 0;
  ASSERT_EQ(waitpid(reader, &status, 0), reader);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(complaints().texts(), Lines{});
  EXPECT_EQ(logged(), Lines{});
  // The reader has listed often while the store changed.
  EXPECT_GT(shared->lists, 20U);
  EXPECT_GT(shared->changes, 10U);
}

// The comparison above detects a task that is half old and half new.
TEST_F(StoreReaderTest, ATornTaskIsToldApart) {
  const Task task = makeTask("", "");
  fill(task.get(), 2001);
  EXPECT_TRUE(isWhole(task.get()));
  setText(task->Command, "version 2000");
  EXPECT_FALSE(isWhole(task.get()));
}

}  // namespace
}  // namespace support
