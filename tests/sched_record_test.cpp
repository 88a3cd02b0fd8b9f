// The records of lists: they are allocated in blocks, and freed one by one, in any order.
#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <cstring>
#include <random>
#include <set>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kInBlock = 64;
constexpr int kMany = 500;

class ListRecordsTest : public SandboxTest {
 protected:
  static void storeTasks(int count) {
    std::string text;
    for (int id = 1; id <= count; ++id) {
      const std::string number = std::to_string(id);
      text += "[" + number + "]\nid=" + number + "\nname=task " + number +
              "\nrun hour=" + std::to_string(id % 24) + "\nrun min=" + std::to_string(id % 60) +
              "\napp=a\napp name=b\naction=c\ncmd=\nstate=enabled\n"
              "type=daily\n";
    }
    writeFile(kStore, text);
  }

  static std::vector<ZELO_SCHED_TASK *> listed(ZELO_SCHED_TASK_FILTER filter = nullptr) {
    ZELO_SCHED_TASK *task = nullptr;
    ZELOSchedTaskListGet(&task, filter);
    std::vector<ZELO_SCHED_TASK *> tasks;
    for (; task != nullptr; task = ZELOSchedTaskNext(task)) tasks.push_back(task);
    return tasks;
  }

  static std::set<int> idsOf(const std::vector<ZELO_SCHED_TASK *> &tasks) {
    std::set<int> ids;
    for (const ZELO_SCHED_TASK *task : tasks) ids.insert(task->ID);
    return ids;
  }

  static void freeAll(const std::vector<ZELO_SCHED_TASK *> &tasks) {
    for (ZELO_SCHED_TASK *task : tasks) EXPECT_EQ(ZELOSchedTaskFree(task), 0);
  }

  static size_t heapInUse() {
    const struct mallinfo2 info = mallinfo2();
    return info.uordblks + info.hblkhd;
  }
};

TEST_F(ListRecordsTest, EveryTaskHasARecordOfItsOwn) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> tasks = listed();
  EXPECT_EQ(tasks.size(), size_t{kMany});
  EXPECT_EQ(idsOf(tasks).size(), size_t{kMany});
  for (const ZELO_SCHED_TASK *task : tasks) {
    EXPECT_EQ("task " + std::to_string(task->ID), task->Name);
  }
  freeAll(tasks);
}

TEST_F(ListRecordsTest, RecordsMayBeFreedInAnyOrderWhileTheOthersStand) {
  storeTasks(kMany);
  std::vector<ZELO_SCHED_TASK *> tasks = listed();
  std::shuffle(tasks.begin(), tasks.end(), std::mt19937(7));
  while (!tasks.empty()) {
    ZELOSchedTaskFree(tasks.back());
    tasks.pop_back();
    if (tasks.size() % 50 == 0) {
      for (const ZELO_SCHED_TASK *task : tasks) {
        ASSERT_EQ("task " + std::to_string(task->ID), task->Name);
      }
    }
  }
}

TEST_F(ListRecordsTest, ListsOfEveryLengthHaveZeroedRecordsOfTheirOwn) {
  for (const int count : {1, 2, kInBlock - 1, kInBlock, kInBlock + 1, 2 * kInBlock, 250}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    for (int round = 0; round < 2; ++round) {
      std::vector<ZELO_SCHED_TASK *> tasks = listed();
      ASSERT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
      for (ZELO_SCHED_TASK *task : tasks) {
        ASSERT_EQ("task " + std::to_string(task->ID), task->Name);
        for (size_t i = 0; i < sizeof(task->Command); ++i) ASSERT_EQ(task->Command[i], '\0');
        memset(task->Command, 'x', sizeof(task->Command));
      }
      std::shuffle(tasks.begin(), tasks.end(), std::mt19937(static_cast<unsigned>(count)));
      freeAll(tasks);
    }
  }
}

TEST_F(ListRecordsTest, ListsOfDifferentLengthsAreFreedInTurns) {
  std::vector<ZELO_SCHED_TASK *> all;
  for (const int count : {64, 9, 64, 300, 8, 128, 65}) {
    storeTasks(count);
    const std::vector<ZELO_SCHED_TASK *> tasks = listed();
    ASSERT_EQ(tasks.size(), static_cast<size_t>(count));
    all.insert(all.end(), tasks.begin(), tasks.end());
  }
  std::shuffle(all.begin(), all.end(), std::mt19937(11));
  while (!all.empty()) {
    ASSERT_EQ("task " + std::to_string(all.back()->ID), all.back()->Name);
    ASSERT_EQ(ZELOSchedTaskFree(all.back()), 0);
    all.pop_back();
  }
}

TEST_F(ListRecordsTest, TwoListsAndASingleRecordDoNotGetInEachOthersWay) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> first = listed();
  ZELO_SCHED_TASK *single = ZELOSchedTaskAlloc();
  const std::vector<ZELO_SCHED_TASK *> second = listed();
  freeAll(first);
  EXPECT_EQ(idsOf(second).size(), size_t{kMany});
  EXPECT_EQ(ZELOSchedTaskFree(single), 0);
  freeAll(second);
}

TEST_F(ListRecordsTest, ARecordThatIsFilteredOutIsUsedForTheNextTask) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> tasks =
      listed([](const ZELO_SCHED_TASK *task) { return task->ID % 100 == 0 ? 1 : 0; });
  EXPECT_EQ(idsOf(tasks), (std::set<int>{100, 200, 300, 400, 500}));
  freeAll(tasks);
}

TEST_F(ListRecordsTest, AFilterMayKeepAListOfItsOwnWhileNothingIsKeptOfTheOuterOne) {
  storeTasks(kMany);
  static std::vector<ZELO_SCHED_TASK *> inner;
  EXPECT_TRUE(listed([](const ZELO_SCHED_TASK *) {
                if (inner.empty()) inner = listed();
                return 0;
              }).empty());
  EXPECT_EQ(idsOf(inner).size(), size_t{kMany});
  freeAll(inner);
  inner.clear();
}

TEST_F(ListRecordsTest, WithoutRoomForABlockRecordsAreTakenOneByOne) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  for (const int count : {2, kInBlock + 1, kMany}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    std::vector<ZELO_SCHED_TASK *> tasks;
    {
      const FailingAllocation scope("calloc",
                                    {.times = kAlways, .minSize = 2 * sizeof(ZELO_SCHED_TASK)});
      tasks = listed();
    }
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
    EXPECT_EQ(logged(), Lines{});
    freeAll(tasks);
  }
}

TEST_F(ListRecordsTest, WithoutRoomForARecordEitherTheListFails) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  storeTasks(kMany);
  ASSERT_EQ(ZELOSchedBackendInit(), 0);
  ZELO_SCHED_TASK *head = nullptr;
  // Two blocks, then neither a block nor a record.
  const FailingAllocation scope("calloc",
                                {.from = 3, .times = kAlways, .minSize = sizeof(ZELO_SCHED_TASK)});
  EXPECT_EQ(SchedBackends[0].list_get(&head, nullptr), -1);
  EXPECT_EQ(head, nullptr);
  EXPECT_EQ(logged(), Lines{"backend_zeloschedule.cpp:N malloc ZELO_SCHED_TASK failed. key:[129]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "backend_zeloschedule.cpp"}));
}

TEST_F(ListRecordsTest, NoMoreIsTakenThanTheRecordsFill) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  for (const int count : {2, kInBlock, kInBlock + 1, 300, kMany}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    freeAll(listed());
    const size_t records = static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK);
    const size_t before = heapInUse();
    const std::vector<ZELO_SCHED_TASK *> tasks = listed();
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
    EXPECT_LE(heapInUse() - before, records + records / 20);
    freeAll(tasks);
    EXPECT_LT(heapInUse(), before + sizeof(ZELO_SCHED_TASK));
  }
}

TEST_F(ListRecordsTest, ARecordThatIsKeptKeepsNoMoreThanItsBlock) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  storeTasks(kMany);
  freeAll(listed());
  const size_t before = heapInUse();
  std::vector<ZELO_SCHED_TASK *> tasks = listed();
  ZELO_SCHED_TASK *kept = tasks[kMany / 2];
  tasks.erase(tasks.begin() + kMany / 2);
  freeAll(tasks);
  EXPECT_LT(heapInUse(), before + (kInBlock + 1) * sizeof(ZELO_SCHED_TASK));
  EXPECT_EQ(ZELOSchedTaskFree(kept), 0);
  EXPECT_LT(heapInUse(), before + sizeof(ZELO_SCHED_TASK));
}

// The library sorts by a number in the order of the records in memory.
TEST_F(ListRecordsTest, TheCrontabHasEachTaskWithItsOwnTimeInTheOrderOfTheStore) {
  for (const int count : {1, 2, kInBlock, kInBlock + 1, kMany, 10000}) {
    if (!kAllocationsCanFail && count > kMany)
      continue;  // the sanitizer's calloc touches all memory
    SCOPED_TRACE(count);
    storeTasks(count);
    writeFile(kCrontab, "");
    EXPECT_EQ(ZELOSchedTaskSync(), 0);
    std::string wanted;
    for (int id = 1; id <= count; ++id) {
      wanted += std::to_string(id % 60) + "\t" + std::to_string(id % 24) +
                "\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + std::to_string(id) + "\n";
    }
    EXPECT_TRUE(readFile(kCrontab) == wanted);
  }
}

// More ids than the array has room for at first.
TEST_F(ListRecordsTest, TheNextIdAfterThousandsIsFound) {
  storeTasks(2500);
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  ASSERT_NE(task, nullptr);
  EXPECT_STREQ(task->Name, "Task 2501");
  ZELOSchedTaskFree(task);
}

}  // namespace
}  // namespace support
