// Create or edit, by the id alone.
#include <zelosched.h>

#include "sched_report.h"

int ZELOSchedTaskSave(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  if (pTask->ID == ZELO_SCHED_ID_NEW) {
    if (ZELOSchedTaskCreate(pTask) < 0) {
      SCHED_LOG_CALLEE("Add task failed. ");
      return -1;
    }
    return 0;
  }
  if (ZELOSchedTaskEdit(pTask) < 0) {
    SCHED_LOG_CALLEE("Set task failed. [%ld] ", static_cast<long>(pTask->ID));
    return -1;
  }
  return 0;
}
