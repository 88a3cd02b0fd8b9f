// The history of the runs, over any number of boots: keepers, the tools and the sweep write it to
// /usr/zelo/var/history.sqlite, and outputs about runs are made from it.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "runs/kept_database.h"
#include "runs/run_record.h"
#include "runs/runs.h"
#include "runs/settings.h"

// Identifies a process within a boot: its pid, and its start time in the clock ticks of /proc.
struct ProcessName {
  int64_t pid = 0;
  int64_t born = 0;
};

// A zombie is not alive.
bool isAlive(const ProcessName &process);
// `born` is 0 where there is no such process.
ProcessName processNamed(int64_t pid);

// The process of a row of the status database that says running, which has a pid alone. `born` is 0
// where the process cannot be the run's: it was started later, or has not root's saved user id,
// which a run's process keeps.
ProcessName processOf(const Run &row);

// Whether the history has the run of the row.
bool isKnown(const KeptDatabase &kept, const Run &row);

// A run with the fields that only writers of the history need.
struct KeptRun : RunRecord {
  std::optional<int64_t> generation;  // of the task (task_notes.h)
  std::string boot;                   // during which it was last seen
  std::optional<int64_t> statusId;    // in the status database; none before it started
  ProcessName process;  // the run's own, which waits for its turn, then for the command
  ProcessName keeper;   // pid 0: none
  std::optional<int64_t> stopAsked;  // when 'stop' was asked to end it
  bool isTold = false;               // notices of its end are sent, or being sent
};

struct RunFilter {
  std::optional<int64_t> task;  // its runs, without those of removed tasks that had its id
  std::optional<int64_t> run;
  std::optional<int64_t> since;  // moments
  std::optional<int64_t> until;
  bool failed = false;          // only those that did not end well
  bool underWay = false;        // only those that have not ended
  bool ofTasksOfToday = false;  // only those of existing tasks
  int64_t limit = -1;           // no limit when negative
};

// Newest first. Each of these throws Failure.
std::vector<KeptRun> runsOf(const KeptDatabase &kept, const RunFilter &filter);

// The last run of each existing task: of all its runs, or of those that have ended without being
// stopped or cancelled. Runs in the future, recorded by a wrong clock, are left out.
enum class LastRun { kOfAll, kEnded };
std::vector<KeptRun> lastRuns(const KeptDatabase &kept, LastRun which = LastRun::kOfAll);

// When existing tasks last finished well, by their ids.
std::map<int64_t, int64_t> lastSuccesses(const KeptDatabase &kept);

// How many runs ended in which way.
std::map<Outcome, int64_t> countByOutcome(const KeptDatabase &kept);

// As runsOf, on a connection of its own; none when there is no history yet.
std::vector<KeptRun> keptRuns(const RunFilter &filter);

// Whether the run has ended in another way than by its command's success.
bool isBad(const RunRecord &run);

// Inserts the run, which gets its number, or updates its row. A row of the same run by the sweep is
// deleted. In a transaction of the caller's.
void saveRun(const KeptDatabase &kept, KeptRun *run);

// The beginning and the end of what a run printed.
struct Output {
  std::string head;
  std::string tail;
  int64_t leftOut = 0;  // bytes between them
};

// Nothing is stored while the file system is nearly full. In a transaction of the caller's.
void saveOutput(const KeptDatabase &kept, const KeptRun &run, const Output &output,
                const Settings &settings);
std::optional<Output> outputOf(const KeptDatabase &kept, int64_t run);

// Drops what the settings no longer keep, and what is known of removed tasks without a run.
void dropOldRuns(const KeptDatabase &kept, const Settings &settings);

// Records a notice of a kind, such as "missed", about a moment. True for the first caller only, who
// is to send it. In a transaction of the caller's.
bool noteTold(const KeptDatabase &kept, std::string_view kind, int64_t generation, int64_t moment);

// Whether the task's last ended run before this one was bad.
bool wasBadBefore(const KeptDatabase &kept, const KeptRun &run);
