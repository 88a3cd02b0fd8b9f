// The program that starts tasks, as it is installed beside this one.
#pragma once

#include <string>
#include <vector>

std::string installedTaskProgram();

// The path of this program; empty when /proc cannot be read.
std::string ownProgram();

// Whether we run in a unit of the service manager, which may restrict us and end our children.
bool isUnit();

// Starts a program that puts itself into the background, or, within a unit, has the service manager
// start it. Throws Failure.
void startDetached(const std::string &program, const std::vector<std::string> &arguments);
