// zelosched next
#include <algorithm>
#include <cstdio>
#include <ctime>

#include "coming_runs.h"
#include "command.h"
#include "failure.h"
#include "for_each_id.h"
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

// The first runs of several tasks. Of a task that comes later, only those before the last of them
// are worked out, and never more than are wanted of all.
class FirstRuns {
 public:
  FirstRuns(const LocalMinute &now, size_t count) : now_(now), count_(count) {}

  void add(const ZELO_SCHED_TASK &task) {
    for (const LocalMinute &run : comingRuns(task, now_, count_, last_)) {
      entries_.push_back({run, task.ID, task.Name});
    }
    if (entries_.size() > 2 * count_) prune();
  }

  std::vector<Entry> take() {
    prune();
    return std::move(entries_);
  }

 private:
  void prune() {
    std::sort(entries_.begin(), entries_.end());
    if (entries_.size() < count_) return;
    entries_.erase(entries_.begin() + static_cast<long>(count_), entries_.end());
    last_ = entries_.back().run;
  }

  LocalMinute now_;
  size_t count_;
  std::vector<Entry> entries_;
  std::optional<LocalMinute> last_;
};

void addNamed(long id, FirstRuns *runs) {
  const Task task = loadTask(id);
  if (isEnabled(*task)) {
    runs->add(*task);
  } else {
    complain(titleOf(*task) + " is disabled: it will not run");
  }
}

// Disabled tasks and those that are not there are told.
int addTasks(const Arguments &arguments, FirstRuns *runs) {
  if (!arguments.operands().empty()) {
    return forEachId(parseIds(arguments.operands()), [&](long id) { addNamed(id, runs); });
  }
  const TaskList list;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (isEnabled(*task)) runs->add(*task);
  }
  return kDone;
}

void print(const std::vector<Entry> &entries) {
  const size_t columns = terminalColumns().value_or(0);
  size_t idWidth = 0;
  for (const Entry &entry : entries) {
    idWidth = std::max(idWidth, std::to_string(entry.id).size());
  }
  std::string day;
  for (const Entry &entry : entries) {
    if (dayText(entry.run) != day) {
      if (!day.empty()) std::puts("");
      day = dayText(entry.run);
      std::printf("%s %s\n", day.c_str(), weekdayName(entry.run));
    }
    const std::string id = std::to_string(entry.id);
    const std::string line = "  " + timeText(entry.run) + "  " +
                             std::string(idWidth - id.size(), ' ') + id + "  " +
                             printable(entry.name);
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
  FirstRuns runs(localMinute(time(nullptr)), count);
  const int status = addTasks(arguments, &runs);
  const std::vector<Entry> entries = runs.take();
  if (arguments.has("json")) {
    printAsJson(entries);
  } else {
    print(entries);
  }
  return status;
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
