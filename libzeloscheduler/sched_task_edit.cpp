// Overwriting a stored task, with plugins run before and after.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_hook.h"
#include "sched_report.h"

namespace {

int editStoredTask(ZELO_SCHED_TASK *pTask) {
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  return schedDispatch(pTask, &ZELO_SCHED_BACKEND::edit, "edit", SCHED_HERE).result;
}

}  // namespace

int ZELOSchedTaskEdit(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  ZELO_SCHED_TASK stored = {};
  if (ZELOSchedTaskGetByID(pTask->ID, &stored) < 0) {
    SCHED_LOG_CALLEE("get task failed. id:[%ld] ", static_cast<long>(pTask->ID));
    return -1;
  }
  int result = -1;
  SchedHook hook("task_edit", &stored, pTask);
  if (hook.live()) {
    hook.before(SCHED_HERE);
    result = editStoredTask(pTask);
  }
  hook.after(result, SCHED_HERE);
  return result;
}
