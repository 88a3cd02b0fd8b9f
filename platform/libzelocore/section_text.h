/*
 * The text of a section file: where its sections lie, what they hold, and the
 * text of a changed file. Knows nothing of files.
 */
#ifndef ZELOCORE_SECTION_TEXT_H
#define ZELOCORE_SECTION_TEXT_H

#include <cstddef>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "szhash.h"

namespace zelo {

/* What header and trailer say of a text. */
enum class SectionForm {
  kEmpty,  /* no bytes */
  kPlain,  /* no header: never written by this library */
  kSealed, /* header, and a trailer that agrees */
  kEdited, /* header, but the trailer disagrees or something follows it */
  kCutOff, /* header, or the beginning of one, without a trailer */
};

struct Section {
  std::string_view name;
  size_t begin; /* of the line with the name */
  size_t body;
  size_t end;
  bool is_first; /* of those with its name */
};

/* Can stand between the brackets and be read back. */
bool IsSectionName(std::string_view name) noexcept;
/* Can stand before the equals sign and be read back. */
bool IsSectionKey(std::string_view key) noexcept;

class SectionText {
 public:
  explicit SectionText(std::string contents);
  /* The sections' names are views into the contents. */
  SectionText(const SectionText &) = delete;
  SectionText &operator=(const SectionText &) = delete;

  SectionForm form() const noexcept { return form_; }
  const std::vector<Section> &sections() const noexcept { return sections_; }
  /* The first section of the name, or null. */
  const Section *Find(std::string_view name) const noexcept;
  void Read(const Section &section, QLIBC_SZHASH &hash) const;

  /* The text of the whole file with one section changed. Every other line is
   * kept byte for byte; header and trailer are made anew. */
  std::string WithSet(const Section &section, const QLIBC_SZHASH &hash) const;
  std::string WithAdded(std::string_view name, const QLIBC_SZHASH &hash) const;
  std::string WithRemoved(const Section &section) const;

 private:
  void IndexSections();
  void FindTrailer();
  SectionForm Judge();
  size_t EndOfReplaced(const Section &section) const noexcept;
  void AppendKept(std::string &out, size_t begin, size_t end) const;
  std::string Begin() const;

  std::string contents_;
  size_t start_ = 0;         /* past the header */
  size_t trailer_begin_ = 0; /* begin == end: there is no trailer */
  size_t trailer_end_ = 0;
  std::vector<Section> sections_;
  std::unordered_map<std::string_view, size_t> first_of_name_;
  mutable size_t expected_ = 0; /* sections are mostly asked for in file order */
  SectionForm form_ = SectionForm::kEmpty;
};

}  // namespace zelo

#endif
