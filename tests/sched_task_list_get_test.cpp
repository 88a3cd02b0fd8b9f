// Listing the tasks of every backend; walking and releasing a list.
#include <gtest/gtest.h>

#include <cstring>

#include "captured_log.h"
#include "fake_backends.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::FakeBackends;
using support::logged;
using support::TaskList;
using Lines = std::vector<std::string>;

Lines namesOf(ZELO_SCHED_TASK *task) {
  Lines names;
  for (; task != nullptr; task = ZELOSchedTaskNext(task)) names.emplace_back(task->Name);
  return names;
}

struct Listed {
  int result;
  TaskList list;
};

Listed listTasks(ZELO_SCHED_TASK_FILTER filter = nullptr) {
  ZELO_SCHED_TASK *head = nullptr;
  const int result = ZELOSchedTaskListGet(&head, filter);
  return {result, TaskList(head)};
}

class TaskListGetTest : public support::SandboxTest {};
class TaskNextTest : public support::SandboxTest {};
class TaskListFreeTest : public support::SandboxTest {};

TEST_F(TaskListGetTest, AListPointerMustBeGiven) {
  FakeBackends fakes(1);
  EXPECT_EQ(ZELOSchedTaskListGet(nullptr, nullptr), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_list_get.cpp:N Invaild Argument (((void *)0) != pTaskList)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_list_get.cpp"}));
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskListGetTest, BackendsThatCannotBeRegisteredAreReportedAndTheHeadIsLeftAlone) {
  FakeBackends fakes(1);
  fakes[0].tasks = {"a"};
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), -1);
  EXPECT_EQ(logged(), Lines{"sched_task_list_get.cpp:N Init backend failed. [0x0000 :N]"});
  EXPECT_EQ(head, &own);
  EXPECT_EQ(fakes.calls(), Lines{});
}

TEST_F(TaskListGetTest, TasksComeBackendByBackendInTheirOrder) {
  FakeBackends fakes(3);
  fakes[0].tasks = {"a", "b"};
  fakes[1].tasks = {"c"};
  fakes[2].tasks = {"d", "e"};
  const Listed listed = listTasks();
  EXPECT_EQ(listed.result, 5);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"a", "b", "c", "d", "e"}));
  EXPECT_EQ(fakes.calls(), (Lines{"list_get 0", "list_get 1", "list_get 2"}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskListGetTest, WhatTheHeadHeldBeforeIsNotPartOfTheList) {
  FakeBackends fakes(1);
  fakes[0].tasks = {"a"};
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), 1);
  const TaskList list(head);
  EXPECT_EQ(namesOf(head), Lines{"a"});
  EXPECT_EQ(own.next, nullptr);
}

TEST_F(TaskListGetTest, TheHeadIsLeftAloneWhenNothingIsListed) {
  FakeBackends fakes(2);
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), 0);
  EXPECT_EQ(head, &own);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskListGetTest, EveryRegisteredBackendOffersAList) {
  ASSERT_EQ(ZELOSchedBackendInit(), 0);
  for (uint32_t i = 0; i < cBackend; ++i) EXPECT_NE(SchedBackends[i].list_get, nullptr) << i;
}

TEST_F(TaskListGetTest, NoTaskInAnyRegisteredBackendIsNoFailure) {
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, nullptr), 0);
  EXPECT_EQ(head, &own);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskListGetTest, ABackendThatFailsIsReportedAndTheOthersAreListed) {
  FakeBackends fakes(3);
  fakes[0].tasks = {"a"};
  fakes[1].list_get = -5;
  fakes[2].tasks = {"b"};
  const Listed listed = listTasks();
  EXPECT_EQ(listed.result, 2);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"a", "b"}));
  EXPECT_EQ(logged(), Lines{"sched_task_list_get.cpp:N Failed to list_get for backend [1] "
                            "[0x4321 fake.cpp:N]"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskListGetTest, NothingIsListedWhenEveryBackendFails) {
  FakeBackends fakes(2);
  fakes[0].list_get = -1;
  fakes[1].list_get = -1;
  const Listed listed = listTasks();
  EXPECT_EQ(listed.result, 0);
  EXPECT_EQ(listed.list, nullptr);
  EXPECT_EQ(logged(), (Lines{"sched_task_list_get.cpp:N Failed to list_get for backend [0] "
                             "[0x4321 fake.cpp:N]",
                             "sched_task_list_get.cpp:N Failed to list_get for backend [1] "
                             "[0x4321 fake.cpp:N]"}));
}

TEST_F(TaskListGetTest, ABackendWithoutAListCountsTheOneBeforeItAgain) {
  FakeBackends fakes(3);
  fakes[0].tasks = {"a", "b"};
  SchedBackends[1].list_get = nullptr;
  fakes[2].tasks = {"c"};
  const Listed listed = listTasks();
  EXPECT_EQ(listed.result, 5);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"a", "b", "c"}));
}

TEST_F(TaskListGetTest, AFirstBackendWithoutAListCountsNothing) {
  FakeBackends fakes(2);
  SchedBackends[0].list_get = nullptr;
  fakes[1].tasks = {"a"};
  EXPECT_EQ(listTasks().result, 1);
}

TEST_F(TaskListGetTest, AFailureCountsAgainForABackendWithoutAListToo) {
  FakeBackends fakes(3);
  fakes[0].tasks = {"a", "b"};
  fakes[1].list_get = -1;
  SchedBackends[2].list_get = nullptr;
  const Listed listed = listTasks();
  EXPECT_EQ(listed.result, 1);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"a", "b"}));
}

TEST_F(TaskListGetTest, TheFilterReachesEveryBackend) {
  FakeBackends fakes(2);
  fakes[0].tasks = {"keep 1", "drop 1"};
  fakes[1].tasks = {"drop 2", "keep 2"};
  const Listed listed = listTasks(
      [](const ZELO_SCHED_TASK *task) { return std::strncmp(task->Name, "keep", 4) == 0 ? 5 : 0; });
  EXPECT_EQ(listed.result, 2);
  EXPECT_EQ(namesOf(listed.list.get()), (Lines{"keep 1", "keep 2"}));
}

TEST_F(TaskListGetTest, TheHeadIsLeftAloneWhenTheFilterDropsEverything) {
  support::saveTask(support::makeTask("a", "/bin/true"));
  ZELO_SCHED_TASK own = {};
  ZELO_SCHED_TASK *head = &own;
  EXPECT_EQ(ZELOSchedTaskListGet(&head, [](const ZELO_SCHED_TASK *) { return 0; }), 0);
  EXPECT_EQ(head, &own);
}

TEST_F(TaskListGetTest, StoredTasksAreListedWithTheirBackend) {
  support::saveTask(support::makeTask("a", "/bin/true"));
  support::saveTask(support::makeTask("b", "/bin/true"));
  const Listed listed = listTasks();
  ASSERT_EQ(listed.result, 2);
  ASSERT_EQ(namesOf(listed.list.get()).size(), 2U);
  for (ZELO_SCHED_TASK *task = listed.list.get(); task != nullptr; task = task->next) {
    EXPECT_EQ(task->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  }
  EXPECT_EQ(logged(), Lines{});
}

// ---- walking and releasing

TEST_F(TaskNextTest, TheNextRecordIsGiven) {
  ZELO_SCHED_TASK second = {};
  ZELO_SCHED_TASK first = {};
  first.next = &second;
  EXPECT_EQ(ZELOSchedTaskNext(&first), &second);
  EXPECT_EQ(ZELOSchedTaskNext(&second), nullptr);
}

TEST_F(TaskNextTest, NoTaskHasNoNextOne) {
  EXPECT_EQ(ZELOSchedTaskNext(nullptr), nullptr);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskListFreeTest, TheHeadEndsEmpty) {
  FakeBackends fakes(1);
  fakes[0].tasks = {"a", "b", "c"};
  ZELO_SCHED_TASK *head = nullptr;
  ASSERT_EQ(ZELOSchedTaskListGet(&head, nullptr), 3);
  ZELOSchedTaskListFree(&head);
  EXPECT_EQ(head, nullptr);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskListFreeTest, AnEmptyListStaysEmpty) {
  ZELO_SCHED_TASK *head = nullptr;
  ZELOSchedTaskListFree(&head);
  EXPECT_EQ(head, nullptr);
}

TEST_F(TaskListFreeTest, NoListIsNoFailure) {
  ZELOSchedTaskListFree(nullptr);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

}  // namespace
