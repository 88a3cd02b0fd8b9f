// How a run went, in words.
#pragma once

#include <string>

#include "runs/run_record.h"

// Of a run of the history: the same words.
std::string resultInWords(const RunRecord &run);

// "finished", "failed with exit code 3", "killed by signal SIGKILL (9)", ...
std::string resultInWords(int statusCode, const std::string &comment);

// The run is over and did not end well.
bool isBadResult(int statusCode);
