#include "store/synchronise.h"

#include <zelosched.h>
#include <zelosdk.h>

#include <string>

#include "store/held_signals.h"
#include "store/save.h"
#include "store/store_copy.h"
#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

// A power list that cannot be read is reported at the end, after the tasks are in the crontab.
void writeTasksOut() {
  requireTasksAreBack();
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

}  // namespace

void synchronise() {
  const HeldSignals held;
  try {
    writeTasksOut();
  } catch (const Failure &) {
    // The machine must switch on at its time whatever is wrong with the tasks.
    attempt(armClock);
    throw;
  }
}
