// What a keeper tells the one who waits for its run, a line each:
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
  bool isKnown = false;  // its process is there
  bool isWaiting = false;
  bool isRunning = false;
  bool isEnded = false;
  int64_t waitsFor = 0;

  // Of a line without its end; what it does not know it passes over.
  void take(std::string_view line);
};

std::string endLine(const RunRecord &run);
