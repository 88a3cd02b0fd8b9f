// The tasks of every backend as one list; walking and freeing such a list.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_guards.h"
#include "sched_record.h"
#include "sched_report.h"

int ZELOSchedTaskListGet(ZELO_SCHED_TASK **pTaskList, ZELO_SCHED_TASK_FILTER filter) {
  SCHED_CHECK_ARG(pTaskList != nullptr, "((void *)0) != pTaskList", -1);
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  TaskChain tasks;
  int total = 0;
  // Not reset for each backend: one without list_get adds the count of the one before it again.
  int added = 0;
  for (uint32_t i = 0; i < cBackend; ++i) {
    if (SchedBackends[i].list_get != nullptr) {
      added = SchedBackends[i].list_get(tasks.handle(), filter);
      if (added < 0) {
        SCHED_LOG_CALLEE("Failed to list_get for backend [%d] ", static_cast<int>(i));
        continue;
      }
    }
    total += added;
  }
  if (total > 0) {
    *pTaskList = tasks.release();
  }
  return total;
}

ZELO_SCHED_TASK *ZELOSchedTaskNext(ZELO_SCHED_TASK *pTask) {
  return pTask != nullptr ? pTask->next : nullptr;
}

void ZELOSchedTaskListFree(ZELO_SCHED_TASK **pTaskList) {
  if (pTaskList == nullptr) {
    return;
  }
  while (*pTaskList != nullptr) {
    ZELO_SCHED_TASK *first = *pTaskList;
    *pTaskList = first->next;
    schedRecordFree(first);
  }
}
