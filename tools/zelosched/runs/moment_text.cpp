#include "runs/moment_text.h"

#include <cstdio>
#include <cstdlib>
#include <ctime>

#include "runs/time_units.h"
#include "terminal/number.h"

namespace {

std::optional<int64_t> ago(const std::string &text, int64_t now) {
  if (text.size() < 2) return std::nullopt;
  const std::optional<int64_t> count = parseNumber(text.substr(0, text.size() - 1));
  constexpr int64_t kMostCount = 10000000;
  const std::optional<int64_t> unit = secondsOfUnit(text.back());
  if (!count || *count < 0 || *count > kMostCount || !unit) return std::nullopt;
  return now - *count * *unit;
}

std::optional<int64_t> byFormat(const std::string &text, const char *format, tm fields) {
  const char *end = strptime(text.c_str(), format, &fields);
  if (end == nullptr || *end != '\0') return std::nullopt;
  fields.tm_isdst = -1;
  return mktime(&fields);
}

std::optional<int64_t> withOffset(const std::string &text) {
  for (const char *format : {"%Y-%m-%dT%H:%M:%S%z", "%Y-%m-%dT%H:%M%z"}) {
    tm fields{};
    const char *end = strptime(text.c_str(), format, &fields);
    if (end == nullptr || *end != '\0') continue;
    const int64_t offset = fields.tm_gmtoff;
    return timegm(&fields) - offset;
  }
  return std::nullopt;
}

}  // namespace

std::string momentText(int64_t moment) {
  const time_t seconds = moment;
  tm fields{};
  char text[64];
  if (localtime_r(&seconds, &fields) == nullptr) return std::to_string(moment);
  const auto minutes = static_cast<int>(fields.tm_gmtoff / kMinute);
  const int size = std::abs(minutes);
  std::snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d%c%02d:%02d",
                fields.tm_year + 1900, fields.tm_mon + 1, fields.tm_mday, fields.tm_hour,
                fields.tm_min, fields.tm_sec, minutes < 0 ? '-' : '+', size / kMinutesPerHour,
                size % kMinutesPerHour);
  return text;
}

std::optional<int64_t> parseMoment(std::string_view given, int64_t now) {
  const std::string text(given);
  if (const std::optional<int64_t> moment = ago(text, now)) return moment;
  if (const std::optional<int64_t> moment = withOffset(text)) return moment;
  for (const char *format :
       {"%Y-%m-%d", "%Y-%m-%d %H:%M", "%Y-%m-%d %H:%M:%S", "%Y-%m-%dT%H:%M", "%Y-%m-%dT%H:%M:%S"}) {
    if (const std::optional<int64_t> moment = byFormat(text, format, tm{})) return moment;
  }
  const time_t seconds = now;
  tm today{};
  localtime_r(&seconds, &today);
  today.tm_sec = 0;
  std::optional<int64_t> moment = byFormat(text, "%H:%M", today);
  if (moment && *moment > now) {
    --today.tm_mday;
    moment = byFormat(text, "%H:%M", today);
  }
  return moment;
}
