// zelosched sync
#include <cstdio>
#include <string>

#include "check/alarm_check.h"
#include "commands/command.h"
#include "commands/options.h"
#include "store/change_lock.h"
#include "store/synchronise.h"
#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

int runSync(int argc, char **argv) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const ChangeLock lock;
  synchronise();
  std::puts("the crontab is in step with the tasks");
  const std::string fault = alarmFault(TaskList());
  return fault.empty() ? kDone : complain(fault);
}

}  // namespace

const Command kSyncCommand = {
    "sync", "", "write the tasks into the crontab again",
    "Writes the lines of all enabled tasks into /etc/crontab again, and arms the clock\n"
    "for the next power-on time. Other lines stay as they are, and all do while an enabled\n"
    "task has a field that cron cannot read.\n",
    runSync};
