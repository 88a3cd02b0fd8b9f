// How a run went, in words.
#pragma once

#include <string>

#include "runs/run_record.h"

// Of a run of the history.
std::string resultInWords(const RunRecord &run);

// "finished", "failed with exit code 3", "killed by signal SIGKILL (9)", ...
std::string resultInWords(int statusCode, const std::string &comment);

// Whether the run has ended, and not well.
bool isBadResult(int statusCode);
