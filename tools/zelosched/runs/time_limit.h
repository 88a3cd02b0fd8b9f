// A task's time limit, which is part of its stored command, so that every other program sees it and
// can read it:
//
//   timeout --kill-after=30s 2h sh -c 'the command, with each apostrophe as '\'''
//
// A command of exactly this form is shown as the command and its limit; every other one as it is.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

struct LimitedCommand {
  std::string command;
  std::string limit;  // "2h"; empty for none
};

// Of a limit such as "90s", "30m", "2h" or "1d"; nothing for any other text.
std::optional<int64_t> secondsOfLimit(std::string_view limit);

// The stored command; as it is when the limit is empty.
std::string storedCommand(const LimitedCommand &limited);

// The reverse of storedCommand().
LimitedCommand takeApart(std::string_view stored);

// The exit status of timeout(1) when the time is up, and when it had to kill the command then.
inline constexpr int kTimeLimitExit = 124;
inline constexpr int kTimeLimitKillExit = 137;

// Whether a run of the stored command, so many seconds long and with that exit code, was ended by
// its limit. The same code before the limit is the command's own.
bool isEndedByLimit(std::string_view stored, int exitCode, double seconds);
