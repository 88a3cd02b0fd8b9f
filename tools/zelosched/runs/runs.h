// The recorded runs. The status database is read only: SELECT, and never made by a look at it.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

struct sqlite3;

struct Run {
  long statusId = 0;
  long pid = 0;
  long start = 0;  // seconds since the epoch
  std::string app;
  long taskId = 0;
  int statusCode = 0;  // a run whose process is gone reads as ZELO_SCHED_STATUS_GONE
  std::string comment;
};

// By its record it goes on, but its process does not.
bool isGone(const Run &run);

// This user has the rights to read the status database, or will have when it is there.
bool mayReadRuns();

class RunDatabase {
 public:
  // Null inside when there is no database yet, which therefore has no runs. Throws Failure.
  RunDatabase();

  // Newest first; of one task, or of all; at most `limit`, or all for a negative one.
  std::vector<Run> newest(std::optional<long> taskId, long limit) const;
  // The latest run of each task.
  std::map<long, Run> latestOfEach() const;
  std::vector<Run> running() const;
  long lastStatusId() const;
  // The run of a process that was recorded after `statusId`.
  std::optional<Run> runOfProcess(long pid, long statusId) const;

 private:
  std::vector<Run> select(const char *rest, const std::vector<long> &values) const;

  struct Close {
    void operator()(sqlite3 *db) const;
  };
  std::unique_ptr<sqlite3, Close> db_;
};
