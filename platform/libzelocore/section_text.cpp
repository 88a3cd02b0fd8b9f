#include "section_text.h"

#include <algorithm>
#include <utility>

#include "section_line.h"

namespace zelo {

SectionText::SectionText(std::string contents) : contents_(std::move(contents)) {
  form_ = Judge();
}

/* Brackets are rare beside bytes, so the search is for them, and whether one
 * begins its line is looked up backwards. */
void SectionText::IndexSections() {
  const std::string_view text = contents_;
  for (size_t at = text.find('[', start_); at != std::string_view::npos;) {
    size_t begin = at;
    while (begin > start_ && IsBlank(text[begin - 1])) {
      --begin;
    }
    const size_t end = LineEnd(text, at);
    const bool begins_line = begin == start_ || text[begin - 1] == '\n';
    std::string_view name;
    if (begins_line && ParseSectionLine(Trim(LineAt(text, at, end)), &name)) {
      if (!sections_.empty()) {
        sections_.back().end = begin;
      }
      first_of_name_.emplace(name, sections_.size());
      sections_.push_back({name, begin, end, text.size()});
    }
    at = text.find('[', end);
  }
}

SectionForm SectionText::Judge() {
  const std::string_view text = contents_;
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

  trailer_ = FindTrailer(text, start_);
  if (!headed) {
    return SectionForm::kPlain;
  }
  return trailer_ ? SectionForm::kSealed : SectionForm::kCutOff;
}

SectionForm SectionText::Form() const noexcept {
  return form_ == SectionForm::kSealed && !TrailerAgrees(*trailer_, contents_, sections_.size())
             ? SectionForm::kEdited
             : form_;
}

const Section *SectionText::Find(std::string_view name) const {
  const auto found = first_of_name_.find(name);
  return found == first_of_name_.end() ? nullptr : &sections_[found->second];
}

void SectionText::Read(const Section &section, QLIBC_SZHASH &hash) const {
  ReadKeys(std::string_view(contents_).substr(section.body, section.end - section.body), hash);
}

/* Comments and blank lines that stand right before the next section are about
 * that one, and stay when this one is replaced or removed. */
size_t SectionText::EndOfReplaced(const Section &section) const noexcept {
  const std::string_view text = contents_;
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

/* The old trailer is the one line that is never kept. A last line without a line feed
 * gets one. */
void SectionText::Keep(std::string *changed, size_t begin, size_t end) const {
  const std::string_view text = contents_;
  const size_t trailer_begin = std::clamp(trailer_ ? trailer_->begin : end, begin, end);
  const size_t trailer_end = std::clamp(trailer_ ? trailer_->end : end, begin, end);
  changed->append(text.substr(begin, trailer_begin - begin));
  changed->append(text.substr(trailer_end, end - trailer_end));
  if (changed->back() != '\n') {
    changed->push_back('\n');
  }
}

/* The text with other lines between `begin` and `end`, of so many sections. */
std::string SectionText::Replaced(size_t begin, size_t end, std::string_view made,
                                  size_t sections) const {
  std::string changed;
  changed.reserve(contents_.size() + made.size() + 2 * kHeader.size());
  changed += kHeader;
  Keep(&changed, start_, begin);
  changed += made;
  Keep(&changed, end, contents_.size());
  changed += TrailerOf(changed, sections);
  return changed;
}

std::string SectionText::WithSet(const Section &section, const QLIBC_SZHASH &hash) const {
  return Replaced(section.begin, EndOfReplaced(section), SectionOf(section.name, hash),
                  sections_.size());
}

std::string SectionText::WithAdded(std::string_view name, const QLIBC_SZHASH &hash) const {
  return Replaced(contents_.size(), contents_.size(), SectionOf(name, hash), sections_.size() + 1);
}

std::string SectionText::WithRemoved(const Section &section) const {
  return Replaced(section.begin, EndOfReplaced(section), "", sections_.size() - 1);
}

}  // namespace zelo
