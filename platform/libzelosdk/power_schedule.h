// The stored power times, for the units of this library.
#ifndef ZELOSDK_POWER_SCHEDULE_H
#define ZELOSDK_POWER_SCHEDULE_H

#include <vector>

#include "zelosdk.h"

namespace zelo {

// All entries of a list. 0, or -1 with the reason as ZELOAutoPowerConfGet gives it. Throws when
// memory is short.
int readPowerList(int list, std::vector<ZELO_AUTOPOWER> *entries);

}  // namespace zelo

#endif
