// The records of lists: they come from slabs, and go back one by one, in any order.
#include <gtest/gtest.h>
#include <malloc.h>
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

bool mappingsFail = false;
bool mappingsAreOdd = false;
size_t mapped = 0;
size_t unmapped = 0;
size_t advised = 0;  // to be huge pages
constexpr size_t kSmallestMapping = size_t{1} << 22;
constexpr size_t kPage = 4096;
constexpr size_t kHugePage = size_t{2} << 20;

int giveBack(void *address, size_t length) {
  return static_cast<int>(syscall(SYS_munmap, address, length));
}

}  // namespace

extern "C" __attribute__((visibility("default"))) void *mmap(void *address, size_t length,
                                                             int protection, int flags,
                                                             int descriptor,
                                                             off_t offset) noexcept {
  if (mappingsFail && length >= kSmallestMapping) {
    errno = ENOMEM;
    return MAP_FAILED;
  }
  mapped += length >= kSmallestMapping ? length : 0;
  if (mappingsAreOdd && length >= kSmallestMapping) {
    auto *begin =
        static_cast<char *>(mmap64(address, length + kPage, protection, flags, descriptor, offset));
    giveBack(begin, kPage);
    return begin + kPage;
  }
  return mmap64(address, length, protection, flags, descriptor, offset);
}

extern "C" __attribute__((visibility("default"))) int munmap(void *address,
                                                             size_t length) noexcept {
  const int result = giveBack(address, length);
  unmapped += result == 0 ? length : 0;
  return result;
}

extern "C" __attribute__((visibility("default"))) int madvise(void *address, size_t length,
                                                              int advice) noexcept {
  advised += advice == MADV_HUGEPAGE ? length : 0;
  return static_cast<int>(syscall(SYS_madvise, address, length, advice));
}

namespace {

// Two slabs and a part of a third.
constexpr int kMany = 500;

class ListRecordsTest : public support::SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    mappingsFail = mappingsAreOdd = false;
  }
  void TearDown() override {
    mappingsFail = mappingsAreOdd = false;
    SandboxTest::TearDown();
  }

  static void storeTasks(int count) {
    std::string text;
    for (int id = 1; id <= count; ++id) {
      const std::string number = std::to_string(id);
      text += "[" + number + "]\nid=" + number + "\nname=task " + number +
              "\nrun hour=" + std::to_string(id % 24) + "\nrun min=" + std::to_string(id % 60) +
              "\napp=a\napp name=b\naction=c\ncmd=\nstate=enabled\n"
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

  // In how many pieces of memory they lie. Between records that were allocated one by one there is
  // something of the allocator's.
  static size_t piecesOf(std::vector<ZELO_SCHED_TASK *> tasks) {
    std::sort(tasks.begin(), tasks.end());
    size_t pieces = 1;
    for (size_t i = 1; i < tasks.size(); ++i) pieces += tasks[i] != tasks[i - 1] + 1 ? 1 : 0;
    return pieces;
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

// Single records, slabs of the heap, and such behind huge pages.
TEST_F(ListRecordsTest, ListsOfEveryLengthHaveZeroedRecordsOfTheirOwn) {
  for (const int count : {1, 2, 8, 9, 59, 60, 61, 62, 120, 250}) {
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

TEST_F(ListRecordsTest, RecordsLieWholeWhereverTheKernelPutsThem) {
  storeTasks(kMany);
  mappingsAreOdd = true;
  const std::vector<ZELO_SCHED_TASK *> tasks = listed();
  EXPECT_EQ(idsOf(tasks).size(), size_t{kMany});
  freeAll(tasks);
}

// Which a sort by a number goes by.
TEST_F(ListRecordsTest, RecordsLieInMemoryInTheOrderOfTheStore) {
  for (const int count : {2, 8, 9, 59, 60, 240}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    ZELO_SCHED_TASK *head = nullptr;
    ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), count);
    EXPECT_EQ(ZELOSchedTaskListSort(&head, "id", 1), 0);
    int id = 0;
    for (const ZELO_SCHED_TASK *task = head; task != nullptr; task = task->next) {
      ASSERT_EQ(task->ID, ++id);
    }
    EXPECT_EQ(id, count);
    ZELOSchedTaskListFree(&head);
  }
}

TEST_F(ListRecordsTest, WithoutRoomForASlabRecordsAreTakenOneByOne) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  for (const int count : {2, 9, kMany}) {
    SCOPED_TRACE(count);
    storeTasks(count);
    mappingsFail = true;
    std::vector<ZELO_SCHED_TASK *> tasks;
    {
      const support::FailingAllocation scope(
          "calloc", {.times = support::kAlways, .minSize = 2 * sizeof(ZELO_SCHED_TASK)});
      tasks = listed();
    }
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
    EXPECT_EQ(piecesOf(tasks), static_cast<size_t>(count));
    EXPECT_EQ(logged(), Lines{});
    freeAll(tasks);
  }
}

TEST_F(ListRecordsTest, WithoutRoomForARecordEitherTheListFails) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  storeTasks(kMany);
  ASSERT_EQ(ZELOSchedBackendInit(), 0);
  mappingsFail = true;
  ZELO_SCHED_TASK *head = nullptr;
  const support::FailingAllocation scope(
      "calloc", {.from = 300, .times = support::kAlways, .minSize = sizeof(ZELO_SCHED_TASK)});
  EXPECT_EQ(SchedBackends[0].list_get(&head, nullptr), -1);
  EXPECT_EQ(head, nullptr);
  EXPECT_EQ(logged(), Lines{"backend_zeloschedule.cpp:N malloc ZELO_SCHED_TASK failed. key:[300]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "backend_zeloschedule.cpp"}));
}

TEST_F(ListRecordsTest, AListLiesInAsFewPiecesAsCanBe) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer watches each record by itself";
  struct {
    int count;
    size_t pieces;
  } const rows[] = {{1, 1},   {2, 1},   {9, 1},   {59, 1},  {60, 1},  {61, 2},  {62, 2},
                    {119, 2}, {120, 1}, {180, 1}, {240, 1}, {241, 2}, {500, 3}, {1000, 5}};
  for (const auto &row : rows) {
    SCOPED_TRACE(row.count);
    storeTasks(row.count);
    const std::vector<ZELO_SCHED_TASK *> tasks = listed();
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(row.count));
    EXPECT_EQ(piecesOf(tasks), row.pieces);
    freeAll(tasks);
  }
}

// What is mapped is whole huge pages and one too many, which is cut off again.
TEST_F(ListRecordsTest, NoMoreIsTakenThanTheRecordsFill) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer watches each record by itself";
  for (const bool odd : {false, true}) {
    mappingsAreOdd = odd;
    for (const int count : {2, 59, 60, 119, 120, 240, 241, 300, 500}) {
      SCOPED_TRACE(count);
      storeTasks(count);
      freeAll(listed());
      const size_t records = static_cast<size_t>(count) * sizeof(ZELO_SCHED_TASK);
      const size_t before = heapInUse();
      mapped = unmapped = advised = 0;
      const std::vector<ZELO_SCHED_TASK *> tasks = listed();
      EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(count));
      EXPECT_EQ(mapped - unmapped, advised) << "records lie in huge pages";
      EXPECT_EQ(advised % kHugePage, 0U);
      EXPECT_EQ(advised > 0, count >= 60) << "a huge page holds so many";
      EXPECT_LE(advised + heapInUse() - before, records + records / 20);
      freeAll(tasks);
      EXPECT_EQ(unmapped, mapped) << "all of it is given back";
      EXPECT_LT(heapInUse(), before + sizeof(ZELO_SCHED_TASK));
    }
  }
}

TEST_F(ListRecordsTest, WhatAFilterKeepsLiesInPiecesThatGrow) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer watches each record by itself";
  struct {
    int sections;
    int kept;
    size_t pieces;
    size_t hugePages;
  } const rows[] = {{2, 1, 1, 0},   {40, 40, 1, 0},   {59, 59, 1, 0},   {60, 59, 1, 0},
                    {60, 60, 2, 0}, {119, 119, 2, 1}, {500, 118, 2, 1}, {500, 120, 3, 4},
                    {500, 1, 1, 0}, {500, 298, 3, 4}, {500, 300, 4, 7}, {500, 500, 5, 7}};
  constexpr size_t kHeapMost = 60 * sizeof(ZELO_SCHED_TASK);
  static int last;
  for (const auto &row : rows) {
    SCOPED_TRACE(std::to_string(row.kept) + " of " + std::to_string(row.sections));
    storeTasks(row.sections);
    freeAll(listed());
    last = row.kept;
    const size_t before = heapInUse();
    mapped = unmapped = advised = 0;
    const std::vector<ZELO_SCHED_TASK *> tasks =
        listed([](const ZELO_SCHED_TASK *task) { return task->ID <= last ? 1 : 0; });
    EXPECT_EQ(idsOf(tasks).size(), static_cast<size_t>(row.kept));
    EXPECT_EQ(piecesOf(tasks), row.pieces);
    EXPECT_EQ(advised, row.hugePages * kHugePage);
    EXPECT_LT(heapInUse(), before + 2 * kHeapMost);
    freeAll(tasks);
    EXPECT_EQ(unmapped, mapped);
    EXPECT_LT(heapInUse(), before + sizeof(ZELO_SCHED_TASK));
  }
}

// Of a list for the crontab only so much of each record exists as its line needs.
TEST_F(ListRecordsTest, TheCrontabHasEachTaskWithItsOwnTimeInTheOrderOfTheStore) {
  constexpr int kMoreThanFillAHugePage = 40000;
  for (const int count : {1, 2, 8, 9, kMany, kMoreThanFillAHugePage}) {
    if (!support::kAllocationsCanFail && count > kMany) continue;  // each would be a whole record
    SCOPED_TRACE(count);
    storeTasks(count);
    support::writeFile(support::kCrontab, "");
    mapped = 0;
    EXPECT_EQ(ZELOSchedTaskSync(), 0);
    EXPECT_EQ(mapped, 0U);
    std::string wanted;
    for (int id = 1; id <= count; ++id) {
      wanted += std::to_string(id % 60) + "\t" + std::to_string(id % 24) +
                "\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=" + std::to_string(id) + "\n";
    }
    EXPECT_TRUE(support::readFile(support::kCrontab) == wanted);
  }
}

// More ids than are first made room for.
TEST_F(ListRecordsTest, TheNextIdAfterThousandsIsFound) {
  storeTasks(2500);
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  ASSERT_NE(task, nullptr);
  EXPECT_STREQ(task->Name, "Task 2501");
  ZELOSchedTaskFree(task);
}

}  // namespace
