// The runs that are kept over a boot.
#pragma once

#include <optional>
#include <vector>

#include "runs/runs.h"

// Carries the runs of the status database over into the kept ones: each once, also when it was
// carried over before, and with the result that it has now. The newest hundred thousand are kept.
// Also notes that the machine is up (missed.h). What failed is said; the exit status.
int keepHistory();

// The runs of the status database and the kept ones, newest first; of one task, or of all; at most
// `limit`. Throws Failure.
std::vector<Run> allRuns(std::optional<long> taskId, long limit);

// As allRuns, of those that can be read: one of the two is in "/tmp", where anybody can be in its
// way. What cannot be read is said; the exit status.
int collectRuns(std::optional<long> taskId, long limit, std::vector<Run> *runs);

// Both may be read.
bool mayReadAllRuns();
