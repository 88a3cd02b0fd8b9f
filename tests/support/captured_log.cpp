#include "captured_log.h"

#include <syslog.h>

#include <cctype>
#include <cerrno>
#include <cstdarg>
#include <cstdio>

#include "failing_calls.h"
#include "shared_memory.h"

namespace support {
namespace {

constexpr size_t kLogCapacity = size_t{256} << 20;  // a line can quote a text of 100 MB

SharedLines &log() {
  static SharedLines lines(kLogCapacity);
  return lines;
}

void keep(int priority, const char *format, va_list arguments) {
  const OwnWork own;
  // "%m" means the errno of the caller, who also finds it unchanged afterwards.
  const int entryErrno = errno;
  va_list again;
  va_copy(again, arguments);
  const int length = vsnprintf(nullptr, 0, format, arguments);
  std::string text(length > 0 ? static_cast<size_t>(length) : 0, '\0');
  errno = entryErrno;
  vsnprintf(text.data(), text.size() + 1, format, again);
  va_end(again);
  log().append(priority, text);
  errno = entryErrno;
}

size_t endOfDigits(const std::string &text, size_t at) {
  while (at < text.size() && std::isdigit(static_cast<unsigned char>(text[at]))) ++at;
  return at;
}

// The place of the number in "file:123" that starts at `at`, followed by `end`.
bool findLineNumber(const std::string &text, size_t at, char end, size_t *from, size_t *to) {
  while (at < text.size() && text[at] != ':' && text[at] != ' ' && text[at] != ']') ++at;
  if (at >= text.size() || text[at] != ':') return false;
  *from = at + 1;
  *to = endOfDigits(text, *from);
  return *to > *from && *to < text.size() && text[*to] == end;
}

}  // namespace

std::string normalisedLine(const std::string &line) {
  constexpr std::string_view kTail = "[0x";
  constexpr std::string_view kTailStart = "[0xFFFF ";
  std::string text = line;
  size_t from = 0;
  size_t to = 0;
  if (findLineNumber(text, 0, ' ', &from, &to)) text.replace(from, to - from, "N");
  for (size_t at = text.find(kTail); at != std::string::npos; at = text.find(kTail, at + 1)) {
    const size_t file = at + kTailStart.size();
    if (findLineNumber(text, file, ']', &from, &to)) text.replace(from, to - from, "N");
  }
  return text;
}

std::vector<std::string> loggedRaw() {
  return log().texts();
}

std::vector<std::string> logged() {
  std::vector<std::string> lines;
  for (const std::string &line : loggedRaw()) lines.push_back(normalisedLine(line));
  return lines;
}

std::vector<int> loggedPriorities() {
  std::vector<int> priorities;
  for (const SharedLines::Line &line : log().lines()) priorities.push_back(line.number);
  return priorities;
}

void clearLog() {
  log().clear();
}

}  // namespace support

// The names that a caller's syslog() may have been compiled to.
extern "C" {

void vsyslog(int priority, const char *format, va_list arguments) {
  support::keep(priority, format, arguments);
}

void syslog(int priority, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  support::keep(priority, format, arguments);
  va_end(arguments);
}

void __vsyslog_chk(int priority, int flag, const char *format, va_list arguments);
void __vsyslog_chk(int priority, int, const char *format, va_list arguments) {
  support::keep(priority, format, arguments);
}

void __syslog_chk(int priority, int flag, const char *format, ...);
void __syslog_chk(int priority, int, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  support::keep(priority, format, arguments);
  va_end(arguments);
}
}
