#include "section_text.h"

#include <algorithm>
#include <utility>

#include "section_line.h"

namespace zelo {

SectionText::SectionText(std::string contents) : contents_(std::move(contents)) {
  form_ = judge();
}

// Brackets are rare, so the text is searched for them, and each is checked backwards for whether
// it begins its line.
void SectionText::indexSections() {
  const std::string_view text = contents_;
  for (size_t at = text.find('[', start_); at != std::string_view::npos;) {
    size_t begin = at;
    while (begin > start_ && isBlank(text[begin - 1])) {
      --begin;
    }
    const size_t end = lineEnd(text, at);
    const bool beginsLine = begin == start_ || text[begin - 1] == '\n';
    std::string_view name;
    if (beginsLine && parseSectionLine(trim(lineAt(text, at, end)), &name)) {
      if (!sections_.empty()) {
        sections_.back().end = begin;
      }
      sections_.push_back({name, begin, end, text.size()});
    }
    at = text.find('[', end);
  }
  firstOfName_.reserve(sections_.size());
  for (size_t i = 0; i < sections_.size(); ++i) {
    firstOfName_.emplace(sections_[i].name, i);
  }
}

SectionForm SectionText::judge() {
  const std::string_view text = contents_;
  if (text.empty()) {
    return SectionForm::kEmpty;
  }
  if (text.size() < kHeader.size() && kHeader.starts_with(text)) {
    return SectionForm::kCutOff;
  }
  const size_t firstLine = lineEnd(text, 0);
  const bool headed = trim(lineAt(text, 0, firstLine)) == lineAt(kHeader, 0, kHeader.size());
  start_ = headed ? firstLine : 0;
  indexSections();

  trailer_ = findTrailer(text, start_);
  if (!headed) {
    return SectionForm::kPlain;
  }
  return trailer_ ? SectionForm::kSealed : SectionForm::kCutOff;
}

SectionForm SectionText::form() const noexcept {
  return form_ == SectionForm::kSealed && !trailerAgrees(*trailer_, contents_, sections_.size())
             ? SectionForm::kEdited
             : form_;
}

const Section *SectionText::find(std::string_view name) const {
  const auto found = firstOfName_.find(name);
  return found == firstOfName_.end() ? nullptr : &sections_[found->second];
}

void SectionText::read(const Section &section, QLIBC_SZHASH &hash) const {
  readKeys(std::string_view(contents_).substr(section.body, section.end - section.body), hash);
}

// Comments and blank lines right before the next section belong to that one, and stay when this
// one is replaced or removed.
size_t SectionText::endOfReplaced(const Section &section) const noexcept {
  const std::string_view text = contents_;
  size_t end = section.body;
  for (size_t at = section.body; at < section.end;) {
    const size_t next = lineEnd(text, at);
    if (!isCommentOrEmpty(trim(lineAt(text, at, next)))) {
      end = next;
    }
    at = next;
  }
  return end;
}

// Appends that part of the old text without its trailer. A last line without a line feed gets one.
void SectionText::keep(std::string *changed, size_t begin, size_t end) const {
  const std::string_view text = contents_;
  const size_t trailerBegin = std::clamp(trailer_ ? trailer_->begin : end, begin, end);
  const size_t trailerEnd = std::clamp(trailer_ ? trailer_->end : end, begin, end);
  changed->append(text.substr(begin, trailerBegin - begin));
  changed->append(text.substr(trailerEnd, end - trailerEnd));
  if (changed->back() != '\n') {
    changed->push_back('\n');
  }
}

// The text with `made` in place of what is between `begin` and `end`, and the trailer for so many
// sections.
std::string SectionText::replaced(size_t begin, size_t end, std::string_view made,
                                  size_t sections) const {
  std::string changed;
  changed.reserve(contents_.size() + made.size() + 2 * kHeader.size());
  changed += kHeader;
  keep(&changed, start_, begin);
  changed += made;
  keep(&changed, end, contents_.size());
  changed += trailerOf(changed, sections);
  return changed;
}

std::string SectionText::withSet(const Section &section, const QLIBC_SZHASH &hash) const {
  return replaced(section.begin, endOfReplaced(section), sectionOf(section.name, hash),
                  sections_.size());
}

std::string SectionText::withAdded(std::string_view name, const QLIBC_SZHASH &hash) const {
  return replaced(contents_.size(), contents_.size(), sectionOf(name, hash), sections_.size() + 1);
}

std::string SectionText::withRemoved(const Section &section) const {
  return replaced(section.begin, endOfReplaced(section), "", sections_.size() - 1);
}

}  // namespace zelo
