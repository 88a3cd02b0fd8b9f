// Reading a file whole.
#ifndef ZELOCORE_READ_FILE_H
#define ZELOCORE_READ_FILE_H

#include <sys/stat.h>
#include <sys/types.h>

#include <cstddef>
#include <string>

#include "support.h"

namespace zelo {

// Reads up to the end of the file, which need not be where fstat saw it. False when a read fails
// or the file is too large. Throws when memory is short.
bool readAll(int fd, size_t expected, std::string *contents);

struct FileContents {
  std::string text;
  struct stat status;  // before the first byte was read
  bool steady;         // nobody wrote while it was read
};

bool sameContents(const struct stat &a, const struct stat &b) noexcept;

// Reads a regular file, opened with these flags too. 0, or -1 (0x0900, 0x0B00). Throws when memory
// is short.
int readFile(const std::string &path, int flags, FileContents *file,
             SourceLocation where = SourceLocation::here());

}  // namespace zelo

#endif
