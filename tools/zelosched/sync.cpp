// zelosched sync
#include <cstdio>

#include "change_lock.h"
#include "command.h"
#include "failure.h"
#include "options.h"
#include "save.h"
#include "task_list.h"

namespace {

int runSync(int argc, char **argv) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const ChangeLock lock;
  forgetError();
  if (ZELOSchedTaskSync() < 0) throw failedTo("write the tasks out");
  requireCrontabInStep();
  std::puts("the crontab and the power times are in step with the tasks");
  return kDone;
}

}  // namespace

const Command kSyncCommand = {
    "sync", "", "write the tasks into the crontab again",
    "Writes the lines of all enabled tasks into /etc/crontab again, and arms the clock\n"
    "for the next power-on time. Other lines stay as they are.\n",
    runSync};
