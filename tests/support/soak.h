// Tests that repeat something do so ZELO_SOAK_FACTOR times as often as usual: above 1 to find rare
// failures, below 1 where each step takes longer (sanitizers, coverage, emulators).
#pragma once

#include <algorithm>
#include <cstdlib>

namespace support {

inline double soakFactor() {
  const char *factor = std::getenv("ZELO_SOAK_FACTOR");
  return factor != nullptr ? std::atof(factor) : 1;
}

inline bool isShortRun() {
  return soakFactor() < 1;
}

// At least once.
inline int timesSoaked(int usual) {
  return std::max(1, static_cast<int>(usual * soakFactor()));
}

}  // namespace support
