// Which power times can still be added: no two alike, which the library would make one, and no more
// of a direction than fit. Told beforehand, as an import changes nothing unless all of it can be
// saved.
#pragma once

#include <zelosched.h>

#include <cstddef>
#include <set>
#include <string>

// The application of all power times.
inline constexpr char kPowerApp[] = "ZELO.TOV.TaskScheduler.AutoPower";

// "on" or "off".
std::string directionOf(const ZELO_SCHED_TASK &task);

// The id that the library makes of a power time's content; see zeloautopower_init.
int32_t powerId(const ZELO_SCHED_TASK &task);

// The stored power times, and those that are to be added to them.
class PowerRoom {
 public:
  // Throws Failure.
  PowerRoom();

  // Throws Failure when the power time has no room, and counts it otherwise.
  void take(const ZELO_SCHED_TASK &task);

  // A stored power time gives its place up, by its stored id.
  void leave(const ZELO_SCHED_TASK &task) { ids_.erase(task.ID); }

 private:
  std::set<int32_t> ids_;
};
