// Bounded text copies: what does not fit is cut.
#ifndef SCHED_TEXT_H
#define SCHED_TEXT_H

#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <cstring>

// What the numbers of the stored and the JSON form are written in.
inline constexpr int kDecimal = 10;

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

 private:
  char text_[N];
  size_t length_ = 0;
  bool wasCut_ = false;
};

#endif
