// zelosched log
#include <json/json.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <thread>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/run_json.h"
#include "runs/history.h"
#include "runs/history_keep.h"
#include "runs/output_file.h"
#include "runs/run_output.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr Option kLogOptions[] = {
    {"run", Option::kValue}, {"follow", Option::kNone, 'f'}, {"json"}};
constexpr int64_t kMostRun = int64_t{1} << 62;
constexpr std::chrono::milliseconds kFollowPause(100);
constexpr std::chrono::seconds kSweepPause(1);

std::string leftOutLine(int64_t bytes) {
  return "\n[" + std::to_string(bytes) + " bytes are left out here]\n";
}

// The run of that number, or the task's last one that has started: a run that waits for its turn,
// or was cancelled then, has printed nothing.
KeptRun chooseRun(int64_t id, std::optional<int64_t> number) {
  RunFilter filter;
  if (number) {
    filter.run = number;
  } else {
    filter.task = id;
    filter.until = static_cast<int64_t>(time(nullptr));  // later ones are by a wrong clock
  }
  constexpr int64_t kMostWaiting = 50;
  filter.limit = kMostWaiting;
  const std::vector<KeptRun> runs = keptRuns(filter);
  const auto started = std::find_if(runs.begin(), runs.end(),
                                    [](const KeptRun &run) { return run.start.has_value(); });
  const auto chosen = started != runs.end() ? started : runs.begin();
  if (chosen != runs.end() && chosen->task == id) return *chosen;
  if (number) {
    throw Failure("task " + std::to_string(id) + " has no run " + std::to_string(*number));
  }
  const Task task = loadTask(id);
  throw Failure(titleOf(*task) + " has not run yet");
}

bool isUnderWay(int64_t number, ProcessName *keeper) {
  RunFilter filter;
  filter.run = number;
  filter.underWay = true;
  const std::vector<KeptRun> runs = keptRuns(filter);
  if (!runs.empty()) *keeper = runs.front().keeper;
  return !runs.empty();
}

// Where its keeper was killed, the sweep notes that a run has ended.
void sweepWithoutKeeper(const ProcessName &keeper) {
  if (geteuid() != 0 || isAlive(keeper)) return;
  try {
    sweepRuns();
  } catch (const Failure &) {  // it is tried again
  }
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
  ProcessName keeper = run.keeper;
  auto nextSweep = std::chrono::steady_clock::now();
  for (bool isLast = false;; std::this_thread::sleep_for(kFollowPause)) {
    int64_t lost = 0;
    const int64_t total = file.total();
    const std::string bytes = file.since(shown, &lost);
    if (lost > 0) output->show(leftOutLine(lost));
    output->show(bytes);
    shown = std::max(total, shown + lost + static_cast<int64_t>(bytes.size()));
    if (isLast || !output->fault().empty()) break;
    if (std::chrono::steady_clock::now() >= nextSweep) {
      sweepWithoutKeeper(keeper);
      nextSweep = std::chrono::steady_clock::now() + kSweepPause;
    }
    isLast = !isUnderWay(run.run, &keeper);
  }
  output->finish();
}

// For a run under way, what it has printed so far.
Output outputSoFar(const KeptRun &run) {
  if (run.state != RunState::kEnded) {
    const OutputFile file = OutputFile::open(run.process);
    if (file.isOpen()) return file.contents();
  }
  if (const auto printed = outputOf(KeptDatabase(KeptDatabase::kRead), run.run)) return *printed;
  const std::string number = std::to_string(run.run);
  if (run.outputBytes > 0) {
    throw Failure(counted(static_cast<size_t>(run.outputBytes), "byte") + " that run " + number +
                  " printed are not kept any more");
  }
  if (run.keeper.pid == 0) {
    throw Failure("what run " + number + " printed is not known: another program started it");
  }
  return {};
}

// Where bytes were left out, a character may have been cut: the rest of it is left out too.
Output withoutCutCharacters(Output printed) {
  if (printed.leftOut == 0) return printed;
  const auto isInside = [](char byte) {
    return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U;
  };
  constexpr size_t kMostInside = 3;
  const size_t atEnd = cutCharacterLength(printed.head);
  size_t atBegin = 0;
  while (atBegin < std::min(kMostInside, printed.tail.size()) && isInside(printed.tail[atBegin])) {
    ++atBegin;
  }
  printed.head.resize(printed.head.size() - atEnd);
  printed.tail.erase(0, atBegin);
  printed.leftOut += static_cast<int64_t>(atEnd + atBegin);
  return printed;
}

void printAsJson(const KeptRun &run, const Output &printed) {
  const bool isText = isUtf8(printed.head) && isUtf8(printed.tail);
  const auto encoded = [&](const std::string &bytes) {
    return isText ? jsonTextOrNull(bytes) : jsonTextOrNull(base64(bytes));
  };
  Json::Value top = topObject();
  top["run"] = jsonOf(run);
  top["output"]["head"] = encoded(printed.head);
  top["output"]["tail"] = encoded(printed.tail);
  top["output"]["left_out_bytes"] = Json::Int64(printed.leftOut);
  top["output"]["encoding"] = isText ? "utf-8" : "base64";
  printTop(top);
}

int runLog(int argc, char **argv) {
  const Arguments arguments(argc, argv, kLogOptions);
  arguments.requireNoCommand();
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  if (ids.size() > 1) throw UsageError("one task at a time");
  if (arguments.has("follow") && arguments.has("json")) {
    throw UsageError("'--follow' does not go with '--json'");
  }
  const std::optional<int64_t> number = arguments.number("run", 1, kMostRun);
  if (geteuid() == 0) attempt([] { sweepRuns(); });
  const KeptRun run = chooseRun(ids.front(), number);
  if (arguments.has("json")) {
    printAsJson(run, withoutCutCharacters(outputSoFar(run)));
    return kDone;
  }
  RunOutput output(-1);
  const OutputFile file =
      run.state != RunState::kEnded ? OutputFile::open(run.process) : OutputFile();
  if (arguments.has("follow") && file.isOpen()) {
    follow(run, file, &output);
  } else {
    showOutput(outputSoFar(run), &output);
  }
  requireWritten(output);
  return kDone;
}

}  // namespace

const Command kLogCommand = {
    "log", "TASK [--run N] [--follow | --json]", "show what a run printed",
    "Shows what the last run of the task printed, or what it has printed so far. Of much\n"
    "output the beginning and the end are kept, and a line says how much is left out\n"
    "between them. On a terminal, control characters are made visible.\n"
    "\n"
    "  --run N                        that run, by its number in the history\n"
    "  -f, --follow                   goes on until the run ends\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runLog};
