#include "sched_utf8.h"

namespace {

// By the first byte: the length of the character, and the range of its second byte, which excludes
// overlong forms, surrogates and codes beyond Unicode. Any further byte is 80 to BF.
struct Form {
  unsigned char firstLead;
  unsigned char lastLead;
  size_t bytes;
  unsigned char leadBits;  // of the code
  unsigned char firstSecond;
  unsigned char lastSecond;
};
constexpr Form kForms[] = {
    {0x00, 0x7F, 1, 0x7F, 0x00, 0x00}, {0xC2, 0xDF, 2, 0x1F, 0x80, 0xBF},
    {0xE0, 0xE0, 3, 0x0F, 0xA0, 0xBF}, {0xE1, 0xEC, 3, 0x0F, 0x80, 0xBF},
    {0xED, 0xED, 3, 0x0F, 0x80, 0x9F}, {0xEE, 0xEF, 3, 0x0F, 0x80, 0xBF},
    {0xF0, 0xF0, 4, 0x07, 0x90, 0xBF}, {0xF1, 0xF3, 4, 0x07, 0x80, 0xBF},
    {0xF4, 0xF4, 4, 0x07, 0x80, 0x8F},
};

const Form *formOf(unsigned char first) {
  for (const Form &form : kForms) {
    if (form.firstLead <= first && first <= form.lastLead) {
      return &form;
    }
  }
  return nullptr;
}

}  // namespace

SchedCharacter schedFirstCharacter(std::string_view text) {
  constexpr unsigned kTailBits = 6;
  constexpr unsigned char kTailMask = 0x3F;
  constexpr unsigned char kFirstTail = 0x80;
  constexpr unsigned char kLastTail = 0xBF;
  const auto byteAt = [text](size_t i) { return static_cast<unsigned char>(text[i]); };
  const Form *form = text.empty() ? nullptr : formOf(byteAt(0));
  if (form == nullptr || text.size() < form->bytes) {
    return {0, 0};
  }
  uint32_t code = byteAt(0) & form->leadBits;
  for (size_t i = 1; i < form->bytes; ++i) {
    const unsigned char least = i == 1 ? form->firstSecond : kFirstTail;
    const unsigned char most = i == 1 ? form->lastSecond : kLastTail;
    if (byteAt(i) < least || byteAt(i) > most) {
      return {0, 0};
    }
    code = code << kTailBits | (byteAt(i) & kTailMask);
  }
  return {code, form->bytes};
}

size_t schedBytesOfCharacter(unsigned char first) {
  const Form *form = formOf(first);
  return form != nullptr ? form->bytes : 0;
}
