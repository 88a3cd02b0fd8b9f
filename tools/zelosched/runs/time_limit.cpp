#include "runs/time_limit.h"

#include <algorithm>
#include <cctype>
#include <charconv>

#include "runs/time_units.h"

namespace {

constexpr std::string_view kBeforeLimit = "timeout --kill-after=30s ";
constexpr std::string_view kBeforeCommand = " sh -c ";
constexpr char kQuote = '\'';
constexpr std::string_view kQuotedQuote = "'\\''";
constexpr size_t kMostDigits = 6;  // of seconds eleven days, of hours a century

std::string quoted(std::string_view command) {
  std::string text(1, kQuote);
  for (const char c : command) {
    if (c == kQuote) {
      text += kQuotedQuote;
    } else {
      text += c;
    }
  }
  return text + kQuote;
}

// Nothing when the text is not one word that quoted() has made.
std::optional<std::string> unquoted(std::string_view text) {
  if (text.size() < 2 || text.front() != kQuote || text.back() != kQuote) return std::nullopt;
  text = text.substr(1, text.size() - 2);
  std::string command;
  while (!text.empty()) {
    if (text.front() != kQuote) {
      command += text.front();
      text.remove_prefix(1);
    } else if (text.starts_with(kQuotedQuote)) {
      command += kQuote;
      text.remove_prefix(kQuotedQuote.size());
    } else {
      return std::nullopt;
    }
  }
  return command;
}

}  // namespace

std::optional<int64_t> secondsOfLimit(std::string_view limit) {
  if (limit.size() < 2 || limit.size() > kMostDigits + 1 || limit.front() == '0') {
    return std::nullopt;
  }
  const std::string_view digits = limit.substr(0, limit.size() - 1);
  const std::optional<int64_t> unit = secondsOfUnit(limit.back());
  const bool isNumber = std::all_of(digits.begin(), digits.end(),
                                    [](unsigned char c) { return std::isdigit(c) != 0; });
  if (!isNumber || !unit) return std::nullopt;
  int64_t number = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), number);
  return number * *unit;
}

std::string storedCommand(const LimitedCommand &limited) {
  if (limited.limit.empty()) return limited.command;
  std::string text(kBeforeLimit);
  return text.append(limited.limit).append(kBeforeCommand).append(quoted(limited.command));
}

LimitedCommand takeApart(std::string_view stored) {
  LimitedCommand whole{std::string(stored), ""};
  if (!stored.starts_with(kBeforeLimit)) return whole;
  const std::string_view rest = stored.substr(kBeforeLimit.size());
  const size_t end = rest.find(' ');
  const std::string_view limit = rest.substr(0, end);
  if (end == std::string_view::npos || !secondsOfLimit(limit)) return whole;
  if (!rest.substr(end).starts_with(kBeforeCommand)) return whole;
  std::optional<std::string> command = unquoted(rest.substr(end + kBeforeCommand.size()));
  if (!command) return whole;
  return {std::move(*command), std::string(limit)};
}

bool isEndedByLimit(std::string_view stored, int exitCode, double seconds) {
  if (exitCode != kTimeLimitExit && exitCode != kTimeLimitKillExit) return false;
  const std::optional<int64_t> limit = secondsOfLimit(takeApart(stored).limit);
  return limit && seconds >= static_cast<double>(*limit);
}
