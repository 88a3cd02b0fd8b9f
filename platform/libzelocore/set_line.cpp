// Changing one line of a text file that other programs share.
#include <string_view>

#include "line_file.h"
#include "support.h"

namespace zelo {
namespace {

// A key with a line feed cannot be found within a line.
bool isKey(const char *key) noexcept {
  return key != nullptr && key[0] != '\0' && std::strchr(key, '\n') == nullptr;
}

bool isValue(const char *value) noexcept {
  return value == nullptr || std::strchr(value, '\n') == nullptr;
}

// Whether the text changed.
bool apply(std::string *text, std::string_view key, const char *value) {
  const LineRange line = findLine(*text, key);
  if (line.found && value == nullptr) {
    text->erase(line.begin, line.end - line.begin);
  } else if (line.found) {
    text->replace(line.begin, line.end - line.begin, std::string(value) + '\n');
  } else if (value != nullptr) {
    appendLine(text, value);
  } else {
    return false;
  }
  return true;
}

int setLine(const char *path, const char *key, const char *value) {
  if (value == nullptr && QLIBCFileExist(path) == 0) {
    return 0;
  }
  FileContents file;
  if (readLineFile(path, &file) < 0) {
    return -1;
  }
  if (!apply(&file.text, key, value)) {
    return 0;
  }
  return writeLineFile(path, file) < 0 ? -1 : 1;
}

}  // namespace
}  // namespace zelo

int QLIBCFileSetLine(const char *szPath, const char *szKey, const char *szValue, int flags) {
  if (szPath == nullptr || !zelo::isKey(szKey) || !zelo::isValue(szValue) || flags != 0) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] { return zelo::setLine(szPath, szKey, szValue); });
}
