// Runs of tasks, as seen from outside the library.
//
//   pid_t pid = deadProcess();                   of a process that was and is no more
//   waitForChildRuns();                          until no child process is left; no polling
//   std::vector<StatusRow> rows = statusRows();  the status database, in order of insertion
//   addStatusRow({.pid = 1, .timestamp = 5, .app = "a", .taskId = 7, .statusCode = 2});
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace support {

struct StatusRow {
  long statusId = 0;
  long pid = 0;
  int64_t timestamp = 0;
  std::string app{};
  long taskId = 0;
  int statusCode = 0;
  std::optional<std::string> comment{};  // nothing for NULL
  bool operator==(const StatusRow &) const = default;
};

// The rows, or none when there is no database or no table yet.
std::vector<StatusRow> statusRows();

// Adds a row to the status database, making both database and table when they are missing; the key
// is the next free one when statusId is 0. Returns the key.
long addStatusRow(const StatusRow &row);

// Waits for every process that came from this one, also for those that detached themselves. Their
// wait statuses, in the order of their ends.
std::vector<int> waitForChildRuns();

pid_t deadProcess();

}  // namespace support
