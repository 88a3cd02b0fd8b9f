// Text files of lines, which are changed one line at a time.
#ifndef ZELOCORE_LINE_FILE_H
#define ZELOCORE_LINE_FILE_H

#include <string>
#include <string_view>

#include "read_file.h"

namespace zelo {

// Reads a regular file. A link is refused, as a change would replace the link and not the file.
// 0, or -1 (0x0900, 0x0B00).
int readLineFile(const std::string &path, FileContents *file);

// Writes it back as a whole, on the disk when the call returns. 0, or -1 (0x0900, 0x0B00, 0x2800).
int writeLineFile(const std::string &path, const FileContents &file);

struct LineRange {
  size_t begin;
  size_t end;  // past the line feed, if it has one
  bool found;
};

// The first line that contains the key, which must not be empty.
LineRange findLine(const std::string &text, std::string_view key) noexcept;

// Appends a line, also to a text whose last line has no line feed.
void appendLine(std::string *text, std::string_view line);

}  // namespace zelo

#endif
