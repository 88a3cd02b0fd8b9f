// zelosched export
#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <utility>

#include "commands/command.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/task_json.h"
#include "json/wire_json.h"
#include "store/task_list.h"
#include "terminal/text.h"

namespace {

constexpr Option kExportOptions[] = {{"wire"}};

// ---- the library's own form -----------------------------------------------------------------

void printWire(const ZELO_SCHED_TASK &task) {
  for (const std::string &key : lossyKeysOf(task)) {
    complain("\"" + key + "\" of " + titleOf(task) +
             " is not UTF-8: bytes that JSON cannot carry were replaced");
  }
  std::vector<char> text(ZELO_SCHED_JSON_SIZE_ANY);
  forgetError();
  if (ZELOSchedTaskConvertToJson(&task, text.data(), text.size()) < 0) {
    throw failedTo("convert " + titleOf(task));
  }
  std::fputs(text.data(), stdout);
}

// ---- tasks for import -----------------------------------------------------------------------

// Refuses a task that the format cannot hold.
void requireExportable(const ZELO_SCHED_TASK &task) {
  if (isPower(task)) throw Failure(titleOf(task) + " is a power time, which no export holds");
  const std::vector<std::string> members = lossyMembersOf(task);
  if (!members.empty()) {
    throw Failure(titleOf(task) + " was left out: its " + members.front() +
                  " is not UTF-8, which JSON cannot carry: see --wire");
  }
}

// The sort key, so that two exports of the same tasks are the same text.
std::pair<std::string, std::string> keyOf(const Json::Value &object) {
  const Json::Value &app = object["app"];
  return {app.isString() ? app.asString() : "", object["name"].asString()};
}

bool isBefore(const Json::Value &a, const Json::Value &b) {
  return keyOf(a) < keyOf(b);
}

class Export {
 public:
  explicit Export(bool isWire) : isWire_(isWire) {}

  void add(const ZELO_SCHED_TASK &task) {
    if (isWire_) return printWire(task);
    requireExportable(task);
    tasks_.push_back(settingsOf(task));
  }

  // The exit status.
  int addAll() {
    const TaskList list;
    int status = kDone;
    for (const ZELO_SCHED_TASK *task : list.tasks()) {
      if (isPower(*task) && !isWire_) continue;
      status = std::max(status, attempt([&] { add(*task); }));
    }
    return status;
  }

  // The exit status.
  int finish() {
    if (isWire_) return kDone;
    std::stable_sort(tasks_.begin(), tasks_.end(), isBefore);
    int status = kDone;
    for (size_t i = 1; i < tasks_.size(); ++i) {
      if (isBefore(tasks_[i - 1], tasks_[i])) continue;
      status = complain("'" + keyOf(tasks_[i]).second +
                        "' is the name of several tasks of one application, which 'zelosched "
                        "apply' cannot tell apart: rename or remove one of them");
    }
    Json::Value top = topObject();
    top["tasks"] = jsonList(tasks_);
    printIndented(top);
    return status;
  }

 private:
  bool isWire_;
  std::vector<Json::Value> tasks_;
};

int runExport(int argc, char **argv) {
  const Arguments arguments(argc, argv, kExportOptions);
  arguments.requireNoCommand();
  Export out(arguments.has("wire"));
  int status = kDone;
  if (arguments.operands().empty()) {
    status = out.addAll();
  } else {
    status = forEach(parseIds(arguments.operands()), [&](int64_t id) { out.add(*loadTask(id)); });
  }
  return std::max(status, out.finish());
}

}  // namespace

const Command kExportCommand = {
    "export", "[TASK...] [--wire]", "write tasks as JSON",
    "Writes all tasks, or those that are named, as JSON for 'zelosched apply': by their\n"
    "applications and names, without ids and power times. zelosched-json(5) describes it. A\n"
    "task with a text that is not UTF-8 is left out, which is told, and the exit status is 1.\n"
    "\n"
    "  --wire                         the form of the library's JSON calls instead, an object\n"
    "                                 a line: also power times, with ids\n",
    runExport};
