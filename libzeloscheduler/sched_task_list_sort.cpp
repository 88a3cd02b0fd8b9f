// Sorting a list by one field, by relinking its records.
#include <zelosched.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <utility>

#include "sched_guards.h"
#include "sched_parm_table.h"
#include "sched_report.h"

namespace {

constexpr int kAscending = 1;

using TaskArray = std::unique_ptr<ZELO_SCHED_TASK *[], MemoryDeleter>;

bool isOutOfOrder(const SchedParm &parm, const ZELO_SCHED_TASK *pTask1,
                  const ZELO_SCHED_TASK *pTask2) {
  SCHED_CHECK_ARG(pTask1 != nullptr, "((void *)0) != pTask1", false);
  SCHED_CHECK_ARG(pTask2 != nullptr, "NULL != pTask2", false);
  return parm.compare(parm.fieldOf(pTask1), parm.fieldOf(pTask2)) > 0;
}

int countTasks(const ZELO_SCHED_TASK *pTask) {
  int count = 0;
  for (; pTask != nullptr; pTask = pTask->next) {
    ++count;
  }
  return count;
}

void fillArray(ZELO_SCHED_TASK **tasks, ZELO_SCHED_TASK *pTask) {
  for (; pTask != nullptr; pTask = pTask->next) {
    *tasks++ = pTask;
  }
}

void bubbleSort(const SchedParm &parm, ZELO_SCHED_TASK **tasks, int count) {
  bool exchanged = true;
  while (exchanged) {
    exchanged = false;
    for (int i = 0; i + 1 < count; ++i) {
      if (isOutOfOrder(parm, tasks[i], tasks[i + 1])) {
        std::swap(tasks[i], tasks[i + 1]);
        exchanged = true;
      }
    }
  }
}

ZELO_SCHED_TASK *linkForwards(ZELO_SCHED_TASK **tasks, int count) {
  for (int i = 0; i < count; ++i) {
    tasks[i]->next = i + 1 < count ? tasks[i + 1] : nullptr;
  }
  return tasks[0];
}

ZELO_SCHED_TASK *linkBackwards(ZELO_SCHED_TASK **tasks, int count) {
  for (int i = 0; i < count; ++i) {
    tasks[i]->next = i > 0 ? tasks[i - 1] : nullptr;
  }
  return tasks[count - 1];
}

}  // namespace

int ZELOSchedTaskListSortEx(ZELO_SCHED_TASK **pTaskList, int index, int direction) {
  SCHED_CHECK_ARG(pTaskList != nullptr, "((void *)0) != pTaskList", -1);
  SCHED_CHECK_ARG(*pTaskList != nullptr, "NULL != *pTaskList", -1);
  const int count = countTasks(*pTaskList);
  TaskArray tasks(static_cast<ZELO_SCHED_TASK **>(
      calloc(static_cast<size_t>(count), sizeof(ZELO_SCHED_TASK *))));
  if (tasks == nullptr) {
    SCHED_LOG_ERRNO("calloc [%d] failed. ", count);
    SCHED_SET_ERROR(kErrArrayAlloc);
    return -1;
  }
  fillArray(tasks.get(), *pTaskList);
  bubbleSort(parm_table[index], tasks.get(), count);
  *pTaskList = direction == kAscending ? linkForwards(tasks.get(), count)
                                       : linkBackwards(tasks.get(), count);
  return 0;
}

int ZELOSchedTaskListSort(ZELO_SCHED_TASK **pTaskList, const char *szKey, int direction) {
  SCHED_CHECK_ARG(pTaskList != nullptr, "((void *)0) != pTaskList", -1);
  SCHED_CHECK_ARG(szKey != nullptr, "NULL != szKey", -1);
  if (*pTaskList == nullptr) {
    return 0;
  }
  for (int row = 0; parm_table[row].szKey != nullptr; ++row) {
    if (strcmp(parm_table[row].szKey, szKey) == 0) {
      return ZELOSchedTaskListSortEx(pTaskList, row, direction);
    }
  }
  return -1;
}
