// The program that starts tasks, as it is installed beside this one.
#pragma once

#include <string>
#include <vector>

std::string installedTaskProgram();

// Starts it, to go on by itself. Within a unit of the service manager, whose end would be its own,
// that is asked to start it. Throws Failure.
void startDetached(const std::vector<std::string> &arguments);
