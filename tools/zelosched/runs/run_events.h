// The events that a keeper writes to a process that waits for its run, one a line:
//
//   run 12              the run's number in the history, where it could be written
//   process 345 6789    the run's own process
//   waiting 3           for that task to end; 0 for none that is known
//   running
//   ended 1 12.345 0 -   the number of the outcome, seconds, exit code, signal
//   failed 8192 12 unit.cpp   it was not started: the error record
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "runs/history.h"

// What the lines so far say.
struct RunEvents {
  KeptRun run;
  bool isKnown = false;  // the run's process is known
  bool isWaiting = false;
  bool isRunning = false;
  bool isEnded = false;
  int64_t waitsFor = 0;

  // Takes a line, without its line feed, and ignores an unknown one.
  void take(std::string_view line);
};

std::string endLine(const RunRecord &run);
