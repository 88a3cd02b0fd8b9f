// zelosched sync
#include "sync.h"

#include <zelosdk.h>

#include <cstdio>
#include <string>

#include "alarm_check.h"
#include "change_lock.h"
#include "command.h"
#include "failure.h"
#include "options.h"
#include "save.h"
#include "task_list.h"

namespace {

// A power list that cannot be read is told in the end, but keeps no task out of the crontab.
void writeTasksOut() {
  const std::string fault = unreadableTask(TaskList(TaskList::Unreadable::kIsLeftOut));
  if (!fault.empty()) {
    throw Failure("the crontab was not written, as cron may then pass over all of it: " + fault);
  }
  forgetError();
  if (ZELOSchedTaskSync() < 0) throw failedTo("write the tasks out");
  requireCrontabInStep();
}

void armClock() {
  forgetError();
  if (ZELOAutoPoweronSet() < 0) throw failedTo("arm the clock for the next power-on time");
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
  try {
    writeTasksOut();
  } catch (const Failure &) {
    // The machine goes on at its time whatever is wrong with the tasks.
    attempt(armClock);
    throw;
  }
}

const Command kSyncCommand = {
    "sync", "", "write the tasks into the crontab again",
    "Writes the lines of all enabled tasks into /etc/crontab again, and arms the clock\n"
    "for the next power-on time. Other lines stay as they are, and all do while an enabled\n"
    "task has a field that cron cannot read.\n",
    runSync};
