// zelosched list
#include <json/json.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/task_json.h"
#include "runs/coming_runs.h"
#include "runs/history.h"
#include "runs/latest_runs.h"
#include "store/owner.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/schedule_text.h"
#include "terminal/table.h"
#include "terminal/text.h"

namespace {

constexpr Option kListOptions[] = {{"all", Option::kNone, 'a'},
                                   {"app", Option::kValue},
                                   {"owner", Option::kValue},
                                   {"enabled"},
                                   {"failed"},
                                   {"running"},
                                   {"power"},
                                   {"sort", Option::kValue},
                                   {"reverse", Option::kNone, 'r'},
                                   {"json"}};
constexpr char kHidden[] = "?";  // to a user who may not read the runs

struct Row {
  const ZELO_SCHED_TASK *task;
  std::optional<LocalMinute> next;
  std::string owner;
  const RunRecord *last;
  std::string result;
};

// What never runs comes last.
bool isSooner(const Row &a, const Row &b) {
  return a.next && (!b.next || *a.next < *b.next);
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

// The tasks that the options select.
class Choice {
 public:
  Choice(const Arguments &arguments, const LatestRuns &runs) : arguments_(arguments), runs_(runs) {
    if ((arguments.has("failed") || arguments.has("running")) && !runs.isKnown) {
      throw Failure(runs.fault.empty() ? "seeing the runs takes root's rights" : runs.fault);
    }
    const auto owner = arguments.value("owner");
    if (!owner) return;
    owner_ = findUser(*owner);
    if (!owner_) throw Failure("there is no user '" + printable(*owner) + "'");
  }

  bool has(const ZELO_SCHED_TASK &task) const {
    if (isPower(task) && !arguments_.has("power")) return false;
    if (!isListed(task) && !arguments_.has("all")) return false;
    if (!isEnabled(task) && arguments_.has("enabled")) return false;
    if (owner_ && task.Owner != *owner_) return false;
    if (arguments_.has("failed") && !hasFailed(task)) return false;
    if (arguments_.has("running") && runs_.running.count(task.ID) == 0) return false;
    return arguments_.value("app", task.App) == task.App;
  }

 private:
  bool hasFailed(const ZELO_SCHED_TASK &task) const {
    const RunRecord *last = runs_.of(task.ID);
    return last != nullptr && isBad(*last);
  }

  const Arguments &arguments_;
  const LatestRuns &runs_;
  std::optional<uid_t> owner_;
};

std::vector<Row> rowsOf(const Choice &choice, const TaskList &list, const LatestRuns &runs,
                        const LocalMinute &now) {
  std::vector<Row> rows;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!choice.has(*task)) continue;
    const RunRecord *last = runs.of(task->ID);
    rows.push_back({task, nextRun(*task, now), userName(task->Owner), last,
                    last != nullptr ? outcomeInBrief(*last)
                    : runs.isKnown  ? kNoValue
                                    : kHidden});
  }
  return rows;
}

// "24 Dec", or the whole date where it is a year away.
std::string dayInBrief(const LocalMinute &minute, const LocalMinute &now) {
  constexpr const char *kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                     "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  constexpr int kYear = 365;
  if ((minute.day - now.day).count() >= kYear) return dayText(minute);
  const std::chrono::year_month_day date(minute.day);
  const auto day = static_cast<unsigned>(date.day());
  const auto month = static_cast<unsigned>(date.month());
  return std::to_string(day) + " " + kMonths[month - 1];
}

// "Mon 08:30", or the date alone where it is a week away: the schedule says at what time.
std::string nextText(const Row &row, const LocalMinute &now) {
  constexpr int kWeek = 7;
  constexpr size_t kShortName = 3;
  if (!isEnabled(*row.task)) return "disabled";
  if (!row.next) return kNoValue;
  if ((row.next->day - now.day).count() >= kWeek) return dayInBrief(*row.next, now);
  return std::string(weekdayName(*row.next)).substr(0, kShortName) + " " + timeText(*row.next);
}

void printTable(const std::vector<Row> &rows, time_t now) {
  const LocalMinute minute = localMinute(now);
  Table table({{"ID", Column::kRight},
               {"NAME", Column::kLeft, true, true},
               {"OWNER", Column::kLeft, true, true},
               {"SCHEDULE", Column::kLeft, true, true},
               {"NEXT RUN", Column::kLeft, true, true},
               {"LAST RUN", Column::kLeft, true, true}});
  for (const Row &row : rows) {
    const Emphasis dim = isEnabled(*row.task) ? Emphasis::kNone : Emphasis::kDim;
    const bool failed = row.last != nullptr && isBad(*row.last);
    table.add({{std::to_string(row.task->ID)},
               {row.task->Name},
               {row.owner},
               {scheduleInBrief(*row.task)},
               {nextText(row, minute), dim},
               {row.last != nullptr ? runInBrief(*row.last, now) : row.result,
                failed ? Emphasis::kBad : Emphasis::kNone}});
  }
  table.print();
}

void printAsJson(const std::vector<Row> &rows, const LatestRuns &runs, bool withPower) {
  Json::Value top = topObject();
  top["tasks"] = Json::Value(Json::arrayValue);
  if (withPower) top["power_times"] = Json::Value(Json::arrayValue);
  for (const Row &row : rows) {
    if (isPower(*row.task)) {
      top["power_times"].append(powerTimeOf(*row.task, row.next));
    } else {
      top["tasks"].append(jsonOf(*row.task, row.next, runs));
    }
  }
  printTop(top);
}

int runList(int argc, char **argv) {
  const Arguments arguments(argc, argv, kListOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const SortKey &key = sortKey(arguments.value("sort", "next"));
  const TaskList list;
  const LatestRuns runs = latestRuns(list);
  const Choice choice(arguments, runs);
  const time_t now = time(nullptr);
  std::vector<Row> rows = rowsOf(choice, list, runs, localMinute(now));
  std::stable_sort(rows.begin(), rows.end(), key.isBefore);
  if (arguments.has("reverse")) std::reverse(rows.begin(), rows.end());
  if (arguments.has("json")) {
    printAsJson(rows, runs, arguments.has("power"));
  } else {
    printTable(rows, now);
  }
  return runs.fault.empty() ? kDone : complain(runs.fault);
}

}  // namespace

const Command kListCommand = {
    "list", "[OPTION...]", "list the tasks",
    "Lists the tasks, by the time of their next run: when they run, and how the last run\n"
    "went. A next run that is a week away or more is told by its day alone.\n"
    "\n"
    "  -a, --all                      also those that their application hides from lists\n"
    "  --app APP                      only those of that application\n"
    "  --owner USER                   only those that run under that user's rights\n"
    "  --enabled                      only those that are enabled\n"
    "  --failed                       only those whose last run ended badly\n"
    "  --running                      only those with a run that goes on\n"
    "  --power                        also the times at which the machine goes on and off\n"
    "  --sort KEY                     next, id, name, state, type, owner, app or result\n"
    "  -r, --reverse                  the other way round\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runList};
