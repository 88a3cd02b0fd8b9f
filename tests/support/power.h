// The machine's power times and its real-time clock, as a test sees them.
//
//   const std::vector<Entry> kTwo = {{1, 127, 7, 30}, {0, 62, 8, 0}};
//   setPowerList(kOn, kTwo);  powerList(kOn) == kTwo;
//   haveClock();      the machine has a real-time clock, with the alarm disarmed
//   haveNoClock();    it has none
//   alarm();          what stands in the clock's alarm file
#pragma once

#include <gtest/gtest.h>
#include <sys/mount.h>

#include <filesystem>
#include <ostream>
#include <stdexcept>
#include <string>
#include <vector>

#include "sandbox_fixture.h"
#include "zelosdk.h"

inline bool operator==(const ZELO_AUTOPOWER &a, const ZELO_AUTOPOWER &b) {
  return a.enabled == b.enabled && a.weekdays == b.weekdays && a.hour == b.hour &&
         a.minute == b.minute;
}

inline std::ostream &operator<<(std::ostream &out, const ZELO_AUTOPOWER &entry) {
  return out << int{entry.enabled} << " " << int{entry.weekdays} << " " << int{entry.hour} << ":"
             << int{entry.minute};
}

namespace support {

using Entry = ZELO_AUTOPOWER;
using Entries = std::vector<Entry>;

inline constexpr int kOn = ZELO_AUTOPOWER_ON;
inline constexpr int kOff = ZELO_AUTOPOWER_OFF;
inline constexpr char kClockDirectory[] = "/sys/class/rtc/rtc0";
inline constexpr char kWakeAlarm[] = "/sys/class/rtc/rtc0/wakealarm";

inline Entries powerList(int list) {
  Entries entries(1000);
  const int count = ZELOAutoPowerConfGet(list, static_cast<int>(entries.size()), entries.data());
  EXPECT_GE(count, 0);
  entries.resize(static_cast<size_t>(count < 0 ? 0 : count));
  return entries;
}

inline void setPowerList(int list, const Entries &entries) {
  ASSERT_EQ(ZELOAutoPowerConfSet(list, static_cast<int>(entries.size()), entries.data()), 0);
}

// The machine's own /sys is hidden: nothing that a test writes may reach its hardware.
inline void haveNoClock() {
  static const bool hidden = mount("sys", "/sys", "tmpfs", 0, nullptr) == 0;
  if (!hidden) throw std::runtime_error("cannot hide /sys");
  std::filesystem::remove_all("/sys/class");
}

inline void haveClock() {
  haveNoClock();
  writeFile(kWakeAlarm, "");
}

inline std::string alarm() {
  return readFile(kWakeAlarm);
}

}  // namespace support
