// The runs that the library has recorded. The status database is only read, and not created.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

struct sqlite3;

struct Run {
  int64_t statusId = 0;
  int64_t pid = 0;
  int64_t start = 0;  // seconds since the epoch
  std::string app;
  int64_t taskId = 0;
  int statusCode = 0;  // a run whose process is gone reads as ZELO_SCHED_STATUS_GONE
  std::string comment;
};

// Whether its record says running, but its process is gone.
bool isGone(const Run &run);

// Identifies the status database by boot, device and inode. Empty when there is none.
std::string runDatabaseName();

// Whether this user has the rights to read the status database, or will have when it is there.
bool mayReadRuns();

class RunDatabase {
 public:
  static constexpr int kUsualPatience = 10000;  // milliseconds, while runs record themselves

  // Null inside when there is no database yet, which therefore has no runs. Throws Failure.
  explicit RunDatabase(int patience = kUsualPatience);

  // Newest first; of one task, or of all; at most `limit`, or all for a negative one.
  std::vector<Run> newest(std::optional<int64_t> taskId, int64_t limit) const;
  // The latest run of each task.
  std::map<int64_t, Run> latestOfEach() const;
  std::vector<Run> running() const;
  int64_t lastStatusId() const;
  // Recorded after that one, in the order of their ids.
  std::vector<Run> after(int64_t statusId) const;
  std::optional<Run> runOfId(int64_t statusId) const;
  // A run, other than that of process `pid`, for which one of this task or application has to wait.
  std::optional<Run> inTheWayOf(std::optional<int64_t> taskId, std::optional<std::string> app,
                                int64_t pid) const;
  // The run of a process that was recorded after `statusId`; the last one.
  std::optional<Run> runOfProcess(int64_t pid, int64_t statusId) const;

 private:
  std::vector<Run> select(const char *rest, const std::vector<int64_t> &values) const;

  struct Close {
    void operator()(sqlite3 *db) const;
  };
  std::unique_ptr<sqlite3, Close> db_;
};
