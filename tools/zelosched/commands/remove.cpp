// zelosched remove
#include "commands/command.h"
#include "commands/expected_task.h"
#include "commands/options.h"
#include "commands/remove_tasks.h"

namespace {

constexpr Option kRemoveOptions[] = {
    {"yes", Option::kNone, 'y'}, {"force"}, {"stop"}, EXPECTED_TASK_OPTIONS};

int runRemove(int argc, char **argv) {
  const Arguments arguments(argc, argv, kRemoveOptions);
  arguments.requireNoCommand();
  return removeTasks(parseIds(arguments.operands()),
                     {arguments.has("yes"), arguments.has("force"), false, arguments.has("stop"),
                      ExpectedTask(arguments)});
}

}  // namespace

const Command kRemoveCommand = {
    "remove", "TASK... [--yes] [--force] [--stop] [OPTION...]", "delete tasks",
    "Deletes the tasks. Asks before each when the standard input is a terminal; refuses\n"
    "without --yes when it is none. A run of one that waits for its turn does not start any\n"
    "more; one that has begun goes on, which is told.\n"
    "\n"
    "  -y, --yes                      do not ask\n"
    "  --stop                         end a run that has begun, as 'zelosched stop' does\n"
    "  --force                        even if its application does not let it be "
    "removed\n" EXPECTED_TASK_HELP,
    runRemove};
