// Replacing a file as a whole, so that no reader sees a part of it.
#ifndef ZELOCORE_REPLACE_FILE_H
#define ZELOCORE_REPLACE_FILE_H

#include <sys/stat.h>

#include <string>
#include <string_view>

namespace zelo {

enum class Durability {
  kNone,    // the old or the new file after a power cut, perhaps the new one empty
  kSynced,  // the new file is on the disk when the call returns
};

// Replaces `path` by a file with these contents, written beside it and renamed over it. `old`
// describes the file that is replaced, whose owner and mode are kept; null when there is none. 0,
// or -1 (0x0900, 0x0B00, 0x2800) with the old file as it was and no temporary left; only when the
// directory cannot be synced is the new file in place already. Throws when memory is short.
int replaceFile(const std::string &path, std::string_view contents, const struct stat *old,
                Durability durability);

}  // namespace zelo

#endif
