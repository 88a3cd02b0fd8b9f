// How long the tests run whose length is a number: ZELO_SOAK_FACTOR times as long as usual. Above 1
// they look for what is rare. Below, where each step takes several times as long, under a sanitizer
// or with its lines counted, they do with a part.
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
