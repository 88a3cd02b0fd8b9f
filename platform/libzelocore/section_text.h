/*
 * The text of a section file: where its sections lie, what they hold, and the
 * text of a changed file. Knows nothing of files.
 */
#ifndef ZELOCORE_SECTION_TEXT_H
#define ZELOCORE_SECTION_TEXT_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "bytes.h"
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
};

/* Can stand between the brackets and be read back. */
bool IsSectionName(std::string_view name) noexcept;
/* Can stand before the equals sign and be read back. */
bool IsSectionKey(std::string_view key) noexcept;

/* The text of a changed file in pieces, most of it where it lies in the text that
 * was changed: that one must live as long. */
class ChangedText {
 public:
  void Keep(std::string_view text);
  void Add(std::string text);
  /* A line feed, unless the last line has its own. There must be one. */
  void EndLine();
  std::vector<std::string_view> Views() const;

 private:
  struct Piece {
    std::string_view kept;
    std::string made;

    std::string_view view() const noexcept { return made.empty() ? kept : made; }
  };

  std::vector<Piece> pieces_; /* none is empty */
};

class SectionText {
 public:
  explicit SectionText(Bytes contents);
  /* The sections' names are views into the contents. */
  SectionText(const SectionText &) = delete;
  SectionText &operator=(const SectionText &) = delete;

  /* What does not depend on the checksum, which takes as long as all else. */
  bool IsCutOff() const noexcept { return form_ == SectionForm::kCutOff; }
  SectionForm Form() const noexcept;
  const std::vector<Section> &sections() const noexcept { return sections_; }
  /* The first section of the name, or null. Throws when memory is short. */
  const Section *Find(std::string_view name) const;
  void Read(const Section &section, QLIBC_SZHASH &hash) const;

  /* The text of the whole file with one section changed. Every other line is
   * kept byte for byte; header and trailer are made anew. */
  ChangedText WithSet(const Section &section, const QLIBC_SZHASH &hash) const;
  ChangedText WithAdded(std::string_view name, const QLIBC_SZHASH &hash) const;
  ChangedText WithRemoved(const Section &section) const;

 private:
  void IndexSections();
  const Section *Search(std::string_view name) const;
  void IndexNames() const;
  size_t FindSlot(std::string_view name) const noexcept;
  void FindTrailer();
  SectionForm Judge();
  bool TrailerAgrees() const noexcept;
  size_t EndOfReplaced(const Section &section) const noexcept;
  void Keep(ChangedText &changed, size_t begin, size_t end) const;

  Bytes contents_;
  size_t start_ = 0;         /* past the header */
  size_t trailer_begin_ = 0; /* begin == end: there is no trailer */
  size_t trailer_end_ = 0;
  std::vector<Section> sections_;
  /* Of the first section of a name, the index plus one; 0 is free. Made when more than
   * one section is asked for. */
  mutable std::vector<uint32_t> slots_;
  mutable std::vector<bool> is_first_; /* of those with its name */
  mutable bool was_searched_ = false;
  mutable size_t expected_ = 0;            /* sections are mostly asked for in file order */
  SectionForm form_ = SectionForm::kEmpty; /* kSealed whatever the checksum is */
};

}  // namespace zelo

#endif
