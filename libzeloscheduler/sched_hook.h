// The hook around one change of a task, from before the change to after it.
#ifndef SCHED_HOOK_H
#define SCHED_HOOK_H

#include <zelosched.h>

#include "sched_report.h"

// A plugin cannot veto a change: what it answers is logged, under the source location of the
// change, and goes no further.
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

  // Also for a hook that is not live: that the plugins could not be told is logged too. Why the
  // change failed stays in the error record, whatever the plugins do.
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
