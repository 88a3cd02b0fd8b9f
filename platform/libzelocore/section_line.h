// The lines of a section file: reading them, and writing a section.
#ifndef ZELOCORE_SECTION_LINE_H
#define ZELOCORE_SECTION_LINE_H

#include <cstddef>
#include <string>
#include <string_view>

#include "szhash.h"

namespace zelo {

// The carriage return is blank so that files edited elsewhere read the same.
constexpr bool isBlank(char c) noexcept {
  return c == ' ' || c == '\t' || c == '\r';
}

constexpr std::string_view trimLeft(std::string_view text) noexcept {
  while (!text.empty() && isBlank(text.front())) {
    text.remove_prefix(1);
  }
  return text;
}

constexpr std::string_view trim(std::string_view text) noexcept {
  text = trimLeft(text);
  while (!text.empty() && isBlank(text.back())) {
    text.remove_suffix(1);
  }
  return text;
}

// Up to and with the line feed, or to the end of the text.
size_t lineEnd(std::string_view text, size_t from) noexcept;
// The line that lies from `begin` to `end`, without its line feed.
std::string_view lineAt(std::string_view text, size_t begin, size_t end) noexcept;

// Whether a name can be written between brackets and read back.
bool isSectionName(std::string_view name) noexcept;
// Whether a key can be written before the equals sign and read back.
bool isSectionKey(std::string_view key) noexcept;

bool isCommentOrEmpty(std::string_view trimmed) noexcept;
// False for a line that gives no name, which is then an ordinary line.
bool parseSectionLine(std::string_view trimmed, std::string_view *name) noexcept;
// Sets every key of the lines after the section's name. A line without one is skipped.
void readKeys(std::string_view body, QLIBC_SZHASH &hash);

// The lines of a section: its name, and all keys in byte order.
std::string sectionOf(std::string_view name, const QLIBC_SZHASH &hash);

}  // namespace zelo

#endif
