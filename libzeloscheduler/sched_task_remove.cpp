// Deleting a stored task, with plugins run before and after.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_hook.h"
#include "sched_report.h"

namespace {

int removeStoredTask(const ZELO_SCHED_TASK &stored, long id) {
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  const int index = schedFindBackend(stored.Backend, &ZELO_SCHED_BACKEND::remove);
  if (index < 0) {
    SCHED_LOG("No %s backend is found for task [%ld] ", "remove", id);
    SCHED_SET_ERROR(kErrNotFound);
    return -1;
  }
  if (SchedBackends[index].remove(id) < 0) {
    SCHED_LOG_CALLEE("Failed to remove for backend [%d] id:[%ld] ", index, id);
    return -1;
  }
  return 0;
}

}  // namespace

int ZELOSchedTaskRemove(long id) {
  ZELO_SCHED_TASK stored = {};
  if (ZELOSchedTaskGetByID(id, &stored) < 0) {
    SCHED_LOG_CALLEE("get task failed. id:[%ld] ", id);
    return -1;
  }
  int result = -1;
  SchedHook hook("task_remove", &stored, nullptr);
  if (hook.live()) {
    hook.before(SCHED_HERE);
    result = removeStoredTask(stored, id);
  }
  hook.after(result, SCHED_HERE);
  return result;
}
