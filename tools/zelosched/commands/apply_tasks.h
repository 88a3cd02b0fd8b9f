// Making the stored tasks be as a file says, for several sub-commands.
#pragma once

#include <string>

#include "commands/apply_plan.h"

// The text is version 1 of the vocabulary. Tells each task; the exit status. Throws Failure, with
// nothing changed, when any of it cannot be done.
int applyTasks(const std::string &text, const ApplyRules &rules);
