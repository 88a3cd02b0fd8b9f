#include "line_file.h"

#include <fcntl.h>

#include "replace_file.h"

namespace zelo {

int readLineFile(const std::string &path, FileContents *file) {
  return readFile(path, O_NOFOLLOW, file);
}

int writeLineFile(const std::string &path, const FileContents &file) {
  return replaceFile(path, file.text, &file.status, Durability::kSynced);
}

LineRange findLine(const std::string &text, std::string_view key) noexcept {
  const size_t at = text.find(key);
  if (at == std::string::npos) {
    return {0, 0, false};
  }
  const size_t before = at == 0 ? std::string::npos : text.rfind('\n', at - 1);
  const size_t after = text.find('\n', at);
  return {before == std::string::npos ? 0 : before + 1,
          after == std::string::npos ? text.size() : after + 1, true};
}

void appendLine(std::string *text, std::string_view line) {
  if (!text->empty() && text->back() != '\n') {
    text->push_back('\n');
  }
  text->append(line).push_back('\n');
}

}  // namespace zelo
