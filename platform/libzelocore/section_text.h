// The text of a section file: its sections, their keys, and the text of a changed file. No file is
// read or written here.
#ifndef ZELOCORE_SECTION_TEXT_H
#define ZELOCORE_SECTION_TEXT_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "section_trailer.h"
#include "szhash.h"

namespace zelo {

// What the header and the trailer tell about a text.
enum class SectionForm {
  kEmpty,   // no bytes
  kPlain,   // no header: not as this library writes it
  kSealed,  // header, and a trailer that agrees
  kEdited,  // header, but the trailer disagrees or something follows it
  kCutOff,  // header, or the beginning of one, without a trailer
};

struct Section {
  std::string_view name;
  size_t begin;  // of the line with the name
  size_t body;
  size_t end;
};

class SectionText {
 public:
  explicit SectionText(std::string contents);
  // The sections' names are views into the contents.
  SectionText(const SectionText &) = delete;
  SectionText &operator=(const SectionText &) = delete;

  std::string_view contents() const noexcept { return contents_; }
  // Does not compute the checksum, which takes as long as all the rest.
  bool isCutOff() const noexcept { return form_ == SectionForm::kCutOff; }
  SectionForm form() const noexcept;
  const std::vector<Section> &sections() const noexcept { return sections_; }
  // The first section of the name, or null.
  const Section *find(std::string_view name) const;
  void read(const Section &section, QLIBC_SZHASH &hash) const;

  // The text of the whole file with one section changed. Every other line is kept byte for byte;
  // header and trailer are made anew.
  std::string withSet(const Section &section, const QLIBC_SZHASH &hash) const;
  std::string withAdded(std::string_view name, const QLIBC_SZHASH &hash) const;
  std::string withRemoved(const Section &section) const;

 private:
  void indexSections();
  SectionForm judge();
  size_t endOfReplaced(const Section &section) const noexcept;
  void keep(std::string *changed, size_t begin, size_t end) const;
  std::string replaced(size_t begin, size_t end, std::string_view made, size_t sections) const;

  std::string contents_;
  size_t start_ = 0;  // past the header
  std::optional<Trailer> trailer_;
  std::vector<Section> sections_;
  std::unordered_map<std::string_view, size_t> firstOfName_;  // index of the section
  SectionForm form_ = SectionForm::kEmpty;                    // kSealed whatever the checksum
};

}  // namespace zelo

#endif
