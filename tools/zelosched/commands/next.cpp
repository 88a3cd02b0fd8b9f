// zelosched next
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <queue>
#include <tuple>

#include "check/task_check.h"
#include "commands/command.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/task_input.h"
#include "json/task_json.h"
#include "runs/coming_runs.h"
#include "runs/span.h"
#include "runs/time_units.h"
#include "store/owner.h"
#include "store/power_room.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/input.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr Option kNextOptions[] = {
    {"count", Option::kValue, 'n'}, {"within", Option::kValue}, {"preview"}, {"json"}};
constexpr int64_t kUsualCount = 20;
constexpr int64_t kMostRuns = 10000;
constexpr int64_t kLongestSpan = 366 * kDay;

struct Entry {
  LocalMinute run;
  const TaskRecord *task;
};

// The first runs of several tasks, by their time and then by the tasks' ids.
class FirstRuns {
 public:
  explicit FirstRuns(const LocalMinute &now) : now_(now) {}

  // The object owns what is added.
  void add(Task task) {
    add(*task);
    named_.push_back(std::move(task));
  }
  void add(std::unique_ptr<TaskList> list) {
    for (const TaskRecord *task : list->tasks()) {
      if (isEnabled(*task)) add(*task);
    }
    all_ = std::move(list);
  }

  // So many at most, and none after `last`.
  std::vector<Entry> take(size_t count, const std::optional<LocalMinute> &last) {
    std::priority_queue queue(isLater, std::vector<Source *>());
    const auto advance = [&](Source *source) {
      source->run = source->runs.next();
      if (source->run) queue.push(source);
    };
    for (Source &source : sources_) advance(&source);
    std::vector<Entry> entries;
    while (entries.size() < count && !queue.empty()) {
      Source *source = queue.top();
      queue.pop();
      if (last && *source->run > *last) break;
      entries.push_back({*source->run, source->task});
      advance(source);
    }
    return entries;
  }

 private:
  struct Source {
    const TaskRecord *task;
    ComingRuns runs;
    std::optional<LocalMinute> run;  // the next one
  };

  static bool isLater(const Source *a, const Source *b) {
    return std::tie(*b->run, b->task->ID) < std::tie(*a->run, a->task->ID);
  }

  void add(const TaskRecord &task) {
    sources_.push_back({&task, ComingRuns(task, now_), std::nullopt});
  }

  LocalMinute now_;
  std::vector<Task> named_;
  std::unique_ptr<TaskList> all_;
  std::vector<Source> sources_;
};

// A disabled task is reported.
void addNamed(int64_t id, FirstRuns *runs) {
  Task task = loadTask(id);
  if (isEnabled(*task)) {
    runs->add(std::move(task));
  } else {
    complain(titleOf(*task) + " is disabled: it will not run");
  }
}

void print(const std::vector<Entry> &entries) {
  const size_t columns = terminalColumns().value_or(0);
  size_t idWidth = 0;
  for (const Entry &entry : entries) {
    idWidth = std::max(idWidth, std::to_string(entry.task->ID).size());
  }
  std::string day;
  for (const Entry &entry : entries) {
    if (dayText(entry.run) != day) {
      if (!day.empty()) std::puts("");
      day = dayText(entry.run);
      std::printf("%s %s\n", day.c_str(), weekdayName(entry.run));
    }
    const std::string id = std::to_string(entry.task->ID);
    const std::string line = "  " + timeText(entry.run) + "  " +
                             std::string(idWidth - id.size(), ' ') + id + "  " +
                             printable(entry.task->Name);
    std::puts((columns == 0 ? line : fitted(line, columns)).c_str());
  }
}

void printAsJson(const std::vector<Entry> &entries) {
  Json::Value top = topObject();
  Json::Value &runs = top["runs"] = Json::Value(Json::arrayValue);
  for (const Entry &entry : entries) {
    const TaskRecord &task = *entry.task;
    Json::Value object;
    object["due"] = jsonOf(entry.run);
    object["task"] = task.ID;
    object["task_name"] = jsonText(task.Name);
    object["app"] = jsonTextOrNull(task.App);
    object["owner"] = jsonText(userName(task.Owner));
    object["power"] = isPower(task) ? Json::Value(directionOf(task)) : Json::Value();
    runs.append(std::move(object));
  }
  printTop(top);
}

// ---- of a task that is not saved ------------------------------------------------------------

// The stored task that is to be changed, or a new one.
Task taskToPreview(const std::vector<std::string> &operands) {
  if (operands.empty()) return newTask(ZELO_SCHED_BACKEND_SCHEDULE);
  const std::vector<int64_t> ids = parseIds(operands);
  if (ids.size() > 1) throw UsageError("one task at a time");
  Task task = loadTask(ids.front());
  if (isPower(*task)) throw Failure(titleOf(*task) + " is a power time, which has no preview");
  return task;
}

std::vector<LocalMinute> firstRunsOf(const TaskRecord &task, const LocalMinute &now, size_t count) {
  std::vector<LocalMinute> found;
  ComingRuns runs(task, now);
  while (found.size() < count) {
    const std::optional<LocalMinute> run = runs.next();
    if (!run) break;
    found.push_back(*run);
  }
  return found;
}

void printPreviewAsJson(const std::vector<LocalMinute> &runs, const JsonFaults &faults) {
  Json::Value top = topObject();
  top["due"] = Json::Value(Json::arrayValue);
  for (const LocalMinute &run : runs) {
    if (momentOf(run)) top["due"].append(jsonOf(run));
  }
  top["faults"] = Json::Value(Json::arrayValue);
  for (const JsonFault &fault : faults) {
    Json::Value object;
    object["place"] = jsonText(fault.place);
    object["text"] = jsonText(fault.what);
    top["faults"].append(std::move(object));
  }
  printTop(top);
}

int preview(const Arguments &arguments, size_t count) {
  const time_t now = time(nullptr);
  const Task task = taskToPreview(arguments.operands());
  const TaskRecord before = *task;
  JsonFaults faults;
  fillFromText(readInput(kStandardInput), task.get(), &faults);
  std::vector<LocalMinute> runs;
  if (isScheduleSound(faults)) {
    runs = firstRunsOf(*task, localMinute(now), count);
    const std::string past = pastSchedule(*task, now);
    if (!past.empty() && !isSameSchedule(before, *task)) faults.push_back({kPlaceOfOnceDate, past});
  }
  if (arguments.has("json")) {
    printPreviewAsJson(runs, faults);
  } else {
    for (const LocalMinute &run : runs) {
      std::printf("%s %s\n", minuteText(run).c_str(), weekdayName(run));
    }
    complainOf(faults);
  }
  return faults.empty() ? kDone : kFailed;
}

// ---- the command ----------------------------------------------------------------------------

std::optional<LocalMinute> lastMinute(const Arguments &arguments, time_t now) {
  const auto text = arguments.value("within");
  if (!text) return std::nullopt;
  if (const auto seconds = parseSpan(*text, kLongestSpan)) return localMinute(now + *seconds);
  throw UsageError("'--within' takes a time from 1m to 366d, such as 90m, 12h or 7d, not '" +
                   printable(*text) + "'");
}

int runNext(int argc, char **argv) {
  const Arguments arguments(argc, argv, kNextOptions);
  arguments.requireNoCommand();
  const time_t now = time(nullptr);
  const std::optional<LocalMinute> last = lastMinute(arguments, now);
  const auto count = static_cast<size_t>(
      arguments.number("count", 1, kMostRuns).value_or(last ? kMostRuns : kUsualCount));
  if (arguments.has("preview")) {
    if (last) throw UsageError("'--preview' does not go with '--within'");
    return preview(arguments, count);
  }
  FirstRuns runs(localMinute(now));
  int status = kDone;
  if (arguments.operands().empty()) {
    runs.add(std::make_unique<TaskList>());
  } else {
    status = forEach(parseIds(arguments.operands()), [&](int64_t id) { addNamed(id, &runs); });
  }
  const std::vector<Entry> entries = runs.take(count, last);
  if (arguments.has("json")) {
    printAsJson(entries);
  } else {
    print(entries);
  }
  return status;
}

}  // namespace

const Command kNextCommand = {
    "next", "[TASK...] [--count N] [--within TIME] [--preview] [--json]", "list the coming runs",
    "Lists the coming runs of all enabled tasks, or of the tasks that are named, by their\n"
    "ids or names, day by day.\n"
    "\n"
    "With --preview it reads one task as JSON from the standard input, as add --stdin does,\n"
    "or as edit --stdin when a task is named; saves nothing; and lists when it would run and\n"
    "every fault. The exit status is 1 when there is a fault.\n"
    "\n"
    "  -n, --count N                  how many runs; 20, and with --within 10000\n"
    "  --within TIME                  only those due so soon, such as 90m, 12h or 7d\n"
    "  --preview                      of a task that is not saved\n"
    "  --json                         as JSON: see zelosched-json(5)\n",
    runNext};
