// Whether power times can be added: no two may be equal, which the library would make one, and each
// direction has a limit. An import checks this before it saves anything.
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

  // Makes room by a stored power time, by its stored id.
  void leave(const ZELO_SCHED_TASK &task) { ids_.erase(task.ID); }

 private:
  std::set<int32_t> ids_;
};
