// Runs a program and keeps what it said.
//
//   Outcome outcome = runProgram({"/bin/zeloschedtask", "--help"});
//   outcome.status (128 + N when signal N ended it), outcome.out, outcome.err
#pragma once

#include <string>
#include <vector>

namespace support {

struct Outcome {
  int status;
  std::string out;
  std::string err;
};

Outcome runProgram(const std::vector<std::string> &arguments);

}  // namespace support
