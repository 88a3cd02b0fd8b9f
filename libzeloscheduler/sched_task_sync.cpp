// Writing every backend's tasks to the crontab and the power hardware.
#include <zelosched.h>

#include "sched_backend.h"
#include "sched_report.h"

int ZELOSchedTaskSync(void) {
  SCHED_INIT_BACKENDS_OR_RETURN(-1);
  for (uint32_t i = 0; i < cBackend; ++i) {
    if (SchedBackends[i].sync != nullptr && SchedBackends[i].sync() < 0) {
      SCHED_LOG_CALLEE("Failed to sync for backend [%d] ", static_cast<int>(i));
    }
  }
  return 0;
}
