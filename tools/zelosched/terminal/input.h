// What a command reads.
#pragma once

#include <string>

inline constexpr char kStandardInput[] = "-";

// All of a file, or of the standard input for "-". Throws Failure, also for more than 16 MB.
std::string readInput(const std::string &path);
