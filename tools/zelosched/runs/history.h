// The history of the runs, over any number of boots: what keepers, the tools and the sweep write
// into /usr/zelo/var/history.sqlite, and what every output about runs is made of.
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

// A process by what no other one of this boot ever has: its number and when it began, in the clock
// ticks of /proc.
struct ProcessName {
  int64_t pid = 0;
  int64_t born = 0;
};

// One that has ended, and waits for its parent to ask how, is not alive.
bool isAlive(const ProcessName &process);
// `born` is 0 where there is none.
ProcessName processNamed(int64_t pid);

// Of a row of the status database that says that it goes on, which has a number alone. `born` is 0
// where the process cannot be the run's: it is younger, or has not root's saved user id, which a
// run's process keeps as its way back.
ProcessName processOf(const Run &row);

// The history has the run of that row.
bool isKnown(const KeptDatabase &kept, const Run &row);

// With what only writers need to know.
struct KeptRun : RunRecord {
  std::optional<int64_t> generation;  // of the task (task_notes.h)
  std::string boot;                   // during which it was last seen
  std::optional<int64_t> statusId;    // in the status database; none before it started
  ProcessName process;                // the run's own, which waits for its turn and for the command
  ProcessName keeper;                 // pid 0: none
  std::optional<int64_t> stopAsked;   // when 'stop' was asked to end it
  bool isTold = false;                // those who wanted to know have been told of its end
};

struct RunFilter {
  std::optional<int64_t> task;  // its runs, without those of a removed one that had its id
  std::optional<int64_t> run;
  std::optional<int64_t> since;  // moments
  std::optional<int64_t> until;
  bool failed = false;          // those alone that did not end well
  bool underWay = false;        // those alone that have not ended
  bool ofTasksOfToday = false;  // those alone of tasks that are there
  int64_t limit = -1;           // none for a negative one
};

// Newest first. Each of these throws Failure.
std::vector<KeptRun> runsOf(const KeptDatabase &kept, const RunFilter &filter);

// The last run of each task of today: one row a task, however many runs there are; the last of all,
// or of those that have ended and that nobody has stopped or cancelled. One in the future was
// recorded by a clock that was wrong.
enum class LastRun { kOfAll, kEnded };
std::vector<KeptRun> lastRuns(const KeptDatabase &kept, LastRun which = LastRun::kOfAll);

// When a task of today last finished well, by its id.
std::map<int64_t, int64_t> lastSuccesses(const KeptDatabase &kept);

// How many runs ended in which way.
std::map<Outcome, int64_t> countByOutcome(const KeptDatabase &kept);

// As runsOf, in a look of its own; none when there is no history yet.
std::vector<KeptRun> keptRuns(const RunFilter &filter);

// It ended otherwise than by its command's success.
bool isBad(const RunRecord &run);

// Adds the run, which gets its number, or writes what is known of it now. Where the sweep was
// faster, its row gives way. In a transaction of the caller's.
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

// True for the one caller that is to tell of it: of a run ("missed" and the like), at a moment. In
// a transaction of the caller's.
bool noteTold(const KeptDatabase &kept, std::string_view kind, int64_t generation, int64_t moment);

// Of the last run of the task before this one, which ended: it was bad.
bool wasBadBefore(const KeptDatabase &kept, const KeptRun &run);
