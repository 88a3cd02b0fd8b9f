// A run as it is in the history.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

enum class Trigger { kSchedule, kManual, kCatchUp, kOther };
enum class RunState { kWaiting, kRunning, kEnded };
// kFailed is an exit status too, which a scoped enumerator does not hide.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wshadow"
enum class Outcome {
  kNone,  // it has not ended
  kFinished,
  kFailed,      // the command exited with another code than 0
  kKilled,      // a signal ended it
  kNotStarted,  // the command could not be started
  kTimeLimit,
  kGaveUp,     // it waited too long for other runs
  kCancelled,  // by 'stop', while it waited
  kStopped,    // by 'stop', while it ran
  kLost,       // its process is gone, and nobody saw how it ended
};
#pragma GCC diagnostic pop

struct RunRecord {
  int64_t run = 0;  // its number in the history, which is not reused
  int64_t task = 0;
  std::string taskName;  // as it was when the run was recorded
  std::string app;
  std::string owner;  // the user's name, or the uid without one
  Trigger trigger = Trigger::kOther;
  RunState state = RunState::kWaiting;
  Outcome outcome = Outcome::kNone;
  // Moments, in seconds since the epoch.
  std::optional<int64_t> due;
  std::optional<int64_t> queued;
  std::optional<int64_t> start;
  std::optional<int64_t> end;
  std::optional<double> duration;  // seconds; where a keeper saw the start, by CLOCK_BOOTTIME
  std::optional<int> exitCode;
  std::optional<int> signal;
  int64_t outputBytes = 0;  // all that it printed, also what was not kept
};

// "time-limit" and the like, for every output.
const char *nameOf(Trigger trigger);
const char *nameOf(RunState state);
const char *nameOf(Outcome outcome);
