// The names in /tmp, beside those of the tasks and their program, that the library uses. Anybody
// can be first under such a name in a directory that is everybody's, and then no run can be
// recorded, or every run waits.
#pragma once

#include <string>
#include <vector>

// What keeps runs from being recorded or begun, in a sentence for each name that is not as the
// library makes it. A name that is free is no fault: the library takes it when it needs it.
std::vector<std::string> sharedNameFaults();

// Takes every such name as the library would; what is not root's alone is moved away, which is
// said. What failed is said too, and does not keep the rest from being done; the exit status.
int takeSharedNames();

// What stands under names of scratch copies of the store that are another user's.
size_t foreignScratchNames();

// The directories of root's with what was in the way of ours, for the administrator to look at.
std::vector<std::string> movedAway();

// Takes away every scratch copy. Nobody may be changing the store meanwhile. Throws Failure.
void clearScratchNames();
