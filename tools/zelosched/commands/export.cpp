// zelosched export
#include <json/json.h>

#include <cstdio>

#include "commands/command.h"
#include "commands/for_each_id.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "store/task_list.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"wire"}};

void warnOfLosses(const ZELO_SCHED_TASK &task) {
  for (const std::string &key : lossyKeysOf(task)) {
    complain("\"" + key + "\" of " + titleOf(task) +
             " is not UTF-8: bytes that JSON cannot carry were replaced");
  }
}

void printWire(const ZELO_SCHED_TASK &task) {
  std::vector<char> text(ZELO_SCHED_JSON_SIZE_ANY);
  forgetError();
  if (ZELOSchedTaskConvertToJson(&task, text.data(), text.size()) < 0) {
    throw failedTo("convert " + titleOf(task));
  }
  std::fputs(text.data(), stdout);
}

int runExport(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  const bool isWire = arguments.has("wire");
  std::vector<Json::Value> objects;
  const auto take = [&](const ZELO_SCHED_TASK &task) {
    warnOfLosses(task);
    if (isWire) {
      printWire(task);
    } else {
      objects.push_back(jsonOf(task));
    }
  };
  int status = kDone;
  if (arguments.operands().empty()) {
    const TaskList list;
    for (const ZELO_SCHED_TASK *task : list.tasks()) take(*task);
  } else {
    status = forEachId(parseIds(arguments.operands()), [&](long id) { take(*loadTask(id)); });
  }
  if (!isWire) printJson(objects);
  return status;
}

}  // namespace

const Command kExportCommand = {
    "export", "[ID...] [--wire]", "write tasks as JSON",
    "Writes all tasks, or those that are named, as a JSON array of plain objects, which\n"
    "'zelosched import' reads. Their members are the task's keys; numbers are numbers, and\n"
    "the command is plain text (or \"cmd base64\", when it is not UTF-8).\n"
    "\n"
    "  --wire                         the doubly encoded form of the library's JSON calls,\n"
    "                                 an object a line\n",
    runExport};
