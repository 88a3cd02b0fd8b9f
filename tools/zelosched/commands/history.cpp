// zelosched history
#include "runs/history.h"

#include <json/json.h>
#include <unistd.h>

#include <cstdio>
#include <ctime>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/run_json.h"
#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/moment_text.h"
#include "runs/result_text.h"
#include "runs/time_units.h"
#include "terminal/number.h"
#include "terminal/table.h"
#include "terminal/text.h"

namespace {

constexpr Option kHistoryOptions[] = {
    {"limit", Option::kValue, 'n'}, {"json"}, {"failed"}, {"since", Option::kValue},
    {"task", Option::kValue},       {"keep"}, {"tell"}};
constexpr int64_t kUsualLimit = 50;
constexpr int64_t kMostLines = 100000000;

std::string startText(const KeptRun &run) {
  const std::optional<int64_t> moment = run.start ? run.start : run.queued;
  if (!moment) return kNoValue;
  char seconds[16];
  std::snprintf(seconds, sizeof seconds, ":%02d", static_cast<int>(*moment % kMinute));
  return minuteText(localMinute(*moment)) + seconds;
}

// For a run under way, by the wall clock.
std::optional<int64_t> durationOf(const KeptRun &run) {
  if (run.duration) return static_cast<int64_t>(*run.duration);
  if (run.state != RunState::kRunning || !run.start) return std::nullopt;
  return std::max(int64_t{0}, static_cast<int64_t>(time(nullptr)) - *run.start);
}

std::string durationText(const KeptRun &run) {
  const std::optional<int64_t> seconds = durationOf(run);
  if (!seconds) return kNoValue;
  char rest[16];
  std::snprintf(rest, sizeof rest, ":%02d:%02d", static_cast<int>(*seconds % kHour / kMinute),
                static_cast<int>(*seconds % kMinute));
  return std::to_string(*seconds / kHour) + rest;
}

void print(const std::vector<KeptRun> &runs) {
  Table table({{"START"},
               {"DURATION", Column::kRight},
               {"RUN", Column::kRight},
               {"TASK", Column::kRight},
               {"OUTCOME", Column::kLeft, true},
               {"NAME", Column::kLeft, true}});
  for (const KeptRun &run : runs) {
    table.add({{startText(run)},
               {durationText(run)},
               {std::to_string(run.run)},
               {std::to_string(run.task)},
               {resultInWords(run), isBad(run) ? Emphasis::kBad : Emphasis::kNone},
               {run.taskName.empty() ? kNoValue : run.taskName}});
  }
  table.print();
}

void printAsJson(const std::vector<KeptRun> &runs) {
  std::vector<Json::Value> objects;
  for (const KeptRun &run : runs) objects.push_back(jsonOf(run));
  Json::Value top = topObject();
  top["runs"] = jsonList(objects);
  printTop(top);
}

// A removed task can be given by its id, not by its name.
std::optional<int64_t> taskOf(const Arguments &arguments) {
  std::vector<std::string> operands = arguments.operands();
  if (const std::optional<std::string> named = arguments.value("task")) operands.push_back(*named);
  if (operands.empty()) return std::nullopt;
  const std::vector<int64_t> ids = parseIds(operands);
  if (ids.size() > 1) throw UsageError("one task at a time");
  return ids.front();
}

int64_t momentOf(const std::string &text) {
  const std::optional<int64_t> moment = parseMoment(text, time(nullptr));
  if (moment) return *moment;
  throw UsageError(
      "'--since' takes a time such as 2026-12-24, '2026-12-24 18:30', 18:30 or 12h "
      "(ago), not '" +
      printable(text) + "'");
}

int runHistory(int argc, char **argv) {
  const Arguments arguments(argc, argv, kHistoryOptions);
  arguments.requireNoCommand();
  if (arguments.has("keep")) {
    arguments.requireNoOperands();
    if (argc > 2) throw UsageError("'--keep' stands alone");
    return keepHistory();
  }
  // Started by the sweep, whose unit restricts what it can do.
  if (arguments.has("tell")) return attempt(tellOfRuns);
  RunFilter filter;
  filter.task = taskOf(arguments);
  filter.failed = arguments.has("failed");
  if (const std::optional<std::string> since = arguments.value("since")) {
    filter.since = momentOf(*since);
  }
  filter.limit = arguments.number("limit", 1, kMostLines).value_or(kUsualLimit);
  // When the sweep fails, that is reported, and the history is shown all the same.
  int status = geteuid() == 0 ? attempt([] { sweepRuns(); }) : kDone;
  std::vector<KeptRun> runs;
  const int read = attempt([&] { runs = keptRuns(filter); });
  if (read != kDone) return read;
  // An empty table would say that there was no run.
  if (status != kDone && runs.empty()) return status;
  if (arguments.has("json")) {
    printAsJson(runs);
  } else {
    print(runs);
  }
  return status;
}

}  // namespace

const Command kHistoryCommand = {
    "history", "[TASK] [--failed] [--since TIME] [--task TASK] [--limit N] [--json] | --keep",
    "list the runs and how they ended",
    "Lists the runs of all tasks, or of one, the latest first: when each began, how long it\n"
    "took, its number, by which 'zelosched log' shows what it printed, its task, and how it\n"
    "ended. Runs that are under way or wait for their turn are among them.\n"
    "\n"
    "  --failed                       only those that ended otherwise than finished\n"
    "  --since TIME                   only those since then, such as 2026-12-24, 18:30,\n"
    "                                 '2026-12-24 18:30', or 12h and 2d for so long ago\n"
    "  --task TASK                    only those of this task, as TASK alone does\n"
    "  -n, --limit N                  how many runs; 50\n"
    "  --json                         a JSON object\n"
    "  --keep                         lists nothing, but takes over what other programs have\n"
    "                                 run, tells of runs that were lost, and drops what is old;\n"
    "                                 the system does it every few minutes and at shutdown\n",
    runHistory};
