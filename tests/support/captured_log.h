// What the library and the platform wrote to the system log, in this process and in every process
// forked from it. Nothing reaches the machine's own log.
//
//   std::vector<std::string> logged();       lines with every line number replaced by N
//   std::vector<std::string> loggedRaw();    lines as they were written, of any length
//   std::vector<int> loggedPriorities();     their priorities (LOG_ERR = 3), in the same order
//   void clearLog();
//   std::string normalisedLine(line);        the replacement that logged() makes
//
//   EXPECT_EQ(logged(), (std::vector<std::string>{"backend.cpp:N Too many backends"}));
#pragma once

#include <string>
#include <vector>

namespace support {

std::vector<std::string> logged();
std::vector<std::string> loggedRaw();
std::vector<int> loggedPriorities();
void clearLog();

// "unit.cpp:12 text [0x0D00 other.cpp:34]" becomes "unit.cpp:N text [0x0D00 other.cpp:N]".
std::string normalisedLine(const std::string &line);

}  // namespace support
