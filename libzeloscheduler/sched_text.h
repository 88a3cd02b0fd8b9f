// Bounded text copies: what does not fit is cut, never overflowed.
#ifndef SCHED_TEXT_H
#define SCHED_TEXT_H

#include <algorithm>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <limits>

// Copies szText into szBuf, cut to cbBuf - 1 characters. The two may overlap.
inline void copyText(char *szBuf, size_t cbBuf, const char *szText) {
  const size_t length = strnlen(szText, cbBuf - 1);
  memmove(szBuf, szText, length);
  szBuf[length] = '\0';
}

template <size_t N>
void copyText(char (&szBuf)[N], const char *szText) {
  copyText(szBuf, N, szText);
}

// A text that grows at its end up to a fixed capacity.
template <size_t N>
class BoundedText {
 public:
  BoundedText() { text_[0] = '\0'; }

  const char *c_str() const { return text_; }
  bool wasCut() const { return wasCut_; }

  __attribute__((format(printf, 2, 3))) void append(const char *format, ...) {
    va_list args;
    va_start(args, format);
    const int wanted = vsnprintf(text_ + length_, N - length_, format, args);
    va_end(args);
    const size_t room = N - 1 - length_;
    if (wanted < 0 || static_cast<size_t>(wanted) > room) {
      wasCut_ = true;
      length_ = N - 1;
      return;
    }
    length_ += static_cast<size_t>(wanted);
  }

  // As append with "%0*u", of a width up to kMostDigits. A list of many tasks would spend much of
  // its time in that.
  BoundedText &appendNumber(uint32_t number, size_t width = 1) {
    char digits[kMostDigits];
    char *first = std::end(digits);
    const char *const padded = std::end(digits) - std::min(width, kMostDigits);
    do {
      *--first = static_cast<char>('0' + number % 10);
      number /= 10;
    } while (number > 0 || first > padded);
    appendBytes(first, static_cast<size_t>(std::end(digits) - first));
    return *this;
  }
  BoundedText &appendText(const char *szText) {
    appendBytes(szText, strlen(szText));
    return *this;
  }

 private:
  static constexpr size_t kMostDigits = std::numeric_limits<uint32_t>::digits10 + 1;

  void appendBytes(const char *bytes, size_t count) {
    const size_t room = N - 1 - length_;
    wasCut_ = wasCut_ || count > room;
    const size_t taken = std::min(count, room);
    memcpy(text_ + length_, bytes, taken);
    length_ += taken;
    text_[length_] = '\0';
  }

  char text_[N];
  size_t length_ = 0;
  bool wasCut_ = false;
};

#endif
