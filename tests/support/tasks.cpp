#include "tasks.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

namespace support {
namespace {

// Not from the library, so that a test of its allocation is not disturbed by a helper's.
Task zeroedTask() {
  auto *task = static_cast<ZELO_SCHED_TASK *>(std::calloc(1, sizeof(ZELO_SCHED_TASK)));
  if (task == nullptr) throw std::bad_alloc();
  return Task(task);
}

}  // namespace

void FreeTask::operator()(ZELO_SCHED_TASK *task) const {
  std::free(task);
}

void FreeTaskList::operator()(ZELO_SCHED_TASK *list) const {
  ZELOSchedTaskListFree(&list);
}

void copyText(char *field, size_t capacity, const std::string &text) {
  const size_t length = std::min(text.size(), capacity - 1);
  std::memcpy(field, text.data(), length);
  std::memset(field + length, 0, capacity - length);
}

Task makeTask(const std::string &name, const std::string &command) {
  Task task = zeroedTask();
  task->Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  task->ID = ZELO_SCHED_ID_NEW;
  setText(task->Name, name);
  task->State = ZELO_SCHED_STATE_ENABLED;
  task->Type = ZELO_SCHED_TYPE_DAILY;
  setText(task->Week, "1111111");
  task->StartYear = 2012;
  task->StartMonth = 1;
  task->StartDay = 1;
  setText(task->EditDialog, "ZELO.TOV.TaskScheduler.EditDialog");
  for (int32_t *flag :
       {&task->Listable, &task->CanEditName, &task->CanEditOwner, &task->CanRunAppSameTime,
        &task->CanRunFromUI, &task->CanDeleteFromUI, &task->CanEditFromUI}) {
    *flag = 1;
  }
  setText(task->App, "ZELO.TOV.TaskScheduler.Script");
  setText(task->AppName, "Script");
  setText(task->Action, name);
  setText(task->Command, command);
  return task;
}

long saveTask(const Task &task) {
  EXPECT_EQ(ZELOSchedTaskSave(task.get()), 0) << "cannot save task " << task->Name;
  return task->ID;
}

Task loadTask(long id) {
  Task task = zeroedTask();
  if (ZELOSchedTaskGetByID(id, task.get()) != 0) task->State = ZELO_SCHED_STATE_NOT_EXISTED;
  return task;
}

}  // namespace support
