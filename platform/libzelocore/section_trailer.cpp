#include "section_trailer.h"

#include <xxhash.h>

#include <charconv>
#include <cstdio>

#include "section_line.h"

namespace zelo {
namespace {

constexpr std::string_view kStart = "# end of file: ";
constexpr std::string_view kMiddle = " sections, checksum ";
constexpr const char *kFormat = "# end of file: %llu sections, checksum %016llx\n";
constexpr size_t kChecksumDigits = 16;
constexpr size_t kRoom = 96;

template <typename Number>
bool takeNumber(std::string_view &text, Number *number, int base) noexcept {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), *number, base);
  if (error != std::errc()) {
    return false;
  }
  text.remove_prefix(static_cast<size_t>(end - text.data()));
  return true;
}

bool takeText(std::string_view &text, std::string_view expected) noexcept {
  if (!text.starts_with(expected)) {
    return false;
  }
  text.remove_prefix(expected.size());
  return true;
}

bool parseTrailer(std::string_view line, Trailer *trailer) noexcept {
  return takeText(line, kStart) && takeNumber(line, &trailer->sections, 10) &&
         takeText(line, kMiddle) && trim(line).size() == kChecksumDigits &&
         takeNumber(line, &trailer->checksum, 16) && trim(line).empty();
}

uint64_t checksum(std::string_view text) noexcept {
  return XXH3_64bits(text.data(), text.size());
}

}  // namespace

std::optional<Trailer> findTrailer(std::string_view text, size_t from) noexcept {
  size_t at = text.rfind(kStart);
  while (at != std::string_view::npos && at >= from) {
    Trailer trailer{.begin = at, .end = lineEnd(text, at), .sections = 0, .checksum = 0};
    const bool beginsLine = at == 0 || text[at - 1] == '\n';
    if (beginsLine && parseTrailer(lineAt(text, at, trailer.end), &trailer)) {
      return trailer;
    }
    at = at == 0 ? std::string_view::npos : text.rfind(kStart, at - 1);
  }
  return std::nullopt;
}

bool trailerAgrees(const Trailer &trailer, std::string_view text, size_t sections) noexcept {
  return trailer.end == text.size() && trailer.sections == sections &&
         trailer.checksum == checksum(text.substr(0, trailer.begin));
}

std::string trailerOf(std::string_view text, size_t sections) {
  char line[kRoom];
  const int size =
      std::snprintf(line, sizeof line, kFormat, static_cast<unsigned long long>(sections),
                    static_cast<unsigned long long>(checksum(text)));
  return {line, static_cast<size_t>(size)};
}

}  // namespace zelo
