// zelosched stop
#include <unistd.h>

#include <cstdio>

#include "commands/command.h"
#include "commands/expected_task.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "commands/stop_task.h"
#include "runs/time_units.h"
#include "terminal/failure.h"

namespace {

constexpr Option kStopOptions[] = {{"grace", Option::kValue}, EXPECTED_TASK_OPTIONS};
constexpr int64_t kMostGrace = kDay;

int runStop(int argc, char **argv) {
  const Arguments arguments(argc, argv, kStopOptions);
  arguments.requireNoCommand();
  const std::vector<int64_t> ids = parseIds(arguments.operands());
  const std::chrono::seconds grace(
      arguments.number("grace", 0, kMostGrace).value_or(kUsualGrace.count()));
  if (geteuid() != 0) throw Failure("stopping runs takes root's rights");
  const ExpectedTask expected(arguments);
  return forEach(ids, [&](int64_t id) {
    const Task task = expected.isAny() ? loadTask(id) : findTask(id);
    if (task) expected.require(*task);
    const std::string title = task ? titleOf(*task) : "task " + std::to_string(id);
    if (stopTask(id, title, grace) > 0) return;
    if (!task) throw Failure("there is no task " + std::to_string(id) + ", and no run of it");
    throw Failure(title + " is not running");
  });
}

}  // namespace

const Command kStopCommand = {
    "stop", "TASK... [--grace SECONDS] [OPTION...]", "end the runs of tasks that go on or wait",
    "Ends the runs of the tasks that are under way: one that waits for its turn does not\n"
    "start; of one that goes on, every process gets SIGTERM, also those that its command\n"
    "has put into the background or into a session of their own, and what is left after 10\n"
    "seconds gets SIGKILL. The history says that they were stopped. Of a run that another\n"
    "program has started, processes that have left their parents are not found.\n"
    "\n"
    "  --grace SECONDS                how long a run has to end by itself; 10\n" EXPECTED_TASK_HELP,
    runStop};
