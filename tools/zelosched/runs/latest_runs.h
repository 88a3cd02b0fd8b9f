// The last run of each task, for commands that show tasks.
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>

#include "runs/run_record.h"
#include "store/task_list.h"

struct LatestRuns {
  bool isKnown = false;                 // this user may read the runs, and they can be read
  std::string fault;                    // what failed, where this user may read them
  std::map<int64_t, RunRecord> ofEach;  // the last run, or the one that is running
  std::set<int64_t> running;            // the tasks with a run that waits or is running

  const RunRecord *of(int64_t task) const;
};

// By a list that the caller has read, or one that is read for it.
LatestRuns latestRuns(const TaskList &list);
LatestRuns latestRuns();

// "finished", "failed 7", "killed KILL", "running", "not started".
std::string outcomeInBrief(const RunRecord &run);

// "failed 7, 3 h ago"; "running for 3 h".
std::string runInBrief(const RunRecord &run, int64_t now);
