// Sorting a task list in place.
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kAscending = 1;
constexpr int kDescending = 0;
constexpr int kRowOfId = 0;
constexpr int kRowOfName = 19;

constexpr const char *kTextKeys[] = {"name",     "edit form",        "edit dialog", "app",
                                     "app name", "app args",         "action",      "week",
                                     "cmd",      "next trigger time"};
constexpr const char *kNumberKeys[] = {"id",
                                       "backend",
                                       "can edit owner",
                                       "can edit name",
                                       "listable",
                                       "can run from ui",
                                       "can delete from ui",
                                       "can edit from ui",
                                       "can run app same time",
                                       "can run task same time",
                                       "simple edit form",
                                       "owner",
                                       "start year",
                                       "start month",
                                       "start day",
                                       "run hour",
                                       "run min",
                                       "repeat hour",
                                       "last work hour",
                                       "state",
                                       "type"};

// Each task has a name and a number that distinguishes it from others of that name. The records are
// in memory in the order in which they were named.
class SchedTaskListSortTest : public SandboxTest {
 protected:
  void makeList(const std::vector<std::string> &names) {
    tasks_ = std::make_unique<ZELO_SCHED_TASK[]>(names.size());
    for (size_t i = 0; i < names.size(); ++i) {
      setText(tasks_[i].Name, names[i]);
      tasks_[i].ID = static_cast<int32_t>(i);
    }
    std::vector<size_t> order(names.size());
    for (size_t i = 0; i < order.size(); ++i) order[i] = i;
    linkInOrder(order);
  }

  void linkInOrder(const std::vector<size_t> &order) {
    head_ = nullptr;
    ZELO_SCHED_TASK **end = &head_;
    for (const size_t index : order) {
      *end = &tasks_[index];
      end = &tasks_[index].next;
    }
    *end = nullptr;
  }

  std::vector<int> ids() const {
    std::vector<int> found;
    for (const ZELO_SCHED_TASK *task = head_; task != nullptr; task = task->next) {
      found.push_back(task->ID);
    }
    return found;
  }

  std::unique_ptr<ZELO_SCHED_TASK[]> tasks_;
  ZELO_SCHED_TASK *head_ = nullptr;
};

void expectSilence() {
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedTaskListSortTest, NamesAreSortedByteByByteCapitalsFirst) {
  makeList({"beta", "Gamma", "alpha", "Beta"});
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", kAscending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{3, 1, 2, 0}));
  expectSilence();
}

TEST_F(SchedTaskListSortTest, DescendingIsTheReverse) {
  makeList({"beta", "Gamma", "alpha", "Beta"});
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", kDescending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{0, 2, 1, 3}));
}

TEST_F(SchedTaskListSortTest, EqualNamesKeepTheirOrder) {
  makeList({"b", "a", "b", "a", "b"});
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", kAscending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{1, 3, 0, 2, 4}));
}

TEST_F(SchedTaskListSortTest, DescendingReversesEqualNamesToo) {
  makeList({"b", "a", "b", "a", "b"});
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", kDescending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{4, 2, 0, 3, 1}));
}

TEST_F(SchedTaskListSortTest, EveryDirectionButOneIsDescending) {
  for (const int direction : {0, 2, -1, INT32_MAX, INT32_MIN}) {
    makeList({"a", "c", "b"});
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", direction), 0);
    EXPECT_EQ(ids(), (std::vector<int>{1, 2, 0})) << direction;
  }
}

TEST_F(SchedTaskListSortTest, EveryTextKeySortsByItsOwnField) {
  struct Field {
    const char *key;
    char *(*of)(ZELO_SCHED_TASK &);
  };
  const Field fields[] = {
      {"name", [](ZELO_SCHED_TASK &task) { return task.Name; }},
      {"edit form", [](ZELO_SCHED_TASK &task) { return task.EditForm; }},
      {"edit dialog", [](ZELO_SCHED_TASK &task) { return task.EditDialog; }},
      {"app", [](ZELO_SCHED_TASK &task) { return task.App; }},
      {"app name", [](ZELO_SCHED_TASK &task) { return task.AppName; }},
      {"app args", [](ZELO_SCHED_TASK &task) { return task.AppArgs; }},
      {"action", [](ZELO_SCHED_TASK &task) { return task.Action; }},
      {"week", [](ZELO_SCHED_TASK &task) { return task.Week; }},
      {"cmd", [](ZELO_SCHED_TASK &task) { return task.Command; }},
      {"next trigger time", [](ZELO_SCHED_TASK &task) { return task.NextTriggerTime; }},
  };
  ASSERT_EQ(std::size(fields), std::size(kTextKeys));
  for (const Field &field : fields) {
    makeList({"", "", ""});
    constexpr const char *kTexts[] = {"c", "a", "b"};
    for (size_t i = 0; i < std::size(kTexts); ++i) {
      field.of(tasks_[i])[0] = kTexts[i][0];
    }
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, field.key, kAscending), 0) << field.key;
    EXPECT_EQ(ids(), (std::vector<int>{1, 2, 0})) << field.key;
  }
}

TEST_F(SchedTaskListSortTest, ANumberSortsByPlaceInMemoryAndNotByValue) {
  for (const char *key : kNumberKeys) {
    makeList({"", "", "", ""});
    linkInOrder({2, 0, 3, 1});
    for (size_t i = 0; i < 4; ++i) {
      ZELO_SCHED_TASK &task = tasks_[i];
      const auto falling = static_cast<int32_t>(9 - i);
      for (int32_t *field : {&task.Backend, &task.State, &task.Type, &task.Listable}) {
        *field = falling;
      }
      for (uint32_t *field : {&task.Owner, &task.RunHour, &task.StartYear}) {
        *field = static_cast<uint32_t>(falling);
      }
    }
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, key, kAscending), 0) << key;
    EXPECT_EQ(ids(), (std::vector<int>{0, 1, 2, 3})) << key;
    linkInOrder({2, 0, 3, 1});
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, key, kDescending), 0) << key;
    EXPECT_EQ(ids(), (std::vector<int>{3, 2, 1, 0})) << key;
  }
}

TEST_F(SchedTaskListSortTest, OneRecordIsLinkedToItself) {
  for (const int direction : {kAscending, kDescending}) {
    makeList({"only"});
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", direction), 0);
    EXPECT_EQ(head_, &tasks_[0]);
    EXPECT_EQ(tasks_[0].next, nullptr);
    EXPECT_EQ(ZELOSchedTaskListSortEx(&head_, kRowOfId, direction), 0);
    EXPECT_EQ(head_, &tasks_[0]);
    EXPECT_EQ(tasks_[0].next, nullptr);
  }
}

TEST_F(SchedTaskListSortTest, TheIndexIsTheRowOfTheFieldTable) {
  makeList({"c", "a", "b"});
  EXPECT_EQ(ZELOSchedTaskListSortEx(&head_, kRowOfName, kAscending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{1, 2, 0}));
  EXPECT_EQ(ZELOSchedTaskListSortEx(&head_, kRowOfId, kAscending), 0);
  EXPECT_EQ(ids(), (std::vector<int>{0, 1, 2}));
}

TEST_F(SchedTaskListSortTest, RecordsAreRelinkedAndNeverCopied) {
  makeList({"b", "a"});
  const ZELO_SCHED_TASK *first = &tasks_[0];
  const ZELO_SCHED_TASK *second = &tasks_[1];
  ASSERT_EQ(ZELOSchedTaskListSort(&head_, "name", kAscending), 0);
  EXPECT_EQ(head_, second);
  EXPECT_EQ(head_->next, first);
  EXPECT_EQ(first->next, nullptr);
  EXPECT_STREQ(tasks_[0].Name, "b");
  EXPECT_STREQ(tasks_[1].Name, "a");
}

TEST_F(SchedTaskListSortTest, AnUnknownKeyFailsInSilenceAndLeavesTheList) {
  makeList({"b", "a"});
  for (const char *key : {"", "Name", "name ", "nam", "next"}) {
    EXPECT_EQ(ZELOSchedTaskListSort(&head_, key, kAscending), -1) << key;
    EXPECT_EQ(ids(), (std::vector<int>{0, 1})) << key;
  }
  expectSilence();
}

TEST_F(SchedTaskListSortTest, AnEmptyListIsSortedByKey) {
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "name", kAscending), 0);
  EXPECT_EQ(ZELOSchedTaskListSort(&head_, "no such key", kAscending), 0);
  expectSilence();
}

TEST_F(SchedTaskListSortTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  expectRefused(
      "sched_task_list_sort.cpp",
      {{"NULL != *pTaskList", [&] { return ZELOSchedTaskListSortEx(&head_, kRowOfName, 1); }},
       {"((void *)0) != pTaskList", [] { return ZELOSchedTaskListSort(nullptr, "name", 1); }},
       {"((void *)0) != pTaskList", [] { return ZELOSchedTaskListSort(nullptr, nullptr, 1); }},
       {"NULL != szKey", [&] { return ZELOSchedTaskListSort(&head_, nullptr, 1); }},
       {"((void *)0) != pTaskList",
        [] { return ZELOSchedTaskListSortEx(nullptr, kRowOfName, 1); }}});
}

TEST_F(SchedTaskListSortTest, WithoutMemoryTheListStaysAsItWas) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the address sanitizer has an allocator of its own";
  makeList({"c", "a", "b"});
  int result = 0;
  {
    FailingAllocation scope("calloc", {.error = ENOMEM});
    result = ZELOSchedTaskListSort(&head_, "name", kAscending);
  }
  EXPECT_EQ(result, -1);
  EXPECT_EQ(ids(), (std::vector<int>{0, 1, 2}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0100, "sched_task_list_sort.cpp"}));
  EXPECT_EQ(logged(),
            Lines{"sched_task_list_sort.cpp:N calloc [3] failed. Cannot allocate memory"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

TEST_F(SchedTaskListSortTest, ThePointerArrayIsTheOnlyAllocation) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "the address sanitizer has an allocator of its own";
  makeList({"c", "a", "b", "d"});
  unsigned callocs = 0;
  unsigned others = 0;
  {
    const FailPlan countOnly = {.from = kAlways};
    FailingAllocation callocScope("calloc", countOnly);
    ZELOSchedTaskListSort(&head_, "name", kAscending);
    callocs = callCount("calloc");
    others = callCount("malloc") + callCount("realloc");
  }
  EXPECT_EQ(callocs, 1U);
  EXPECT_EQ(others, 0U);
  EXPECT_EQ(ids(), (std::vector<int>{1, 2, 0, 3}));
}

TEST_F(SchedTaskListSortTest, RandomListsAreSortedStably) {
  constexpr int kLists = 200;
  std::mt19937 random(1);
  for (int list = 0; list < kLists; ++list) {
    std::vector<std::string> names(1 + random() % 40);
    for (std::string &name : names) name = std::string(1, static_cast<char>('A' + random() % 10));
    std::vector<int> wanted(names.size());
    for (size_t i = 0; i < wanted.size(); ++i) wanted[i] = static_cast<int>(i);
    std::stable_sort(wanted.begin(), wanted.end(), [&](int a, int b) {
      return names[static_cast<size_t>(a)] < names[static_cast<size_t>(b)];
    });
    makeList(names);
    ASSERT_EQ(ZELOSchedTaskListSort(&head_, "name", kAscending), 0);
    ASSERT_EQ(ids(), wanted) << "list " << list;
    makeList(names);
    ASSERT_EQ(ZELOSchedTaskListSort(&head_, "name", kDescending), 0);
    std::reverse(wanted.begin(), wanted.end());
    ASSERT_EQ(ids(), wanted) << "list " << list;
  }
}

}  // namespace
}  // namespace support
