// Memory that the test program shares with every child that is forked from it. The library's run
// happens in a detached child that has closed all descriptors above 2, so this is how a test learns
// what was logged and called there.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace support {

// Zero-filled; never unmapped. Ends the program when there is none.
void *sharedMemory(size_t size);

// A list of texts, each with a number, that several processes may append to.
class SharedLines {
 public:
  struct Line {
    int number;
    std::string text;
    pid_t process;  // that appended it
  };

  explicit SharedLines(size_t capacity);
  void append(int number, std::string_view text);
  std::vector<Line> lines() const;
  std::vector<std::string> texts() const;
  void clear();

 private:
  struct Area;
  Area *area_;
  size_t capacity_;
};

}  // namespace support
