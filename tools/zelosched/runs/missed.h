// Times at which a task was due and did not run, whatever kept it from that: the machine was off,
// cron was stopped, or the program that cron starts was gone.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <vector>

#include "runs/history.h"
#include "runs/kept_database.h"
#include "store/task_list.h"

// How long a missed time is told of.
inline constexpr int64_t kMissedRemembered = int64_t{8} * 24 * 60 * 60;  // seconds

// Notes that the machine is up, and how its clock stands. `isStarting`: cron was not started so
// far, so that what is due up to this minute was missed for certain. Throws Failure.
void markMachineUp(bool isStarting);

// The tasks could not be put back into /tmp, or nobody tried so far.
bool areTasksLost();

// While a time passed. Nobody looks at the machine more often than every ten minutes.
enum class MachineThen { kMaybeOn, kOn, kOff };

struct MissedTask {
  const TaskRecord *task;
  time_t due = 0;  // the latest of its times that it missed; 0 when there are none but planned ones
  MachineThen machine = MachineThen::kMaybeOn;  // at that time
  size_t times = 0;                             // so many of them
  size_t planned = 0;  // beside those, as the machine was off by its power times
};

// The enabled tasks of the list with such times, by the latest of these: since the task got the
// schedule and the state that it has, since it ran for the last time, since they were acknowledged,
// and since `since`, whichever is the latest. A time counts two minutes after it. What was due
// before the clock was right after a boot is not judged. Power times are no tasks in this sense.
// Throws Failure.
std::vector<MissedTask> missedTasks(const KeptDatabase &kept, const TaskList &list, time_t since);

// What somebody has taken note of, and is warned of no more: missed times, or also the runs so far.
enum class Acknowledged { kMissed, kAll };

// Of this task, or of all. Throws Failure.
void acknowledge(const KeptDatabase &kept, std::optional<int64_t> task, Acknowledged what);
bool isAcknowledged(const KeptDatabase &kept, const KeptRun &run);
