// Times at which a task was due and did not run, whatever kept it from that: the machine was off,
// cron was stopped, or the program that cron starts was gone.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <vector>

#include "runs/history.h"
#include "runs/kept_database.h"
#include "runs/time_units.h"
#include "store/task_list.h"

// How long a missed time is reported.
inline constexpr int64_t kMissedRemembered = 8 * kDay;

// Records that the machine is up, and its clock. `isStarting`: cron was not started yet, so that
// what is due up to this minute was missed for certain. Throws Failure.
void markMachineUp(bool isStarting);

// Whether the tasks could not be put back into /tmp, or have not been yet.
bool areTasksLost();

// The state of the machine at a time. Between two sweeps it may be unknown.
enum class MachineThen { kMaybeOn, kOn, kOff };

struct MissedTask {
  const TaskRecord *task;
  time_t due = 0;  // the latest of its missed times; 0 when there are planned ones only
  MachineThen machine = MachineThen::kMaybeOn;  // at that time
  size_t times = 0;                             // the number of missed times
  size_t planned = 0;  // others, when the machine was off by its power times
};

// The enabled tasks of the list with missed or planned times, by the latest of these: since the
// task got its present schedule and state, last ran or was acknowledged, and since `since`,
// whichever is the latest. A time counts two minutes after it. What was due before the clock was
// right after a boot is not judged. Power times are left out. Throws Failure.
std::vector<MissedTask> missedTasks(const KeptDatabase &kept, const TaskList &list, time_t since);

// What an acknowledgement covers: the missed times, or also the runs so far.
enum class Acknowledged { kMissed, kAll };

// For this task, or for all. Throws Failure.
void acknowledge(const KeptDatabase &kept, std::optional<int64_t> task, Acknowledged what);
bool isAcknowledged(const KeptDatabase &kept, const KeptRun &run);
