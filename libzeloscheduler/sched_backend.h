// Finding the backend that serves a call.
#ifndef SCHED_BACKEND_H
#define SCHED_BACKEND_H

#include <zelosched.h>

#include "sched_report.h"

// Makes sure that the table is filled before it is walked.
#define SCHED_INIT_BACKENDS_OR_RETURN(result)    \
  do {                                           \
    if (ZELOSchedBackendInit() < 0) {            \
      SCHED_LOG_CALLEE("Init backend failed. "); \
      return result;                             \
    }                                            \
  } while (0)

// The index of the first entry with that id whose slot of the operation is not null, or -1.
template <class Operation>
int schedFindBackend(int32_t backendId, Operation ZELO_SCHED_BACKEND::*slot) {
  for (uint32_t i = 0; i < cBackend; ++i) {
    if (SchedBackends[i].id == backendId && SchedBackends[i].*slot != nullptr) {
      return static_cast<int>(i);
    }
  }
  return -1;
}

struct SchedDispatched {
  bool served;  // false: no backend offers the operation for the task's backend id
  int result;
};

using SchedTaskOperation = int (*)(ZELO_SCHED_TASK *);

// Hands the task to the backend that its Backend field names. Failures are reported under
// `location`, with `szWord` as the operation's name.
SchedDispatched schedDispatch(ZELO_SCHED_TASK *pTask, SchedTaskOperation ZELO_SCHED_BACKEND::*slot,
                              const char *szWord, SchedSourceLocation location);

#endif
