// The table of backends, filled once in a process, in the order in which they are asked.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_report.h"
#include "sched_shared_names.h"

ZELO_SCHED_BACKEND SchedBackends[16];
uint32_t cBackend;

namespace {

constexpr uint32_t kMostBackends = sizeof(SchedBackends) / sizeof(SchedBackends[0]);

struct Registration {
  int32_t id;
  const char *szName;
  int (*init)(const char *szName, ZELO_SCHED_BACKEND *pBackend);
  const char *szInit;
};

constexpr Registration kRegistrations[] = {
    {ZELO_SCHED_BACKEND_SCHEDULE, "zeloschedule", zeloschedule_init, "zeloschedule_init"},
    {ZELO_SCHED_BACKEND_AUTOPOWER, "zeloautopower", zeloautopower_init, "zeloautopower_init"},
};

int registerBackend(const Registration &registration) {
  if (cBackend == kMostBackends) {
    SCHED_LOG("Too many backends");
    return -1;
  }
  ZELO_SCHED_BACKEND *entry = &SchedBackends[cBackend];
  entry->id = registration.id;
  if (registration.init(registration.szName, entry) < 0) {
    SCHED_LOG("Backend init failed on backends %s.", registration.szInit);
    return -1;
  }
  ++cBackend;
  return 0;
}

}  // namespace

SchedDispatched schedDispatch(ZELO_SCHED_TASK *pTask, SchedTaskOperation ZELO_SCHED_BACKEND::*slot,
                              const char *szWord, SchedSourceLocation location) {
  const int index = schedFindBackend(pTask->Backend, slot);
  if (index < 0) {
    SCHED_LOG_AT(location, "No %s backend (%ld) is found for task [%ld] ", szWord,
                 static_cast<long>(pTask->Backend), static_cast<long>(pTask->ID));
    QLIBCErrSetEx(kErrNotFound, location.file, location.line);
    return {false, -1};
  }
  const int result = (SchedBackends[index].*slot)(pTask);
  if (result < 0) {
    SCHED_LOG_CALLEE_AT(location, "Failed to %s for backend [%ld] id:[%ld] ", szWord,
                        static_cast<long>(index), static_cast<long>(pTask->ID));
  }
  return {true, result};
}

int ZELOSchedBackendInit(void) {
  static bool initialised = false;
  if (initialised) {
    return 0;
  }
  for (const Registration &registration : kRegistrations) {
    if (registerBackend(registration) < 0) {
      cBackend = 0;
      return -1;
    }
  }
  initialised = true;
  schedTakeNames();
  return 0;
}
