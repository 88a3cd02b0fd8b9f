// The names of an entry's weekdays, which no call shows.
#ifndef POWER_DAY_NAMES_H
#define POWER_DAY_NAMES_H

#include <cstdint>

#include "sched_text.h"

constexpr const char *kPowerDayNames[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};

// One object serves for all entries of a sync. Its bit starts at Sunday and is not reset, so that
// the entries after the first get no names.
class PowerDayNames {
 public:
  using Text = BoundedText<32>;

  Text of(uint32_t weekdays) {
    Text text;
    for (const char *szName : kPowerDayNames) {
      if ((weekdays & bit_) != 0) {
        text.append(",%s", szName);
      }
      bit_ <<= 1;
    }
    return text;
  }

 private:
  uint32_t bit_ = 1;
};

#endif
