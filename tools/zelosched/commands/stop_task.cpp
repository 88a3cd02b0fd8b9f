#include "commands/stop_task.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "runs/stop_run.h"
#include "terminal/failure.h"

namespace {

void tell(const std::string &title, Stopped how, FILE *to) {
  const char *what = "";
  switch (how) {
    case Stopped::kCancelled:
      what = "was waiting for its turn and will not run";
      break;
    case Stopped::kEnded:
      what = "stopped";
      break;
    case Stopped::kKilled:
      what = "stopped; something of it had to be killed";
      break;
    case Stopped::kWasOver:
      what = "was over already";
      break;
    case Stopped::kPartly:
      what = "stopped; processes that its command had left to themselves could not be found";
      break;
    case Stopped::kNot:
      throw Failure(title +
                    " could not be ended: it starts new processes all the time, or waits for a "
                    "device");
  }
  std::fprintf(to, "%s %s\n", title.c_str(), what);
}

}  // namespace

size_t stopTask(int64_t id, const std::string &title, std::chrono::seconds grace) {
  std::vector<KeptRun> runs = runsToStop(id);
  if (runs.empty()) return 0;
  noteStop(&runs);
  for (const KeptRun &run : runs) tell(title, stopRun(run, grace), stdout);
  return runs.size();
}

void tellOfRunsOf(const TaskRecord &task, FILE *to) {
  if (geteuid() != 0 || isPower(task)) return;
  attempt([&] {
    for (const KeptRun &run : runsToStop(task.ID)) {
      std::fprintf(to, "a run of it %s: 'zelosched stop %d' ends it\n",
                   run.state == RunState::kWaiting ? "waits for its turn, and will start"
                                                   : "is under way, and goes on",
                   task.ID);
    }
  });
}

void cancelWaitingOf(const TaskRecord &task, FILE *to) {
  if (geteuid() != 0 || isPower(task)) return;
  std::vector<KeptRun> runs;
  try {
    RunFilter filter;
    filter.task = task.ID;
    filter.underWay = true;
    runs = keptRuns(filter);
  } catch (const Failure &failure) {
    throw Failure(
        std::string("whether a run of it waits for its turn, and may still start, cannot be "
                    "told: ") +
        failure.what());
  }
  std::erase_if(runs, [](const KeptRun &run) {
    return run.state != RunState::kWaiting || !isAlive(run.process);
  });
  if (!runs.empty()) noteStop(&runs);
  for (const KeptRun &run : runs) {
    if (cancelWaiting(run.process)) tell("a run of it", Stopped::kCancelled, to);
  }
}
