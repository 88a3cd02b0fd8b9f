// Saying what failed: on standard error, with the error record's code in words.
#pragma once

#include <stdexcept>
#include <string>

#include "terminal/exit_status.h"

// Ends the sub-command: said on standard error, exit status kFailed.
class Failure : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// The arguments are wrong: said with the usage line, exit status kUsage.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Empties the error record, so that what it says afterwards is of the call that follows.
void forgetError();

// "not found [0x2000 unit.cpp:12]", or where else to look when the record is empty.
std::string errorInWords();

// "WHAT: " and the error in words.
Failure failedTo(const std::string &what);

// The sentence on standard error, with the program's name in front. Returns kFailed.
int complain(const std::string &sentence);

// Runs a step, and reports its Failure. Returns the exit status.
template <class Step>
int attempt(Step step) {
  try {
    step();
    return kDone;
  } catch (const Failure &failure) {
    return complain(failure.what());
  }
}
