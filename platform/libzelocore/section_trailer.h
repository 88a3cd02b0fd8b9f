// The header and the trailer of a section file, two comments by which a reader tells a whole file
// from one that was cut off or edited by hand.
#ifndef ZELOCORE_SECTION_TRAILER_H
#define ZELOCORE_SECTION_TRAILER_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace zelo {

inline constexpr std::string_view kHeader = "# zelo section file\n";

struct Trailer {
  size_t begin;  // of its line
  size_t end;
  uint64_t sections;  // as written in the file
  uint64_t checksum;  // of all bytes before it
};

// The last one that begins at or after `from`. Lines appended by hand may follow it, so it need
// not be the last line.
std::optional<Trailer> findTrailer(std::string_view text, size_t from) noexcept;

// Whether the text, of so many sections, is the one that the trailer was made for.
bool trailerAgrees(const Trailer &trailer, std::string_view text, size_t sections) noexcept;

std::string trailerOf(std::string_view text, size_t sections);

}  // namespace zelo

#endif
