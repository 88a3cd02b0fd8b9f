// Units of time, in seconds, and the letters that options and fields give them.
#pragma once

#include <cstdint>
#include <optional>

inline constexpr int64_t kMinute = 60;
inline constexpr int64_t kHour = 60 * kMinute;
inline constexpr int64_t kDay = 24 * kHour;
inline constexpr int kMinutesPerHour = 60;

// Of 's', 'm', 'h' and 'd'.
constexpr std::optional<int64_t> secondsOfUnit(char letter) {
  switch (letter) {
    case 's':
      return 1;
    case 'm':
      return kMinute;
    case 'h':
      return kHour;
    case 'd':
      return kDay;
    default:
      return std::nullopt;
  }
}
