// zelosched sync
#include "sync.h"

#include <cstdio>
#include <string>
#include <vector>

#include "alarm_check.h"
#include "change_lock.h"
#include "command.h"
#include "failure.h"
#include "options.h"
#include "save.h"
#include "task_check.h"
#include "task_list.h"

namespace {

// A line that cron cannot read may make it pass over all others: the ones that are there stay.
void requireReadable(const TaskList &list) {
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!isEnabled(*task)) continue;
    const std::vector<std::string> faults = unreadableFieldsOf(*task);
    if (faults.empty()) continue;
    throw Failure("the crontab was not written, as cron may then pass over all of it: " +
                  titleOf(*task) + ": " + faults.front() + ", or disable the task");
  }
}

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

void synchronise() {
  requireReadable(TaskList());
  forgetError();
  if (ZELOSchedTaskSync() < 0) throw failedTo("write the tasks out");
  requireCrontabInStep();
}

const Command kSyncCommand = {
    "sync", "", "write the tasks into the crontab again",
    "Writes the lines of all enabled tasks into /etc/crontab again, and arms the clock\n"
    "for the next power-on time. Other lines stay as they are.\n",
    runSync};
