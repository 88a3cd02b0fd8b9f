// The id of a power task: its entry of the power schedule, and the list that the entry is in, as
// digits.
//
//   d WWW HH MM    d = 6 power-on, 8 power-off, and one more when the entry is enabled
#ifndef POWER_ID_H
#define POWER_ID_H

#include <zelosdk.h>

#include <optional>

struct PowerTime {
  int list;  // ZELO_AUTOPOWER_ON or ZELO_AUTOPOWER_OFF
  ZELO_AUTOPOWER entry;
};

constexpr bool operator==(const PowerTime &a, const PowerTime &b) {
  return a.list == b.list && a.entry.enabled == b.entry.enabled &&
         a.entry.weekdays == b.entry.weekdays && a.entry.hour == b.entry.hour &&
         a.entry.minute == b.entry.minute;
}

namespace power_id {

constexpr long kHundred = 100;
constexpr long kWeekdayUnit = 10000;
constexpr long kWeekdayDigits = 1000;
constexpr long kWeekdayBits = 0xFF;
constexpr long kLeadingUnit = 10000000;
constexpr long kFirstLeading = 6;
constexpr long kLastLeading = 9;
constexpr long kFirstOff = 8;

}  // namespace power_id

constexpr bool isPowerId(long id) {
  using namespace power_id;
  const long leading = id / kHundred / kHundred / kWeekdayDigits;
  return leading >= kFirstLeading && leading <= kLastLeading;
}

constexpr std::optional<PowerTime> powerTimeOf(long id) {
  using namespace power_id;
  if (!isPowerId(id)) {
    return std::nullopt;
  }
  const long leading = id / kLeadingUnit;
  const auto byte = [](long value) { return static_cast<unsigned char>(value); };
  return PowerTime{
      leading >= kFirstOff ? ZELO_AUTOPOWER_OFF : ZELO_AUTOPOWER_ON,
      {byte((leading - kFirstLeading) % 2), byte(id / kWeekdayUnit % kWeekdayDigits & kWeekdayBits),
       byte(id / kHundred % kHundred), byte(id % kHundred)}};
}

// No id for an entry with a number too large for its digits: it would be that of another entry, or
// outside the backend's range.
constexpr std::optional<long> powerIdOf(const PowerTime &time) {
  using namespace power_id;
  const long base = (time.list == ZELO_AUTOPOWER_OFF ? kFirstOff : kFirstLeading) * kLeadingUnit;
  const long id = base + time.entry.enabled * kLeadingUnit + time.entry.weekdays * kWeekdayUnit +
                  time.entry.hour * kHundred + time.entry.minute;
  const std::optional<PowerTime> back = powerTimeOf(id);
  if (!back || !(*back == time)) {
    return std::nullopt;
  }
  return id;
}

#endif
