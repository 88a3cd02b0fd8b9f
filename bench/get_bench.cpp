// Reading one task, compared with just reading the file: from a store that the process has read,
// from one that it has not, and from one that was changed just now.
#include <zelosched.h>

#include "support/row.h"
#include "support/stored_tasks.h"

namespace {

constexpr int kTasks = 1000;

void get(int id) {
  static ZELO_SCHED_TASK task;
  orDie(ZELOSchedTaskGetByID(id, &task) == 0, "ZELOSchedTaskGetByID");
}

void getLast() {
  get(kTasks);
}

void fillOldStore() {
  fillStore(kTasks);
  growOld();
}

}  // namespace

void makeRows() {
  constexpr double kMost = 1.5;
  constexpr char kReading[] = "read the file, 1000 tasks";
  Row("ZELOSchedTaskGetByID in 1000 tasks", Work{getLast, fillOldStore})
      .atMost(kMost, kReading, Work{readStore, fillOldStore, forgetStore});
  Row("... when the file must be read", Work{getLast, fillOldStore, forgetStore})
      .atMost(kMost, kReading);
  Row("... when it was changed just now", Work{getLast, [] { fillStore(kTasks); }, forgetStore})
      .atMost(kMost, kReading);
}
