#include "fake_clock.h"

#include <cstdlib>
#include <optional>
#include <stdexcept>

namespace support {
namespace {

std::optional<time_t> &fakeNow() {
  static std::optional<time_t> now;
  return now;
}

unsigned readCount = 0;

}  // namespace

unsigned clockReads() {
  return readCount;
}

time_t localTime(const std::string &text) {
  for (const char *format : {"%Y-%m-%d %H:%M:%S", "%Y-%m-%d %H:%M"}) {
    tm broken{};
    broken.tm_isdst = -1;
    const char *end = strptime(text.c_str(), format, &broken);
    if (end != nullptr && *end == '\0') return mktime(&broken);
  }
  throw std::invalid_argument("no \"YYYY-MM-DD hh:mm[:ss]\": " + text);
}

void setClock(const std::string &text) {
  setClock(localTime(text));
}

void setClock(time_t now) {
  fakeNow() = now;
}

void realClock() {
  fakeNow().reset();
}

void setZone(const std::string &zone) {
  setenv("TZ", zone.c_str(), 1);
  tzset();
}

}  // namespace support

extern "C" time_t time(time_t *result) noexcept {
  ++support::readCount;
  timespec real{};
  clock_gettime(CLOCK_REALTIME, &real);
  const time_t now = support::fakeNow().value_or(real.tv_sec);
  if (result != nullptr) *result = now;
  return now;
}
