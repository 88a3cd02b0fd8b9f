// zelosched log
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <thread>

#include "commands/command.h"
#include "commands/options.h"
#include "runs/history.h"
#include "runs/history_keep.h"
#include "runs/output_file.h"
#include "runs/run_output.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"run", Option::kValue}, {"follow", Option::kNone, 'f'}};
constexpr int64_t kMostRun = int64_t{1} << 62;
constexpr std::chrono::milliseconds kPause(100);

std::string leftOutLine(int64_t bytes) {
  return "\n[" + std::to_string(bytes) + " bytes are left out here]\n";
}

// The one that was asked for, or the last one of the task.
KeptRun chooseRun(int64_t id, std::optional<int64_t> number) {
  RunFilter filter;
  if (number) {
    filter.run = number;
  } else {
    filter.task = id;
  }
  filter.limit = 1;
  const std::vector<KeptRun> runs = keptRuns(filter);
  if (!runs.empty() && runs.front().task == id) return runs.front();
  if (number) {
    throw Failure("task " + std::to_string(id) + " has no run " + std::to_string(*number));
  }
  const Task task = loadTask(id);
  throw Failure(titleOf(*task) + " has not run yet");
}

bool isUnderWay(int64_t number) {
  RunFilter filter;
  filter.run = number;
  filter.underWay = true;
  return !keptRuns(filter).empty();
}

void requireWritten(const RunOutput &output) {
  if (!output.fault().empty()) throw Failure("cannot write the output: " + output.fault());
}

void showOutput(const Output &printed, RunOutput *output) {
  output->show(printed.head);
  if (printed.leftOut > 0) output->show(leftOutLine(printed.leftOut));
  output->show(printed.tail);
  output->finish();
}

void follow(const KeptRun &run, const OutputFile &file, RunOutput *output) {
  int64_t shown = 0;
  for (bool isLast = false;; std::this_thread::sleep_for(kPause)) {
    int64_t lost = 0;
    const int64_t total = file.total();
    const std::string bytes = file.since(shown, &lost);
    if (lost > 0) output->show(leftOutLine(lost));
    output->show(bytes);
    shown = std::max(total, shown + lost + static_cast<int64_t>(bytes.size()));
    if (isLast || !output->fault().empty()) break;
    isLast = !isUnderWay(run.run);
  }
  output->finish();
}

int runLog(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  if (ids.size() > 1) throw UsageError("one task at a time");
  const std::optional<int64_t> number = arguments.number("run", 1, kMostRun);
  if (geteuid() == 0) attempt([] { sweepRuns(); });
  const KeptRun run = chooseRun(ids.front(), number);
  RunOutput output(-1);
  if (run.state != RunState::kEnded) {
    const OutputFile file = OutputFile::open(run.process);
    if (file.isOpen()) {
      if (arguments.has("follow")) {
        follow(run, file, &output);
      } else {
        showOutput(file.contents(), &output);
      }
      requireWritten(output);
      return kDone;
    }
  }
  const std::optional<Output> printed = outputOf(KeptDatabase(KeptDatabase::kRead), run.run);
  if (printed) {
    showOutput(*printed, &output);
  } else if (run.outputBytes > 0) {
    throw Failure(counted(static_cast<size_t>(run.outputBytes), "byte") + " that run " +
                  std::to_string(run.run) + " printed are not kept any more");
  } else if (run.keeper.pid == 0) {
    throw Failure("what run " + std::to_string(run.run) +
                  " printed is not known: another program "
                  "started it");
  }
  requireWritten(output);
  return kDone;
}

}  // namespace

const Command kLogCommand = {
    "log", "ID [--run N] [--follow]", "show what a run printed",
    "Shows what the last run of the task printed, or what it has printed so far. Of much\n"
    "output the beginning and the end are kept, and a line says how much is left out\n"
    "between them. On a terminal, control characters are made visible.\n"
    "\n"
    "  --run N                        that run, by its number in the history\n"
    "  -f, --follow                   goes on until the run ends\n",
    runLog};
