// What a program leaves behind that is killed while it replaces a file: the new file beside the old
// one, under a random name. Nothing else removes those that are not in /tmp.
#pragma once

// Removes them, and says so. Throws Failure.
void removeLeftovers();
