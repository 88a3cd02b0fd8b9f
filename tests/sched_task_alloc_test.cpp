// New task records and their end.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

using support::ErrorRecord;
using support::errorRecord;
using support::FakeBackends;
using support::logged;
using support::Task;
using Lines = std::vector<std::string>;

class TaskAllocTest : public support::SandboxTest {};
class TaskFreeTest : public support::SandboxTest {};

TEST_F(TaskAllocTest, ANewTaskHasTheDefaultsOfZeloschedule) {
  const Task task(ZELOSchedTaskAlloc());
  ASSERT_NE(task, nullptr);
  ZELO_SCHED_TASK defaults = support::taskOf(ZELO_SCHED_BACKEND_SCHEDULE, 0);
  ASSERT_GE(ZELOSchedTaskGetDefault(&defaults), 0);
  EXPECT_EQ(std::memcmp(task.get(), &defaults, sizeof(defaults)), 0);
  EXPECT_EQ(task->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_EQ(task->ID, ZELO_SCHED_ID_NEW);
  EXPECT_STREQ(task->Name, "Task 1");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskAllocTest, TheDefaultIsNamedAfterTheNextFreeId) {
  support::saveTask(support::makeTask("first", "/bin/true"));
  const Task task(ZELOSchedTaskAlloc());
  ASSERT_NE(task, nullptr);
  EXPECT_STREQ(task->Name, "Task 2");
}

TEST_F(TaskAllocTest, WhatTheBackendDoesNotFillIsZero) {
  FakeBackends fakes(1);
  const Task task(ZELOSchedTaskAlloc());
  ASSERT_NE(task, nullptr);
  const ZELO_SCHED_TASK expected = support::taskOf(ZELO_SCHED_BACKEND_SCHEDULE, 0);
  EXPECT_EQ(std::memcmp(task.get(), &expected, sizeof(expected)), 0);
}

TEST_F(TaskAllocTest, ZeloscheduleIsAskedForTheDefaults) {
  FakeBackends fakes(2);
  std::swap(SchedBackends[0].id, SchedBackends[1].id);
  const Task task(ZELOSchedTaskAlloc());
  EXPECT_EQ(fakes.calls(), Lines{"get_default 1 id 0"});
}

TEST_F(TaskAllocTest, MemoryThatIsShortIsReported) {
  if (!support::kAllocationsCanFail) GTEST_SKIP() << "the sanitizer has its own allocator";
  ZELO_SCHED_TASK *task = nullptr;
  {
    const support::FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)});
    task = ZELOSchedTaskAlloc();
  }
  EXPECT_EQ(task, nullptr);
  EXPECT_EQ(logged(), Lines{"sched_task_alloc.cpp:N Allocate ZELO_SCHED_TASK failed. "
                            "Cannot allocate memory"});
  EXPECT_EQ(support::loggedPriorities(), std::vector<int>{3});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "sched_task_alloc.cpp"}));
}

TEST_F(TaskAllocTest, DefaultsThatCannotBeHadAreReported) {
  FakeBackends fakes(1);
  fakes[0].get_default = -7;
  EXPECT_EQ(ZELOSchedTaskAlloc(), nullptr);
  EXPECT_EQ(logged(),
            (Lines{"sched_task_get.cpp:N Failed to get_default for backend [0] id:[0] "
                   "[0x4321 fake.cpp:N]",
                   "sched_task_alloc.cpp:N Init task to default failed. [0x4321 fake.cpp:N]"}));
  EXPECT_EQ(errorRecord(), (ErrorRecord{support::kFakeError, support::kFakeFile}));
}

TEST_F(TaskAllocTest, BackendsThatCannotBeRegisteredAreReported) {
  FakeBackends fakes(1);
  support::failBackendInit();
  EXPECT_EQ(ZELOSchedTaskAlloc(), nullptr);
  EXPECT_EQ(logged(), (Lines{"sched_task_get.cpp:N Init backend failed. [0x0000 :N]",
                             "sched_task_alloc.cpp:N Init task to default failed. [0x0000 :N]"}));
}

TEST_F(TaskFreeTest, ATaskIsReleased) {
  ZELO_SCHED_TASK *task = ZELOSchedTaskAlloc();
  ASSERT_NE(task, nullptr);
  EXPECT_EQ(ZELOSchedTaskFree(task), 0);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskFreeTest, TheRestOfAListIsLeftAlone) {
  const Task second(ZELOSchedTaskAlloc());
  ZELO_SCHED_TASK *first = ZELOSchedTaskAlloc();
  first->next = second.get();
  EXPECT_EQ(ZELOSchedTaskFree(first), 0);
  EXPECT_STREQ(second->Name, "Task 1");
}

TEST_F(TaskFreeTest, ATaskMustBeGiven) {
  EXPECT_EQ(ZELOSchedTaskFree(nullptr), -1);
  EXPECT_EQ(logged(),
            Lines{"sched_task_alloc.cpp:N Invaild Argument (((void *)0) != pTask)=[0]\n"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_alloc.cpp"}));
}

}  // namespace
