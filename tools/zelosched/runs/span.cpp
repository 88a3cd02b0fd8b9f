#include "runs/span.h"

#include "terminal/number.h"

namespace {

struct Unit {
  char letter;
  int64_t seconds;
};
constexpr Unit kUnits[] = {{'m', 60}, {'h', int64_t{60} * 60}, {'d', int64_t{24} * 60 * 60}};

}  // namespace

std::optional<int64_t> parseSpan(const std::string &text, int64_t most) {
  for (const Unit &unit : kUnits) {
    if (text.empty() || text.back() != unit.letter) continue;
    const std::optional<int64_t> count = parseNumber(text.substr(0, text.size() - 1));
    if (count && *count > 0 && *count <= most / unit.seconds) return *count * unit.seconds;
  }
  return std::nullopt;
}
