#include "section_text.h"

#include <xxhash.h>

#include <algorithm>
#include <bit>
#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <new>
#include <utility>

namespace zelo {
namespace {

constexpr std::string_view kHeader = "# zelo section file\n";
constexpr std::string_view kTrailerStart = "# end of file: ";
constexpr std::string_view kTrailerMiddle = " sections, checksum ";
constexpr const char *kTrailerFormat = "# end of file: %zu sections, checksum %016llx\n";
constexpr size_t kChecksumDigits = 16;
constexpr size_t kTrailerRoom = 96;
constexpr char kTrailerMark = '#';

/* The carriage return is blank so that files edited elsewhere read the same. */
constexpr bool IsBlank(char c) noexcept {
  return c == ' ' || c == '\t' || c == '\r';
}

constexpr bool IsCommentMark(char c) noexcept {
  return c == '#' || c == ';';
}

constexpr bool IsControl(char c) noexcept {
  constexpr unsigned char kFirstPrintable = 0x20;
  constexpr unsigned char kDelete = 0x7f;
  const auto byte = static_cast<unsigned char>(c);
  return byte < kFirstPrintable || byte == kDelete;
}

std::string_view TrimLeft(std::string_view text) noexcept {
  while (!text.empty() && IsBlank(text.front())) {
    text.remove_prefix(1);
  }
  return text;
}

std::string_view Trim(std::string_view text) noexcept {
  text = TrimLeft(text);
  while (!text.empty() && IsBlank(text.back())) {
    text.remove_suffix(1);
  }
  return text;
}

bool HasBlankEdge(std::string_view text) noexcept {
  return IsBlank(text.front()) || IsBlank(text.back());
}

bool IsCommentOrEmpty(std::string_view trimmed) noexcept {
  return trimmed.empty() || IsCommentMark(trimmed.front());
}

/* A line with a bracket in front that names no section is no key either. */
bool IsNoKeyLine(std::string_view trimmed) noexcept {
  return IsCommentOrEmpty(trimmed) || trimmed.front() == '[';
}

/* Up to and with the line feed, or to the end of the text. */
size_t LineEnd(std::string_view text, size_t from) noexcept {
  const size_t feed = text.find('\n', from);
  return feed == std::string_view::npos ? text.size() : feed + 1;
}

/* The line that lies from `begin` to `end`, without its line feed. */
std::string_view LineAt(std::string_view text, size_t begin, size_t end) noexcept {
  const size_t feed = end > begin && text[end - 1] == '\n' ? 1 : 0;
  return text.substr(begin, end - begin - feed);
}

/* The last one before `end`, or npos. */
size_t LastTrailerMark(std::string_view text, size_t end) noexcept {
  const auto *mark = static_cast<const char *>(memrchr(text.data(), kTrailerMark, end));
  return mark == nullptr ? std::string_view::npos : static_cast<size_t>(mark - text.data());
}

/* ---- trailer ---- */

struct Trailer {
  size_t sections;
  uint64_t checksum;
};

template <typename Number>
bool TakeNumber(std::string_view &text, Number *number, int base) noexcept {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), *number, base);
  if (error != std::errc()) {
    return false;
  }
  text.remove_prefix(static_cast<size_t>(end - text.data()));
  return true;
}

bool TakeText(std::string_view &text, std::string_view expected) noexcept {
  if (!text.starts_with(expected)) {
    return false;
  }
  text.remove_prefix(expected.size());
  return true;
}

bool ParseTrailer(std::string_view line, Trailer *trailer) noexcept {
  return TakeText(line, kTrailerStart) && TakeNumber(line, &trailer->sections, 10) &&
         TakeText(line, kTrailerMiddle) && Trim(line).size() == kChecksumDigits &&
         TakeNumber(line, &trailer->checksum, 16) && Trim(line).empty();
}

uint64_t Checksum(std::string_view text) noexcept {
  return XXH3_64bits(text.data(), text.size());
}

uint64_t Checksum(const ChangedText &changed) {
  const std::unique_ptr<XXH3_state_t, decltype(&XXH3_freeState)> state(XXH3_createState(),
                                                                       XXH3_freeState);
  if (state == nullptr) {
    throw std::bad_alloc();
  }
  XXH3_64bits_reset(state.get());
  for (const std::string_view piece : changed.Views()) {
    XXH3_64bits_update(state.get(), piece.data(), piece.size());
  }
  return XXH3_64bits_digest(state.get());
}

std::string TrailerOf(const ChangedText &changed, size_t sections) {
  char line[kTrailerRoom];
  const int size = std::snprintf(line, sizeof line, kTrailerFormat, sections,
                                 static_cast<unsigned long long>(Checksum(changed)));
  return {line, static_cast<size_t>(size)};
}

/* ---- escapes ---- */

struct Escape {
  char letter;
  char byte;
};

constexpr Escape kEscapes[] = {
    {'"', '"'}, {'\\', '\\'}, {'n', '\n'}, {'t', '\t'}, {'r', '\r'},
};

void AppendQuoted(std::string &out, std::string_view value) {
  constexpr char kDigits[] = "0123456789abcdef";
  out.push_back('"');
  for (const char c : value) {
    if (!IsControl(c) && c != '"' && c != '\\') {
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

/* The byte that the escape at the front of `text` stands for, which is removed.
 * False, with nothing removed, for anything that is not an escape: it stands as
 * it is then, and so does an escaped zero, which no text can hold. */
bool TakeEscape(std::string_view &text, char *byte) noexcept {
  constexpr size_t kHexSize = 4; /* \xNN */
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

/* Reads on past the opening quote. False when the closing one is missing. */
bool Unquote(std::string_view text, std::string *value) {
  value->clear();
  while (!text.empty() && text.front() != '"') {
    char byte = text.front();
    if (byte != '\\' || !TakeEscape(text, &byte)) {
      text.remove_prefix(1);
    }
    value->push_back(byte);
  }
  return !text.empty();
}

/* ---- lines ---- */

/* A text for C ends at its first zero byte. */
std::string_view UpToZero(std::string_view text) noexcept {
  return text.substr(0, text.find('\0'));
}

/* False for a line that gives no name: it is an ordinary line then. */
bool ParseSectionLine(std::string_view line, std::string_view *name) noexcept {
  const size_t close = line.find(']');
  if (line.empty() || line.front() != '[' || close == std::string_view::npos ||
      !IsCommentOrEmpty(TrimLeft(line.substr(close + 1)))) {
    return false;
  }
  *name = Trim(UpToZero(line.substr(1, close - 1)));
  return !name->empty();
}

/* As this library writes it: nothing but the name and its brackets. */
bool ParsePlainSectionLine(std::string_view line, std::string_view *name) noexcept {
  constexpr size_t kLeast = 3;
  if (line.size() < kLeast || line.back() != ']') {
    return false;
  }
  *name = line.substr(1, line.size() - 2);
  return std::all_of(name->begin(), name->end(), [](char c) { return c > ' ' && c != ']'; });
}

/* The general way to read a line, with all that a hand may have written. */
void ReadLine(std::string_view line, QLIBC_SZHASH &hash, std::string &scratch) {
  const std::string_view trimmed = Trim(line);
  const size_t equals = trimmed.find('=');
  if (IsNoKeyLine(trimmed) || equals == std::string_view::npos) {
    return;
  }
  const std::string_view key = Trim(UpToZero(trimmed.substr(0, equals)));
  std::string_view value = TrimLeft(trimmed.substr(equals + 1));
  if (key.empty()) {
    return;
  }
  if (!value.empty() && value.front() == '"') {
    if (!Unquote(value.substr(1), &scratch)) {
      return;
    }
    value = scratch;
  }
  hash.Set(key, UpToZero(value));
}

/* Reads a line as this library writes it: no blank, no escape, `key="value"`. It lies
 * in a text that the hash has taken. False, with nothing set, for any other. */
bool ReadPlainLine(std::string_view text, std::string_view line, QLIBC_SZHASH &hash) {
  constexpr size_t kLeast = 4; /* k="" */
  if (line.size() < kLeast || line.back() != '"' || IsBlank(line.front()) || IsNoKeyLine(line)) {
    return false;
  }
  const size_t equals = line.find('=');
  if (equals == 0 || equals >= line.size() - 2 || line[equals + 1] != '"' ||
      IsBlank(line[equals - 1])) {
    return false;
  }
  const std::string_view value = line.substr(equals + 2, line.size() - equals - 3);
  if (value.find('"') != std::string_view::npos) {
    return false;
  }
  hash.SetTaken(line.substr(0, equals), static_cast<size_t>(value.data() - text.data()),
                value.size());
  return true;
}

std::string SectionOf(std::string_view name, const QLIBC_SZHASH &hash) {
  std::vector<const QLIBC_SZHASH::Entry *> entries;
  entries.reserve(hash.entries().size());
  for (const QLIBC_SZHASH::Entry &entry : hash.entries()) {
    entries.push_back(&entry);
  }
  /* Sorted, so that the same content always makes the same file. */
  std::sort(entries.begin(), entries.end(),
            [&](const auto *a, const auto *b) { return hash.Key(*a) < hash.Key(*b); });

  std::string out("[");
  out.append(name).append("]\n");
  for (const QLIBC_SZHASH::Entry *entry : entries) {
    out.append(hash.Key(*entry)).push_back('=');
    AppendQuoted(out, hash.Value(*entry));
    out.push_back('\n');
  }
  return out;
}

}  // namespace

bool IsSectionName(std::string_view name) noexcept {
  return !name.empty() && !HasBlankEdge(name) && name.find(']') == std::string_view::npos &&
         std::none_of(name.begin(), name.end(), IsControl);
}

bool IsSectionKey(std::string_view key) noexcept {
  return !key.empty() && !HasBlankEdge(key) && !IsNoKeyLine(key) &&
         key.find('=') == std::string_view::npos && std::none_of(key.begin(), key.end(), IsControl);
}

void ChangedText::Keep(std::string_view text) {
  pieces_.push_back({.kept = text, .made = {}});
}

void ChangedText::Add(std::string text) {
  pieces_.push_back({.kept = {}, .made = std::move(text)});
}

void ChangedText::EndLine() {
  if (pieces_.back().view().back() != '\n') {
    Add("\n");
  }
}

std::vector<std::string_view> ChangedText::Views() const {
  std::vector<std::string_view> views;
  views.reserve(pieces_.size());
  for (const Piece &piece : pieces_) {
    views.push_back(piece.view());
  }
  return views;
}

SectionText::SectionText(Bytes contents) : contents_(std::move(contents)) {
  form_ = Judge();
}

/* Brackets are rare beside bytes, so the search is for them, and whether one
 * begins its line is looked up backwards. */
void SectionText::IndexSections() {
  const std::string_view text = contents_.text();
  for (size_t at = text.find('[', start_); at != std::string_view::npos;) {
    size_t begin = at;
    while (begin > start_ && IsBlank(text[begin - 1])) {
      --begin;
    }
    const size_t end = LineEnd(text, at);
    const bool begins_line = begin == start_ || text[begin - 1] == '\n';
    const std::string_view line = LineAt(text, at, end);
    std::string_view name;
    if (begins_line &&
        (ParsePlainSectionLine(line, &name) || ParseSectionLine(Trim(line), &name))) {
      if (!sections_.empty()) {
        sections_.back().end = begin;
      }
      sections_.push_back({name, begin, end, text.size()});
    }
    at = text.find('[', end);
  }
}

void SectionText::IndexNames() const {
  std::vector<bool> is_first(sections_.size());
  slots_.resize(std::bit_ceil(2 * sections_.size() + 1));
  for (size_t i = 0; i < sections_.size(); ++i) {
    uint32_t &slot = slots_[FindSlot(sections_[i].name)];
    if (slot == 0) {
      slot = static_cast<uint32_t>(i + 1);
      is_first[i] = true;
    }
  }
  is_first_ = std::move(is_first);
}

size_t SectionText::FindSlot(std::string_view name) const noexcept {
  const size_t mask = slots_.size() - 1;
  size_t slot = XXH3_64bits(name.data(), name.size()) & mask;
  while (slots_[slot] != 0 && sections_[slots_[slot] - 1].name != name) {
    slot = (slot + 1) & mask;
  }
  return slot;
}

/* What a hand appended may follow the trailer, so any line can be it. */
void SectionText::FindTrailer() {
  const std::string_view text = contents_.text();
  for (size_t at = LastTrailerMark(text, text.size()); at != std::string_view::npos && at >= start_;
       at = LastTrailerMark(text, at)) {
    Trailer trailer{};
    const bool begins_line = at == 0 || text[at - 1] == '\n';
    if (begins_line && ParseTrailer(LineAt(text, at, LineEnd(text, at)), &trailer)) {
      trailer_begin_ = at;
      trailer_end_ = LineEnd(text, at);
      return;
    }
  }
}

SectionForm SectionText::Judge() {
  const std::string_view text = contents_.text();
  if (text.empty()) {
    return SectionForm::kEmpty;
  }
  if (text.size() < kHeader.size() && kHeader.starts_with(text)) {
    return SectionForm::kCutOff;
  }
  const size_t first_line = LineEnd(text, 0);
  const bool headed = Trim(LineAt(text, 0, first_line)) == LineAt(kHeader, 0, kHeader.size());
  start_ = headed ? first_line : 0;
  IndexSections();

  FindTrailer();
  if (!headed) {
    return SectionForm::kPlain;
  }
  return trailer_begin_ == trailer_end_ ? SectionForm::kCutOff : SectionForm::kSealed;
}

bool SectionText::TrailerAgrees() const noexcept {
  const std::string_view text = contents_.text();
  Trailer trailer{};
  return ParseTrailer(LineAt(text, trailer_begin_, trailer_end_), &trailer) &&
         trailer_end_ == text.size() && trailer.sections == sections_.size() &&
         trailer.checksum == Checksum(text.substr(0, trailer_begin_));
}

SectionForm SectionText::Form() const noexcept {
  return form_ == SectionForm::kSealed && !TrailerAgrees() ? SectionForm::kEdited : form_;
}

const Section *SectionText::Search(std::string_view name) const {
  const auto found = std::find_if(sections_.begin(), sections_.end(),
                                  [name](const Section &section) { return section.name == name; });
  return found == sections_.end() ? nullptr : &*found;
}

const Section *SectionText::Find(std::string_view name) const {
  if (!was_searched_) {
    was_searched_ = true;
    return Search(name);
  }
  if (slots_.empty()) {
    IndexNames();
  }
  if (expected_ < sections_.size() && is_first_[expected_] && sections_[expected_].name == name) {
    return &sections_[expected_++];
  }
  const uint32_t place = slots_[FindSlot(name)];
  if (place == 0) {
    return nullptr;
  }
  expected_ = place;
  return &sections_[place - 1];
}

void SectionText::Read(const Section &section, QLIBC_SZHASH &hash) const {
  const std::string_view body = contents_.text().substr(section.body, section.end - section.body);
  /* One look over the section spares a look at every value. A hash needs up to four
   * times the memory of what it takes, which a large section is not worth. */
  constexpr size_t kMostTaken = 65536;
  const bool plain = body.size() <= kMostTaken && body.find('\\') == std::string_view::npos &&
                     body.find('\0') == std::string_view::npos;
  if (plain) {
    hash.Take(body);
  }
  std::string scratch;
  for (size_t at = 0; at < body.size();) {
    const size_t feed = std::min(body.find('\n', at), body.size());
    const std::string_view line = body.substr(at, feed - at);
    if (!plain || !ReadPlainLine(body, line, hash)) {
      ReadLine(line, hash, scratch);
    }
    at = feed + 1;
  }
}

/* Comments and blank lines that stand right before the next section are about
 * that one, and stay when this one is replaced or removed. */
size_t SectionText::EndOfReplaced(const Section &section) const noexcept {
  const std::string_view text = contents_.text();
  size_t end = section.body;
  for (size_t at = section.body; at < section.end;) {
    const size_t next = LineEnd(text, at);
    if (!IsCommentOrEmpty(Trim(LineAt(text, at, next)))) {
      end = next;
    }
    at = next;
  }
  return end;
}

/* The old trailer is the one line that is never kept. */
void SectionText::Keep(ChangedText &changed, size_t begin, size_t end) const {
  const std::string_view text = contents_.text();
  const auto keep = [&](size_t from, size_t to) {
    if (from < to) {
      changed.Keep(text.substr(from, to - from));
    }
  };
  keep(begin, std::min(end, std::max(begin, trailer_begin_)));
  keep(std::max(begin, std::min(end, trailer_end_)), end);
  changed.EndLine();
}

ChangedText SectionText::WithSet(const Section &section, const QLIBC_SZHASH &hash) const {
  ChangedText changed;
  changed.Keep(kHeader);
  Keep(changed, start_, section.begin);
  changed.Add(SectionOf(section.name, hash));
  Keep(changed, EndOfReplaced(section), contents_.size);
  changed.Add(TrailerOf(changed, sections_.size()));
  return changed;
}

ChangedText SectionText::WithAdded(std::string_view name, const QLIBC_SZHASH &hash) const {
  ChangedText changed;
  changed.Keep(kHeader);
  Keep(changed, start_, contents_.size);
  changed.Add(SectionOf(name, hash));
  changed.Add(TrailerOf(changed, sections_.size() + 1));
  return changed;
}

ChangedText SectionText::WithRemoved(const Section &section) const {
  ChangedText changed;
  changed.Keep(kHeader);
  Keep(changed, start_, section.begin);
  Keep(changed, EndOfReplaced(section), contents_.size);
  changed.Add(TrailerOf(changed, sections_.size() - 1));
  return changed;
}

}  // namespace zelo
