// zelosched remove
#include "commands/command.h"
#include "commands/options.h"
#include "commands/remove_tasks.h"

namespace {

constexpr Option kOptions[] = {{"yes", Option::kNone, 'y'}, {"force"}};

int runRemove(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoCommand();
  return removeTasks(parseIds(arguments.operands()),
                     {arguments.has("yes"), arguments.has("force"), false});
}

}  // namespace

const Command kRemoveCommand = {
    "remove", "TASK... [--yes]", "delete tasks",
    "Deletes the tasks. Asks before each when the standard input is a terminal; refuses\n"
    "without --yes when it is none.\n"
    "\n"
    "  -y, --yes                      do not ask\n"
    "  --force                        even if its application does not let it be removed\n",
    runRemove};
