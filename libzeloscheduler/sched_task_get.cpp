// One task: the stored one of an id, or a backend's default.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_report.h"

namespace {

constexpr int kFound = 1;

bool mayOwn(const ZELO_SCHED_BACKEND &backend, long id) {
  return backend.owns_id == nullptr || backend.owns_id(id) != 0;
}

}  // namespace

int ZELOSchedTaskGetByID(long id, ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  for (uint32_t i = 0; i < cBackend; ++i) {
    const ZELO_SCHED_BACKEND &backend = SchedBackends[i];
    if (!mayOwn(backend, id) || backend.get_by_id == nullptr) {
      continue;
    }
    const int result = backend.get_by_id(id, pTask);
    if (result < 0) {
      SCHED_LOG_CALLEE("Failed to get_by_id for backend [%d] id:[%ld] ", static_cast<int>(i), id);
      return -1;
    }
    if (result == kFound) {
      return 0;
    }
  }
  SCHED_LOG("No %s backend is found for task [%ld] ", "get_by_id", id);
  SCHED_SET_ERROR(kErrNotFound);
  return -1;
}

int ZELOSchedTaskGetDefault(ZELO_SCHED_TASK *pTask) {
  SCHED_CHECK_ARG(pTask != nullptr, "((void *)0) != pTask", -1);
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  return schedDispatch(pTask, &ZELO_SCHED_BACKEND::get_default, "get_default", SCHED_HERE).result;
}
