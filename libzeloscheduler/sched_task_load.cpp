// A task to show in an editor: a stored one, or the default for a new one.
#include <zelosched.h>

#include "sched_report.h"

int ZELOSchedTaskLoad(long id, ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(-1 <= id, "-1 <= id", -1);
  SCHED_CHECK_ARG(pTask != nullptr, "NULL != pTask", -1);
  if (id == ZELO_SCHED_ID_NEW) {
    if (ZELOSchedTaskGetDefault(pTask) < 0) {
      SCHED_LOG_CALLEE("get default task failed. ");
      return -1;
    }
    return 0;
  }
  if (ZELOSchedTaskGetByID(id, pTask) < 0) {
    SCHED_LOG_CALLEE("get task failed. [%ld] ", id);
    return -1;
  }
  return 0;
}
