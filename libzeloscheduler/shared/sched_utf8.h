// Texts in UTF-8, character by character.
#ifndef SCHED_UTF8_H
#define SCHED_UTF8_H

#include <cstddef>
#include <cstdint>
#include <string_view>

struct SchedCharacter {
  uint32_t code;
  size_t bytes;  // 0: no character
};

// The first character of the text. None for an overlong form, which could hide a control
// character, a surrogate, or a code beyond Unicode.
SchedCharacter schedFirstCharacter(std::string_view text);

// The bytes of a character that begins with this one; 0 when none does.
size_t schedBytesOfCharacter(unsigned char first);

#endif
