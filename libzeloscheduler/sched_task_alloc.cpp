// Allocating a record with the defaults of ordinary tasks, and freeing it.
#include <zelosched.h>

#include "sched_record.h"
#include "sched_report.h"

ZELO_SCHED_TASK *ZELOSchedTaskAlloc(void) {
  TaskGuard task = schedRecordAlloc();
  if (task == nullptr) {
    SCHED_LOG_ERRNO("Allocate ZELO_SCHED_TASK failed. ");
    SCHED_SET_ERROR(kErrRecordAlloc);
    return nullptr;
  }
  task->Backend = ZELO_SCHED_BACKEND_SCHEDULE;
  if (ZELOSchedTaskGetDefault(task.get()) < 0) {
    SCHED_LOG_CALLEE("Init task to default failed. ");
    return nullptr;
  }
  return task.release();
}

int ZELOSchedTaskFree(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  schedRecordFree(pTask);
  return 0;
}
