// zelosched apply
#include <algorithm>

#include "commands/apply_tasks.h"
#include "commands/command.h"
#include "commands/options.h"
#include "store/power_room.h"
#include "store/stagger.h"
#include "terminal/input.h"

namespace {

constexpr Option kApplyOptions[] = {{"dry-run"},
                                    {"diff"},
                                    {"force"},
                                    {"prune"},
                                    {"json"},
                                    {"app", Option::kValue},
                                    {"stagger", Option::kValue}};

ApplyRules rulesOf(const Arguments &arguments) {
  ApplyRules rules;
  rules.undone = "nothing was applied";
  rules.isDryRun = arguments.has("dry-run");
  rules.showsDifferences = arguments.has("diff");
  rules.insists = arguments.has("force");
  rules.isJson = arguments.has("json");
  rules.pruned = arguments.values("app");
  if (arguments.has("prune") != arguments.has("app")) {
    throw UsageError("'--prune' and '--app APP' stand together: what is removed is of that app");
  }
  if (std::find(rules.pruned.begin(), rules.pruned.end(), kPowerApp) != rules.pruned.end()) {
    throw UsageError("power times are neither applied nor pruned");
  }
  if (const auto window = arguments.value("stagger")) rules.window = minutesOfWindow(*window);
  return rules;
}

int runApply(int argc, char **argv) {
  const Arguments arguments(argc, argv, kApplyOptions);
  arguments.requireNoCommand();
  if (arguments.operands().size() != 1) throw UsageError("give one file, or - for standard input");
  const ApplyRules rules = rulesOf(arguments);
  return applyTasks(readInput(arguments.operands().front()), rules);
}

}  // namespace

const Command kApplyCommand = {
    "apply", "FILE|- [OPTION...]", "make the tasks be as a file says",
    "Creates and changes tasks until they are as the file says, and tells which it created,\n"
    "changed and left as they were. The file is one that 'zelosched export' wrote, or that\n"
    "was written by hand; zelosched-json(5) describes it. A task is known by its application\n"
    "and its name. What the file does not say of it stays, or is the default of a new task.\n"
    "\n"
    "When anything in it is wrong, nothing is changed, and every fault is told with its place.\n"
    "At most 16 MB and 10000 tasks are read at once.\n"
    "\n"
    "  --dry-run                      tell what would be done; exit status 3 when it is\n"
    "                                 anything\n"
    "  --diff                         tell what changes, member by member\n"
    "  --force                        even if its application hides a task, or does not let\n"
    "                                 it be changed\n"
    "  --prune                        remove the tasks of --app that the file lacks\n"
    "  --app APP                      application that --prune is for; may be given again\n"
    "  --stagger 30m                  spread the times over so many minutes, by the machine\n"
    "  --json                         tell it as JSON\n",
    runApply};
