// Long lists: their records come from slabs, and go back one by one, in any order.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <random>
#include <set>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "zelosched.h"

namespace {

using support::errorRecord;
using support::ErrorRecord;
using support::logged;
using Lines = std::vector<std::string>;

bool slabsFail = false;
bool mappingsAreOdd = false;
size_t mapped = 0;
size_t unmapped = 0;
constexpr size_t kSmallestSlab = size_t{1} << 22;
constexpr size_t kPage = 4096;

}  // namespace

extern "C" __attribute__((visibility("default"))) void *mmap(void *address, size_t length,
                                                             int protection, int flags,
                                                             int descriptor,
                                                             off_t offset) noexcept {
  if (slabsFail && length >= kSmallestSlab) {
    errno = ENOMEM;
    return MAP_FAILED;
  }
  mapped += length >= kSmallestSlab ? length : 0;
  if (mappingsAreOdd && length >= kSmallestSlab) {
    auto *begin =
        static_cast<char *>(mmap64(address, length + kPage, protection, flags, descriptor, offset));
    munmap(begin, kPage);
    return begin + kPage;
  }
  return mmap64(address, length, protection, flags, descriptor, offset);
}

extern "C" __attribute__((visibility("default"))) int munmap(void *address,
                                                             size_t length) noexcept {
  unmapped += length;
  return static_cast<int>(syscall(SYS_munmap, address, length));
}

namespace {

// Two slabs and a part of a third.
constexpr int kMany = 500;

class LongListTest : public support::SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    slabsFail = mappingsAreOdd = false;
  }
  void TearDown() override {
    slabsFail = mappingsAreOdd = false;
    SandboxTest::TearDown();
  }

  static void storeTasks(int count) {
    std::string text;
    for (int id = 1; id <= count; ++id) {
      const std::string number = std::to_string(id);
      text += "[" + number + "]\nid=" + number + "\nname=task " + number +
              "\nrun hour=8\nrun min=30\napp=a\napp name=b\naction=c\ncmd=\nstate=enabled\n"
              "type=daily\n";
    }
    support::writeFile(support::kStore, text);
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
};

TEST_F(LongListTest, EveryTaskHasARecordOfItsOwn) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> tasks = listed();
  EXPECT_EQ(tasks.size(), size_t{kMany});
  EXPECT_EQ(idsOf(tasks).size(), size_t{kMany});
  for (const ZELO_SCHED_TASK *task : tasks) {
    EXPECT_EQ("task " + std::to_string(task->ID), task->Name);
  }
  freeAll(tasks);
}

TEST_F(LongListTest, RecordsMayBeFreedInAnyOrderWhileTheOthersStand) {
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

// Single records, one block of them, and blocks behind huge pages.
TEST_F(LongListTest, ListsOfEveryLengthHaveZeroedRecordsOfTheirOwn) {
  for (const int count : {1, 8, 9, 16, 59, 60, 61, 68, 69, 120, 250}) {
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

TEST_F(LongListTest, ListsOfDifferentLengthsAreFreedInTurns) {
  std::vector<ZELO_SCHED_TASK *> all;
  for (const int count : {60, 9, 60, 300, 8, 120, 61}) {
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

TEST_F(LongListTest, TwoListsAndASingleRecordDoNotGetInEachOthersWay) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> first = listed();
  ZELO_SCHED_TASK *single = ZELOSchedTaskAlloc();
  const std::vector<ZELO_SCHED_TASK *> second = listed();
  freeAll(first);
  EXPECT_EQ(idsOf(second).size(), size_t{kMany});
  EXPECT_EQ(ZELOSchedTaskFree(single), 0);
  freeAll(second);
}

TEST_F(LongListTest, ARecordThatIsFilteredOutIsUsedForTheNextTask) {
  storeTasks(kMany);
  const std::vector<ZELO_SCHED_TASK *> tasks =
      listed([](const ZELO_SCHED_TASK *task) { return task->ID % 100 == 0 ? 1 : 0; });
  EXPECT_EQ(idsOf(tasks), (std::set<int>{100, 200, 300, 400, 500}));
  freeAll(tasks);
}

TEST_F(LongListTest, AFilterMayKeepAListOfItsOwnWhileNothingIsKeptOfTheOuterOne) {
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

TEST_F(LongListTest, RecordsLieWholeWhereverTheKernelPutsThem) {
  storeTasks(kMany);
  mappingsAreOdd = true;
  const std::vector<ZELO_SCHED_TASK *> tasks = listed();
  EXPECT_EQ(idsOf(tasks).size(), size_t{kMany});
  freeAll(tasks);
}

TEST_F(LongListTest, AListIsInTheOrderOfMemoryWhichASortByNumberKeeps) {
  storeTasks(kMany);
  ZELO_SCHED_TASK *head = nullptr;
  ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), kMany);
  ZELOSchedTaskListSort(&head, "id", 1);
  for (const ZELO_SCHED_TASK *task = head; task->next != nullptr; task = task->next) {
    ASSERT_LT(task, task->next);
  }
  ZELOSchedTaskListFree(&head);
  EXPECT_EQ(head, nullptr);
}

TEST_F(LongListTest, WithoutRoomForASlabRecordsAreTakenOneByOne) {
  storeTasks(kMany);
  slabsFail = true;
  const std::vector<ZELO_SCHED_TASK *> tasks = listed();
  EXPECT_EQ(idsOf(tasks).size(), size_t{kMany});
  EXPECT_EQ(logged(), Lines{});
  freeAll(tasks);
}

TEST_F(LongListTest, WithoutRoomForARecordEitherTheListFails) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  storeTasks(kMany);
  ASSERT_EQ(ZELOSchedBackendInit(), 0);
  slabsFail = true;
  ZELO_SCHED_TASK *head = nullptr;
  const support::FailingAllocation scope(
      "calloc", {.from = 300, .times = support::kAlways, .minSize = sizeof(ZELO_SCHED_TASK)});
  EXPECT_EQ(SchedBackends[0].list_get(&head, nullptr), -1);
  EXPECT_EQ(head, nullptr);
  EXPECT_EQ(logged(), Lines{"backend_zeloschedule.cpp:N malloc ZELO_SCHED_TASK failed. key:[300]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "backend_zeloschedule.cpp"}));
}

// Each slab is mapped with a huge page too much, which is cut off again.
TEST_F(LongListTest, SlabsAreNoLargerThanTheRecordsInThem) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer watches each record by itself";
  constexpr size_t kHugePage = size_t{2} << 20;
  for (const int count : {59, 60, 119, 120, 240, 241, 300, 500}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    mapped = unmapped = 0;
    const std::vector<ZELO_SCHED_TASK *> tasks = listed();
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
    constexpr size_t kMostSlabs = 3;
    EXPECT_EQ(mapped % kHugePage, 0U);
    EXPECT_LE(mapped,
              static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK) + kMostSlabs * kHugePage);
    EXPECT_EQ(mapped > 0, count >= 60) << "a slab is a huge page at least";
    freeAll(tasks);
    EXPECT_GE(unmapped, mapped) << "all of it is given back";
  }
}

// More ids than are first made room for.
TEST_F(LongListTest, TheNextIdAfterThousandsIsFound) {
  storeTasks(2500);
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  ASSERT_NE(task, nullptr);
  EXPECT_STREQ(task->Name, "Task 2501");
  ZELOSchedTaskFree(task);
}

}  // namespace
