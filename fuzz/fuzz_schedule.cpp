// The line and the runs of any record: the line is whole, and each run is a minute at which cron
// starts the task and it is due.
#include <zelosched.h>

#include <cstring>
#include <tuple>

#include "fuzz_input.h"
#include "schedule_cron.h"
#include "schedule_days.h"
#include "schedule_due.h"
#include "schedule_runs.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  constexpr int kRuns = 50;
  FuzzInput input(data, size);
  const ZELO_SCHED_DATE after = {1970 + input.number<uint8_t>() % 200U, 1, 1, 0, 0, 0};
  const ZELO_SCHED_TASK *task = anyTask(&input);
  const SchedCronLine line = schedCronLineOf(*task);
  require(strnlen(line.text, sizeof(line.text)) < sizeof(line.text));
  SchedRuns runs(*task, after);
  ZELO_SCHED_DATE last = after;
  ZELO_SCHED_DATE run = {};
  for (int i = 0; i < kRuns && runs.next(&run); ++i) {
    require(schedIsCronLineReadable(*task) && schedIsDue(*task, run) && schedIsCronDay(*task, run));
    require(std::tie(last.year, last.month, last.day, last.hour, last.minute) <
            std::tie(run.year, run.month, run.day, run.hour, run.minute));
    last = run;
  }
  return 0;
}
