/*
 * Reading a file whole.
 */
#ifndef ZELOCORE_READ_FILE_H
#define ZELOCORE_READ_FILE_H

#include <sys/types.h>

#include <cstddef>

#include "bytes.h"

namespace zelo {

/* Far above any file of the platform, and below what would exhaust the machine. */
inline constexpr off_t kMostFileBytes = off_t{1} << 30;

/* Reads up to the end of the file, which need not be where fstat saw it. False
 * when a read fails or the file is too large. Throws when memory is short. */
bool ReadAll(int fd, size_t expected, Bytes *contents);

}  // namespace zelo

#endif
