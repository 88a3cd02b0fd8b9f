// The hook around one change of a task, from before the change to after it.
#ifndef SCHED_HOOK_H
#define SCHED_HOOK_H

#include <zelosched.h>

#include "sched_report.h"

// A plugin cannot veto a change: its failure is only logged, with the source location of the
// change.
class SchedHook {
 public:
  SchedHook(const char *szAction, const ZELO_SCHED_TASK *pOrg, const ZELO_SCHED_TASK *pNew)
      : live_(ZELOSchedTaskPluginInit(&plugin_, szAction, pOrg, pNew) == 0) {}
  SchedHook(const SchedHook &) = delete;
  SchedHook &operator=(const SchedHook &) = delete;

  bool live() const { return live_; }

  void before(SchedSourceLocation location) {
    if (ZELOSchedTaskPlugin(ZELO_SCHED_PLUGIN_PRE, &plugin_) < 0) {
      SCHED_LOG_AT(location, "Fail to execute task plugin (PRE)");
    }
  }

  // Also called for a hook that is not live, to log that no plugin was run. The error record of a
  // failed change is restored after the plugins.
  void after(int result, SchedSourceLocation location) {
    const SchedErrorRecord reason;
    plugin_.result = result;
    if (ZELOSchedTaskPlugin(ZELO_SCHED_PLUGIN_POST, &plugin_) < 0) {
      SCHED_LOG_AT(location, "Fail to execute task plugin (POST)");
    }
    ZELOSchedTaskPluginExit(&plugin_);
    if (result < 0) {
      reason.restore();
    }
  }

 private:
  ZELO_SCHED_PLUGIN plugin_ = {};
  bool live_;
};

#endif
