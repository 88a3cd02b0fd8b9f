#include "section_trailer.h"

#include <xxhash.h>

#include <charconv>
#include <cstdio>

#include "section_line.h"

namespace zelo {
namespace {

constexpr std::string_view kStart = "# end of file: ";
constexpr std::string_view kMiddle = " sections, checksum ";
constexpr const char *kFormat = "# end of file: %zu sections, checksum %016llx\n";
constexpr size_t kChecksumDigits = 16;
constexpr size_t kRoom = 96;

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
  return TakeText(line, kStart) && TakeNumber(line, &trailer->sections, 10) &&
         TakeText(line, kMiddle) && Trim(line).size() == kChecksumDigits &&
         TakeNumber(line, &trailer->checksum, 16) && Trim(line).empty();
}

uint64_t Checksum(std::string_view text) noexcept {
  return XXH3_64bits(text.data(), text.size());
}

}  // namespace

std::optional<Trailer> FindTrailer(std::string_view text, size_t from) noexcept {
  size_t at = text.rfind(kStart);
  while (at != std::string_view::npos && at >= from) {
    Trailer trailer{.begin = at, .end = LineEnd(text, at), .sections = 0, .checksum = 0};
    const bool begins_line = at == 0 || text[at - 1] == '\n';
    if (begins_line && ParseTrailer(LineAt(text, at, trailer.end), &trailer)) {
      return trailer;
    }
    at = at == 0 ? std::string_view::npos : text.rfind(kStart, at - 1);
  }
  return std::nullopt;
}

bool TrailerAgrees(const Trailer &trailer, std::string_view text, size_t sections) noexcept {
  return trailer.end == text.size() && trailer.sections == sections &&
         trailer.checksum == Checksum(text.substr(0, trailer.begin));
}

std::string TrailerOf(std::string_view text, size_t sections) {
  char line[kRoom];
  const int size = std::snprintf(line, sizeof line, kFormat, sections,
                                 static_cast<unsigned long long>(Checksum(text)));
  return {line, static_cast<size_t>(size)};
}

}  // namespace zelo
