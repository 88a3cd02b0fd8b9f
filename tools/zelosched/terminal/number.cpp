#include "terminal/number.h"

#include <charconv>

std::optional<int64_t> parseNumber(std::string_view text) {
  const char *end = text.data() + text.size();
  int64_t number = 0;
  const auto [parsed, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc{} || parsed != end) return std::nullopt;
  return number;
}
