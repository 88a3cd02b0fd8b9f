// The names in /tmp that the library uses, other than those of the tasks and their program. Another
// user who takes one first can keep runs from being recorded, or make them wait.
#pragma once

#include <string>
#include <vector>

// A sentence for each name that is not as the library makes it, which can keep runs from being
// recorded or started. A free name is no fault: the library takes it when it needs it.
std::vector<std::string> sharedNameFaults();

// Takes every such name as the library would. What is not root's alone is moved away and reported.
// A step that fails is reported, and does not stop the others. Returns the exit status.
int takeSharedNames();

// How many names of scratch copies of the store are another user's.
size_t foreignScratchNames();

// Root's directories with what was moved away, for the administrator to look at.
std::vector<std::string> movedAway();

// Removes every scratch copy. To be called under the lock of the store. Throws Failure.
void clearScratchNames();
