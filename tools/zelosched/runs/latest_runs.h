// The last run of each task, for those that show tasks.
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>

#include "runs/run_record.h"

struct LatestRuns {
  bool isKnown = false;  // this user may read the runs, and they can be read
  std::string fault;     // why they cannot be read by a user who may
  std::map<int64_t, RunRecord> ofEach;
  std::set<int64_t> running;  // the tasks that have a run which goes on

  const RunRecord *of(int64_t task) const;
};

LatestRuns latestRuns();

// "finished", "failed 7", "killed KILL", "running", "not started".
std::string outcomeInBrief(const RunRecord &run);

// "failed 7, 3 h ago"; "running for 3 h".
std::string runInBrief(const RunRecord &run, int64_t now);

// The run is over and did not end well.
bool endedBadly(const RunRecord &run);
