#include "runs/planned_off.h"

#include <algorithm>

#include "runs/time_units.h"
#include "schedule_days.h"
#include "store/power_room.h"

namespace {

constexpr int kMinutesPerDay = 24 * kMinutesPerHour;

int minuteOfDay(int hour, int minute) {
  return hour * kMinutesPerHour + minute;
}

int minuteOfWeek(const LocalMinute &minute) {
  const unsigned day = std::chrono::weekday(minute.day).c_encoding();
  return static_cast<int>(day) * kMinutesPerDay + minuteOfDay(minute.hour, minute.minute);
}

}  // namespace

PlannedOff::PlannedOff(const TaskList &list) {
  for (const TaskRecord *task : list.tasks()) {
    if (!isPower(*task) || !isEnabled(*task)) continue;
    const unsigned days = schedWeekdayMaskOf(*task);
    const int time = minuteOfDay(static_cast<int>(task->RunHour), static_cast<int>(task->RunMin));
    for (int day = 0; day < static_cast<int>(kDaysOfWeek); ++day) {
      if ((days >> day & 1U) == 0) continue;
      events_.push_back({day * kMinutesPerDay + time, directionOf(*task) == "off"});
    }
  }
  std::sort(events_.begin(), events_.end(), [](const Event &a, const Event &b) {
    return std::pair(a.minuteOfWeek, a.isOff) < std::pair(b.minuteOfWeek, b.isOff);
  });
}

bool PlannedOff::isOffAt(const LocalMinute &minute) const {
  if (events_.empty()) return false;
  const auto next = std::find_if(events_.begin(), events_.end(), [&](const Event &event) {
    return event.minuteOfWeek >= minuteOfWeek(minute);
  });
  // Before the first event of the week, the last one counts.
  return next == events_.begin() ? events_.back().isOff : std::prev(next)->isOff;
}
