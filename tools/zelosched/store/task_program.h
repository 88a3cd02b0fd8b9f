// The program that starts tasks, as it is installed beside this one.
#pragma once

#include <string>
#include <vector>

std::string installedTaskProgram();

// Empty when /proc does not tell.
std::string ownProgram();

// Whether the service manager has started us, with what a unit takes away, and will end with us
// what we leave behind.
bool isUnit();

// Starts a program that goes on by itself. Within a unit the service manager is asked to start it.
// Throws Failure.
void startDetached(const std::string &program, const std::vector<std::string> &arguments);
