// Creating a task with the backend that the record names.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_hook.h"
#include "sched_report.h"

int ZELOSchedTaskCreate(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  const SchedDispatched create =
      schedDispatch(pTask, &ZELO_SCHED_BACKEND::create, "create", SCHED_HERE);
  if (create.served) {
    return create.result;
  }
  // Plugins are run only for a task that no backend took, not for one that was created. The error
  // record says that no backend was found, whatever the plugins do.
  const SchedErrorRecord reason;
  SchedHook hook("task_create", nullptr, pTask);
  hook.after(-1, SCHED_HERE);
  reason.restore();
  return -1;
}
