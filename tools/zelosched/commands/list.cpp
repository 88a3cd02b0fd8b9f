// zelosched list
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "runs/coming_runs.h"
#include "runs/result_text.h"
#include "runs/runs.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/table.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {
    {"all", Option::kNone, 'a'}, {"app", Option::kValue},         {"enabled"},
    {"sort", Option::kValue},    {"reverse", Option::kNone, 'r'}, {"json"}};
constexpr char kUnknown[] = "?";  // to a user who may not read the status database
constexpr char kNothing[] = "-";

struct Row {
  const ZELO_SCHED_TASK *task;
  std::optional<LocalMinute> next;
  std::string owner;
  std::string result;
  bool isBad;
};

// What never runs comes last.
bool isSooner(const Row &a, const Row &b) {
  return a.next && (!b.next || *a.next < *b.next);
}

std::string nextText(const Row &row) {
  return row.next ? minuteText(*row.next) : "";
}

struct SortKey {
  const char *name;
  bool (*isBefore)(const Row &a, const Row &b);
};
constexpr SortKey kSortKeys[] = {
    {"next", isSooner},
    {"id", [](const Row &a, const Row &b) { return a.task->ID < b.task->ID; }},
    {"name", [](const Row &a, const Row &b) { return strcmp(a.task->Name, b.task->Name) < 0; }},
    {"state", [](const Row &a, const Row &b) { return a.task->State > b.task->State; }},
    {"type", [](const Row &a, const Row &b) { return a.task->Type < b.task->Type; }},
    {"owner", [](const Row &a, const Row &b) { return a.owner < b.owner; }},
    {"app", [](const Row &a, const Row &b) { return strcmp(a.task->App, b.task->App) < 0; }},
    {"result", [](const Row &a, const Row &b) { return a.result < b.result; }},
};

const SortKey &sortKey(const std::string &name) {
  std::string names;
  for (const SortKey &key : kSortKeys) {
    if (name == key.name) return key;
    names += (names.empty() ? "" : ", ") + std::string(key.name);
  }
  throw UsageError("'--sort' takes one of " + names);
}

bool isWanted(const Arguments &arguments, const ZELO_SCHED_TASK &task) {
  if (task.Listable != 1 && !arguments.has("all")) return false;
  if (!isEnabled(task) && arguments.has("enabled")) return false;
  return arguments.value("app", task.App) == task.App;
}

// The status database is in "/tmp", where anybody can be in its way: the tasks are shown without
// it.
struct LatestRuns {
  bool isKnown = mayReadRuns();
  int status = kDone;
  std::map<long, Run> ofEach;

  LatestRuns() {
    if (!isKnown) return;
    try {
      ofEach = RunDatabase().latestOfEach();
    } catch (const Failure &failure) {
      isKnown = false;
      status = complain(failure.what());
    }
  }
};

std::vector<Row> rowsOf(const Arguments &arguments, const TaskList &list,
                        const LatestRuns &latest) {
  const LocalMinute now = localMinute(time(nullptr));
  std::vector<Row> rows;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!isWanted(arguments, *task)) continue;
    Row row{task, nextRun(*task, now), userName(task->Owner), latest.isKnown ? kNothing : kUnknown,
            false};
    if (const auto run = latest.ofEach.find(task->ID); run != latest.ofEach.end()) {
      row.result = resultInWords(run->second.statusCode, run->second.comment);
      row.isBad = isBadResult(run->second.statusCode);
    }
    rows.push_back(std::move(row));
  }
  return rows;
}

void printTable(const std::vector<Row> &rows) {
  Table table({{"ID", Column::kRight},
               {"STATE"},
               {"TYPE"},
               {"NEXT RUN"},
               {"OWNER", Column::kLeft, true},
               {"LAST RESULT", Column::kLeft, true},
               {"NAME", Column::kLeft, true}});
  for (const Row &row : rows) {
    const Emphasis dim = isEnabled(*row.task) ? Emphasis::kNone : Emphasis::kDim;
    table.add({{std::to_string(row.task->ID)},
               {stateName(*row.task), dim},
               {typeName(*row.task)},
               {row.next ? minuteText(*row.next) : kNothing},
               {row.owner},
               {row.result, row.isBad ? Emphasis::kBad : Emphasis::kNone},
               {row.task->Name}});
  }
  table.print();
}

void printAsJson(const std::vector<Row> &rows) {
  std::vector<Json::Value> objects;
  for (const Row &row : rows) {
    Json::Value object = jsonOf(*row.task);
    object["next run"] = nextText(row);
    object["owner name"] = jsonText(row.owner);
    object["last result"] = jsonText(row.result);
    objects.push_back(std::move(object));
  }
  printJson(objects);
}

int runList(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const SortKey &key = sortKey(arguments.value("sort", "next"));
  const TaskList list;
  const LatestRuns latest;
  std::vector<Row> rows = rowsOf(arguments, list, latest);
  std::stable_sort(rows.begin(), rows.end(), key.isBefore);
  if (arguments.has("reverse")) std::reverse(rows.begin(), rows.end());
  if (arguments.has("json")) {
    printAsJson(rows);
  } else {
    printTable(rows);
  }
  return latest.status;
}

}  // namespace

const Command kListCommand = {
    "list", "[--all] [--app APP] [--enabled] [--sort KEY] [--json]", "list the tasks",
    "Lists the tasks, by the time of their next run.\n"
    "\n"
    "  -a, --all                      also those that their application hides from lists\n"
    "  --app APP                      only those of that application\n"
    "  --enabled                      only those that are enabled\n"
    "  --sort KEY                     next, id, name, state, type, owner, app or result\n"
    "  -r, --reverse                  the other way round\n"
    "  --json                         a JSON array, its members named by the task's keys\n",
    runList};
