// A run as the history tells of it.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

enum class Trigger { kSchedule, kManual, kCatchUp, kOther };
enum class RunState { kWaiting, kRunning, kEnded };
// An exit status has the same name, which a scoped one does not hide.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wshadow"
enum class Outcome {
  kNone,  // it has not ended
  kFinished,
  kFailed,      // the command exited with another code than 0
  kKilled,      // a signal ended it
  kNotStarted,  // the command could not be started
  kTimeLimit,
  kGaveUp,     // it waited for other runs for too long
  kCancelled,  // by 'stop', while it waited
  kStopped,    // by 'stop', while it ran
  kLost,       // its process is gone, and nobody saw how it ended
};
#pragma GCC diagnostic pop

struct RunRecord {
  int64_t run = 0;  // its number in the history, which no other run ever gets
  int64_t task = 0;
  std::string taskName;  // as it was when the run was noted
  std::string app;
  std::string owner;  // his name, or his number when he has none
  Trigger trigger = Trigger::kOther;
  RunState state = RunState::kWaiting;
  Outcome outcome = Outcome::kNone;
  // Moments, in seconds since the epoch.
  std::optional<int64_t> due;
  std::optional<int64_t> queued;
  std::optional<int64_t> start;
  std::optional<int64_t> end;
  std::optional<double> duration;  // seconds, by a clock that nobody sets
  std::optional<int> exitCode;
  std::optional<int> signal;
  int64_t outputBytes = 0;  // all that it printed, also what was not kept
};

// "time-limit" and the like: the words of every output.
const char *nameOf(Trigger trigger);
const char *nameOf(RunState state);
const char *nameOf(Outcome outcome);
