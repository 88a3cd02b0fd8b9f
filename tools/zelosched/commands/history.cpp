// zelosched history
#include <json/json.h>

#include <cstdio>
#include <ctime>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/result_text.h"
#include "runs/runs.h"
#include "store/task_list.h"
#include "terminal/table.h"

namespace {

constexpr Option kOptions[] = {{"limit", Option::kValue, 'n'}, {"json"}, {"keep"}};
constexpr long kUsualLimit = 50;
constexpr long kMostRuns = 100000000;
constexpr char kNothing[] = "-";

using Names = std::map<long, std::string>;

Names taskNames() {
  const TaskList list;
  Names names;
  for (const ZELO_SCHED_TASK *task : list.tasks()) names[task->ID] = task->Name;
  return names;
}

std::string nameOf(const Names &names, long id) {
  const auto found = names.find(id);
  return found == names.end() ? kNothing : found->second;
}

std::string startText(const Run &run) {
  constexpr long kSecondsPerMinute = 60;
  char seconds[16];
  std::snprintf(seconds, sizeof seconds, ":%02ld", run.start % kSecondsPerMinute);
  return minuteText(localMinute(run.start)) + seconds;
}

// Only starts are recorded: of a run that is over, nobody knows when it ended.
std::string durationText(const Run &run) {
  if (run.statusCode != ZELO_SCHED_STATUS_RUNNING) return kNothing;
  constexpr long kMinute = 60;
  constexpr long kHour = 3600;
  const long seconds = std::max(0L, time(nullptr) - run.start);
  char text[64];
  std::snprintf(text, sizeof text, "%ld:%02ld:%02ld", seconds / kHour, seconds % kHour / kMinute,
                seconds % kMinute);
  return text;
}

void print(const std::vector<Run> &runs) {
  const Names names = taskNames();
  Table table({{"START"},
               {"DURATION", Column::kRight},
               {"ID", Column::kRight},
               {"RESULT", Column::kLeft, true},
               {"NAME", Column::kLeft, true}});
  for (const Run &run : runs) {
    table.add({{startText(run)},
               {durationText(run)},
               {std::to_string(run.taskId)},
               {resultInWords(run.statusCode, run.comment),
                isBadResult(run.statusCode) ? Emphasis::kBad : Emphasis::kNone},
               {nameOf(names, run.taskId)}});
  }
  table.print();
}

void printAsJson(const std::vector<Run> &runs) {
  std::vector<Json::Value> objects;
  for (const Run &run : runs) {
    Json::Value object;
    object["id"] = Json::Int64(run.taskId);
    object["app"] = jsonText(run.app);
    object["status id"] = Json::Int64(run.statusId);
    object["pid"] = Json::Int64(run.pid);
    object["timestamp"] = Json::Int64(run.start);
    object["start"] = startText(run);
    object["status code"] = run.statusCode;
    object["comment"] = jsonText(run.comment);
    object["result"] = resultInWords(run.statusCode, run.comment);
    objects.push_back(std::move(object));
  }
  printJson(objects);
}

int runHistory(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  if (arguments.has("keep")) {
    arguments.requireNoOperands();
    if (argc > 2) throw UsageError("'--keep' stands alone");
    return keepHistory();
  }
  std::optional<long> id;
  if (!arguments.operands().empty()) {
    const std::vector<long> ids = parseIds(arguments.operands());
    if (ids.size() > 1) throw UsageError("one task at a time");
    id = ids.front();
  }
  const long limit = arguments.number("limit", 1, kMostRuns).value_or(kUsualLimit);
  std::vector<Run> runs;
  const int status = collectRuns(id, limit, &runs);
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
    "history", "[ID] [--limit N] [--json] | --keep", "list the runs and how they ended",
    "Lists the runs of all tasks, or of one, the latest first. Of runs that are over no\n"
    "end is recorded, so a duration is known only of one that goes on.\n"
    "\n"
    "  -n, --limit N                  how many runs; 50\n"
    "  --json                         a JSON array\n"
    "  --keep                         lists nothing, but keeps the runs over the next boot; the\n"
    "                                 system does it every few minutes and at shutdown\n",
    runHistory};
