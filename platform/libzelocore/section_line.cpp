#include "section_line.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <map>

namespace zelo {
namespace {

constexpr bool isCommentMark(char c) noexcept {
  return c == '#' || c == ';';
}

constexpr bool isControl(char c) noexcept {
  constexpr unsigned char kFirstPrintable = 0x20;
  constexpr unsigned char kDelete = 0x7f;
  const auto byte = static_cast<unsigned char>(c);
  return byte < kFirstPrintable || byte == kDelete;
}

bool hasBlankEdge(std::string_view text) noexcept {
  return isBlank(text.front()) || isBlank(text.back());
}

// A line that begins with a bracket is no key line, even where it names no section.
bool isNoKeyLine(std::string_view trimmed) noexcept {
  return isCommentOrEmpty(trimmed) || trimmed.front() == '[';
}

// ---- escapes ----

struct Escape {
  char letter;
  char byte;
};

constexpr Escape kEscapes[] = {
    {'"', '"'}, {'\\', '\\'}, {'n', '\n'}, {'t', '\t'}, {'r', '\r'},
};

void appendQuoted(std::string &out, std::string_view value) {
  constexpr char kDigits[] = "0123456789abcdef";
  out.push_back('"');
  for (const char c : value) {
    if (!isControl(c) && c != '"' && c != '\\') {
      out.push_back(c);
      continue;
    }
    const auto *named = std::find_if(std::begin(kEscapes), std::end(kEscapes),
                                     [c](const Escape &escape) { return escape.byte == c; });
    out.push_back('\\');
    if (named != std::end(kEscapes)) {
      out.push_back(named->letter);
    } else {
      const auto byte = static_cast<unsigned char>(c);
      out.push_back('x');
      out.push_back(kDigits[byte >> 4]);
      out.push_back(kDigits[byte & 0xf]);
    }
  }
  out.push_back('"');
}

// Takes the escape at the front of `text`. False, with nothing taken, when there is none, or one
// for a zero byte, which no text can contain: the backslash then stands for itself.
bool takeEscape(std::string_view &text, char *byte) noexcept {
  constexpr size_t kHexSize = 4;  // \xNN
  if (text.size() < 2) {
    return false;
  }
  for (const Escape &escape : kEscapes) {
    if (text[1] == escape.letter) {
      *byte = escape.byte;
      text.remove_prefix(2);
      return true;
    }
  }
  if (text[1] != 'x' || text.size() < kHexSize) {
    return false;
  }
  unsigned number = 0;
  const char *end = text.data() + kHexSize;
  const auto parsed = std::from_chars(text.data() + 2, end, number, 16);
  if (parsed.ec != std::errc() || parsed.ptr != end || number == 0) {
    return false;
  }
  *byte = static_cast<char>(static_cast<unsigned char>(number));
  text.remove_prefix(kHexSize);
  return true;
}

// Reads on past the opening quote. False when the closing one is missing.
bool unquote(std::string_view text, std::string &value) {
  value.clear();
  while (!text.empty() && text.front() != '"') {
    char byte = text.front();
    if (byte != '\\' || !takeEscape(text, &byte)) {
      text.remove_prefix(1);
    }
    value.push_back(byte);
  }
  return !text.empty();
}

// Callers read zero-terminated texts, which end at the first zero byte.
std::string_view upToZero(std::string_view text) noexcept {
  return text.substr(0, text.find('\0'));
}

struct KeyLine {
  std::string_view key;
  std::string_view value;  // not unquoted
};

// The key is empty for a line without one.
KeyLine parseKeyLine(std::string_view line) noexcept {
  const std::string_view trimmed = trim(line);
  const size_t equals = trimmed.find('=');
  if (isNoKeyLine(trimmed) || equals == std::string_view::npos) {
    return {};
  }
  return {trim(trimmed.substr(0, equals)), trimLeft(trimmed.substr(equals + 1))};
}

// For a section with neither backslashes nor zero bytes.
void readPlainLine(const KeyLine &line, QLIBC_SZHASH &hash) {
  const bool quoted = line.value.starts_with('"');
  const size_t quote = quoted ? line.value.find('"', 1) : line.value.size();
  if (!line.key.empty() && quote != std::string_view::npos) {
    hash.set(line.key, line.value.substr(quoted ? 1 : 0, quote - (quoted ? 1 : 0)));
  }
}

void readAnyLine(const KeyLine &line, QLIBC_SZHASH &hash, std::string &scratch) {
  const std::string_view key = trim(upToZero(line.key));
  std::string_view value = line.value;
  if (value.starts_with('"')) {
    if (!unquote(value.substr(1), scratch)) {
      return;
    }
    value = scratch;
  }
  if (!key.empty()) {
    hash.set(key, upToZero(value));
  }
}

}  // namespace

size_t lineEnd(std::string_view text, size_t from) noexcept {
  const size_t feed = text.find('\n', from);
  return feed == std::string_view::npos ? text.size() : feed + 1;
}

std::string_view lineAt(std::string_view text, size_t begin, size_t end) noexcept {
  const size_t feed = end > begin && text[end - 1] == '\n' ? 1 : 0;
  return text.substr(begin, end - begin - feed);
}

bool isSectionName(std::string_view name) noexcept {
  return !name.empty() && !hasBlankEdge(name) && name.find(']') == std::string_view::npos &&
         std::none_of(name.begin(), name.end(), isControl);
}

bool isSectionKey(std::string_view key) noexcept {
  return !key.empty() && !hasBlankEdge(key) && !isNoKeyLine(key) &&
         key.find('=') == std::string_view::npos && std::none_of(key.begin(), key.end(), isControl);
}

bool isCommentOrEmpty(std::string_view trimmed) noexcept {
  return trimmed.empty() || isCommentMark(trimmed.front());
}

bool parseSectionLine(std::string_view trimmed, std::string_view *name) noexcept {
  const size_t close = trimmed.find(']');
  if (trimmed.empty() || trimmed.front() != '[' || close == std::string_view::npos ||
      !isCommentOrEmpty(trimLeft(trimmed.substr(close + 1)))) {
    return false;
  }
  *name = trim(upToZero(trimmed.substr(1, close - 1)));
  return !name->empty();
}

// Searching the section once for backslashes and zero bytes is faster than searching each line.
void readKeys(std::string_view body, QLIBC_SZHASH &hash) {
  const bool plain =
      body.find('\\') == std::string_view::npos && body.find('\0') == std::string_view::npos;
  std::string scratch;
  for (size_t at = 0; at < body.size();) {
    const size_t next = lineEnd(body, at);
    const KeyLine line = parseKeyLine(lineAt(body, at, next));
    if (plain) {
      readPlainLine(line, hash);
    } else {
      readAnyLine(line, hash, scratch);
    }
    at = next;
  }
}

std::string sectionOf(std::string_view name, const QLIBC_SZHASH &hash) {
  const std::map<std::string_view, std::string_view> sorted(hash.entries().begin(),
                                                            hash.entries().end());
  std::string out("[");
  out.append(name).append("]\n");
  for (const auto &[key, value] : sorted) {
    out.append(key).push_back('=');
    appendQuoted(out, value);
    out.push_back('\n');
  }
  return out;
}

}  // namespace zelo
