// zelosched next
#include <algorithm>
#include <cstdio>
#include <ctime>

#include "coming_runs.h"
#include "command.h"
#include "failure.h"
#include "json_out.h"
#include "options.h"
#include "task_list.h"
#include "terminal.h"
#include "text.h"

namespace {

constexpr Option kOptions[] = {{"count", Option::kValue, 'n'}, {"json"}};
constexpr long kUsualCount = 20;
constexpr long kMostRuns = 10000;

struct Entry {
  LocalMinute run;
  int32_t id;
  std::string name;
  bool operator<(const Entry &other) const {
    return std::tie(run, id) < std::tie(other.run, other.id);
  }
};

void add(const ZELO_SCHED_TASK &task, const LocalMinute &now, size_t count,
         std::vector<Entry> *entries) {
  for (const LocalMinute &run : comingRuns(task, now, count)) {
    entries->push_back({run, task.ID, task.Name});
  }
}

std::vector<Entry> entriesOf(const Arguments &arguments, size_t count) {
  const LocalMinute now = localMinute(time(nullptr));
  std::vector<Entry> entries;
  if (arguments.operands().empty()) {
    const TaskList list;
    for (const ZELO_SCHED_TASK *task : list.tasks()) {
      if (isEnabled(*task)) add(*task, now, count, &entries);
    }
  } else {
    for (const long id : parseIds(arguments.operands())) {
      const Task task = loadTask(id);
      if (!isEnabled(*task)) complain(titleOf(*task) + " is disabled: it will not run");
      if (isEnabled(*task)) add(*task, now, count, &entries);
    }
  }
  std::sort(entries.begin(), entries.end());
  if (entries.size() > count)
    entries.erase(entries.begin() + static_cast<long>(count), entries.end());
  return entries;
}

void print(const std::vector<Entry> &entries) {
  const size_t columns = terminalColumns().value_or(0);
  std::string day;
  for (const Entry &entry : entries) {
    if (dayText(entry.run) != day) {
      if (!day.empty()) std::puts("");
      day = dayText(entry.run);
      std::printf("%s %s\n", day.c_str(), weekdayName(entry.run));
    }
    const std::string line =
        "  " + timeText(entry.run) + "  " + std::to_string(entry.id) + "  " + printable(entry.name);
    std::puts((columns == 0 ? line : fitted(line, columns)).c_str());
  }
}

void printAsJson(const std::vector<Entry> &entries) {
  std::vector<Json::Value> objects;
  for (const Entry &entry : entries) {
    Json::Value object;
    object["run"] = minuteText(entry.run);
    object["id"] = entry.id;
    object["name"] = jsonText(entry.name);
    objects.push_back(std::move(object));
  }
  printJson(objects);
}

int runNext(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const auto count =
      static_cast<size_t>(arguments.number("count", 1, kMostRuns).value_or(kUsualCount));
  const std::vector<Entry> entries = entriesOf(arguments, count);
  if (arguments.has("json")) {
    printAsJson(entries);
  } else {
    print(entries);
  }
  return kDone;
}

}  // namespace

const Command kNextCommand = {
    "next", "[ID...] [--count N] [--json]", "list the coming runs",
    "Lists the coming runs of all enabled tasks, or of the tasks that are named, day by\n"
    "day.\n"
    "\n"
    "  -n, --count N                  how many runs; 20\n"
    "  --json                         a JSON array of run, id and name\n",
    runNext};
