// When the machine is off by its power times.
#pragma once

#include <vector>

#include "runs/coming_runs.h"
#include "store/task_list.h"

class PlannedOff {
 public:
  // By the enabled power times of the list.
  explicit PlannedOff(const TaskList &list);

  // Whether the last power time before that minute switches the machine off. One that switches it
  // on in this minute comes too late, as the machine is still starting.
  bool isOffAt(const LocalMinute &minute) const;

 private:
  struct Event {
    int minuteOfWeek;
    bool isOff;
  };
  std::vector<Event> events_;  // by their minute; where one has both, switching off comes last
};
