// The applications that come with the appliance's scheduler. That of the power schedule is not one
// of them.
#include <zelosched.h>

#include <cstring>

namespace {

constexpr const char *kBuildInApps[] = {
    "ZELO.TOV.TaskScheduler.Script",
    "ZELO.TOV.TaskScheduler.Recycle",
    "ZELO.TOV.TaskScheduler.Beep",
    "ZELO.TOV.TaskScheduler.Service",
};

}  // namespace

int ZELOSchedTaskIsBuildInApp(const ZELO_SCHED_TASK *pTask) {
  if (pTask == nullptr) {
    return 0;
  }
  for (const char *szApp : kBuildInApps) {
    if (strcmp(szApp, pTask->App) == 0) {
      return 1;
    }
  }
  return 0;
}
