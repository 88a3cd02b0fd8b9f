// Makes the stored tasks match a file, for several sub-commands.
#pragma once

#include <string>

#include "commands/apply_plan.h"

// Reports each task, and returns the exit status. Throws Failure, with nothing changed, when the
// text has a fault; a step that fails later does not stop the others.
int applyTasks(const std::string &text, const ApplyRules &rules);
