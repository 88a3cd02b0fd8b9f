#include "terminal/text.h"

#include <wchar.h>

#include <algorithm>
#include <array>
#include <clocale>
#include <cstdint>
#include <cstdio>

#include "sched_utf8.h"
#include "terminal/terminal.h"

namespace {

struct Range {
  uint32_t first;
  uint32_t last;
};
// Control characters, marks of writing direction and line breaks, and invisible characters, by
// which names that look alike can differ.
constexpr Range kUnsafe[] = {
    {0x00, 0x1F},     {0x7F, 0x9F},     {0xAD, 0xAD},       {0x034F, 0x034F},   {0x061C, 0x061C},
    {0x115F, 0x1160}, {0x17B4, 0x17B5}, {0x180B, 0x180F},   {0x200B, 0x200B},   {0x200E, 0x200F},
    {0x2028, 0x202E}, {0x2060, 0x206F}, {0x2800, 0x2800},   {0x3164, 0x3164},   {0xFEFF, 0xFEFF},
    {0xFFA0, 0xFFA0}, {0xFFF9, 0xFFFB}, {0x1D159, 0x1D159}, {0x1D173, 0x1D17A}, {0xE0000, 0xE0FFF}};

bool isUnsafe(uint32_t code) {
  return std::any_of(std::begin(kUnsafe), std::end(kUnsafe),
                     [&](const Range &range) { return code >= range.first && code <= range.last; });
}

constexpr uint32_t kLastAscii = 0x7E;

bool canBeShown(uint32_t code) {
  return !isUnsafe(code) && (code <= kLastAscii || showsUnicode());
}

void appendEscaped(std::string *out, std::string_view bytes) {
  constexpr std::string_view kNamed = "\n\t\r";
  constexpr std::string_view kNames = "ntr";
  for (const char byte : bytes) {
    const size_t named = kNamed.find(byte);
    if (named != std::string_view::npos) {
      *out += '\\';
      *out += kNames[named];
      continue;
    }
    char escaped[8];
    std::snprintf(escaped, sizeof escaped, "\\x%02x",
                  static_cast<unsigned>(static_cast<unsigned char>(byte)));
    *out += escaped;
  }
}

std::string escaped(std::string_view text, std::string_view kept) {
  std::string out;
  while (!text.empty()) {
    const SchedCharacter next = schedFirstCharacter(text);
    const size_t bytes = std::max<size_t>(next.bytes, 1);
    if ((next.bytes > 0 && canBeShown(next.code)) || kept.find(text[0]) != std::string_view::npos) {
      out += text.substr(0, bytes);
    } else {
      appendEscaped(&out, text.substr(0, bytes));
    }
    text.remove_prefix(bytes);
  }
  return out;
}

// Widths do not depend on the user's locale, but the C library knows them in a UTF-8 one only.
int columnsOf(uint32_t code) {
  static const locale_t unicode = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  if (code <= kLastAscii || unicode == nullptr) return 1;
  const locale_t users = uselocale(unicode);
  const int columns = wcwidth(static_cast<wchar_t>(code));
  uselocale(users);
  return columns < 0 ? 1 : columns;
}

// Calls `take` for each character until it returns false; an invalid byte counts as a character.
template <class Take>
void forEachCharacter(std::string_view text, Take take) {
  while (!text.empty()) {
    const SchedCharacter next = schedFirstCharacter(text);
    const size_t bytes = std::max<size_t>(next.bytes, 1);
    if (!take(text.substr(0, bytes), next.code)) return;
    text.remove_prefix(bytes);
  }
}

bool needsQuotes(std::string_view word) {
  constexpr std::string_view kPlain =
      "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789@%+:,./-_";
  return word.empty() || word.find_first_not_of(kPlain) != std::string_view::npos;
}

}  // namespace

std::string_view trimmed(std::string_view text) {
  constexpr char kBlanks[] = " \t\r";
  const size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

std::string printable(std::string_view text) {
  return escaped(text, "");
}

std::string printableLines(std::string_view text) {
  return escaped(text, "\n\t");
}

size_t cutCharacterLength(std::string_view text) {
  constexpr size_t kMostOfCharacter = 4;
  constexpr unsigned char kTailMask = 0xC0;
  constexpr unsigned char kTail = 0x80;
  for (size_t bytes = 1; bytes < kMostOfCharacter && bytes <= text.size(); ++bytes) {
    const auto byte = static_cast<unsigned char>(text[text.size() - bytes]);
    if ((byte & kTailMask) == kTail) continue;
    return schedBytesOfCharacter(byte) > bytes ? bytes : 0;
  }
  return 0;
}

size_t widthOf(std::string_view printable) {
  size_t width = 0;
  forEachCharacter(printable, [&](std::string_view, uint32_t code) {
    width += static_cast<size_t>(columnsOf(code));
    return true;
  });
  return width;
}

std::string fitted(const std::string &printable, size_t columns) {
  if (widthOf(printable) <= columns) return printable;
  const std::string ellipsis = showsUnicode() ? "\u2026" : "...";
  const size_t room = columns - std::min(columns, widthOf(ellipsis));
  size_t width = 0;
  std::string out;
  forEachCharacter(printable, [&](std::string_view bytes, uint32_t code) {
    width += static_cast<size_t>(columnsOf(code));
    if (width > room) return false;
    out += bytes;
    return true;
  });
  return room == 0 ? out : out + ellipsis;
}

std::vector<std::string> wrapped(const std::string &printable, size_t columns) {
  std::vector<std::string> lines;
  std::string line;
  size_t width = 0;
  size_t blank = std::string::npos;  // the last one of the line
  forEachCharacter(printable, [&](std::string_view bytes, uint32_t code) {
    const auto own = static_cast<size_t>(columnsOf(code));
    if (width + own > columns && !line.empty()) {
      const bool isBlank = bytes == " ";
      const size_t end = isBlank ? line.size() : blank;
      const bool hasBlank = end != std::string::npos;
      lines.push_back(line.substr(0, hasBlank ? end : line.size()));
      line = hasBlank && !isBlank ? line.substr(end + 1) : "";
      width = widthOf(line);
      blank = std::string::npos;
      if (isBlank) return true;
    }
    if (bytes == " ") blank = line.size();
    line += bytes;
    width += own;
    return true;
  });
  if (!line.empty() || lines.empty()) lines.push_back(line);
  return lines;
}

std::string counted(size_t number, const char *word) {
  return std::to_string(number) + " " + word + (number == 1 ? "" : "s");
}

std::string shellQuoted(std::string_view word) {
  if (!needsQuotes(word)) return std::string(word);
  std::string quoted = "'";
  for (const char c : word) {
    if (c == '\'') {
      quoted += "'\\''";
    } else {
      quoted += c;
    }
  }
  return quoted + "'";
}
