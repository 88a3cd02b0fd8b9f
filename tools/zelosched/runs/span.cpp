#include "runs/span.h"

#include "runs/time_units.h"
#include "terminal/number.h"

std::optional<int64_t> parseSpan(const std::string &text, int64_t most) {
  if (text.empty()) return std::nullopt;
  const std::optional<int64_t> count = parseNumber(text.substr(0, text.size() - 1));
  const std::optional<int64_t> unit = secondsOfUnit(text.back());
  if (!count || !unit || *unit == 1 || *count <= 0 || *count > most / *unit) return std::nullopt;
  return *count * *unit;
}
