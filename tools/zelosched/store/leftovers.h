// The new files beside the old ones, under random names, of programs that were killed while they
// replaced a file. Nothing else removes those that are not in /tmp.
#pragma once

// Removes and reports them. Throws Failure.
void removeLeftovers();
