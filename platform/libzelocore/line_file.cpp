#include "line_file.h"

#include <fcntl.h>

#include "read_file.h"
#include "replace_file.h"
#include "support.h"

namespace zelo {

int ReadLineFile(const std::string &path, LineFile *file) {
  /* Not blocking, for a FIFO would hang the open. */
  const Descriptor opened(
      open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW));
  if (!opened.valid()) {
    return Fail(QLIBC_ERR_OPEN);
  }
  if (fstat(opened.get(), &file->status) != 0) {
    return Fail(QLIBC_ERR_IO);
  }
  if (!S_ISREG(file->status.st_mode)) {
    return Fail(QLIBC_ERR_OPEN);
  }
  Bytes contents;
  if (file->status.st_size > kMostFileBytes ||
      !ReadAll(opened.get(), static_cast<size_t>(file->status.st_size), &contents)) {
    return Fail(QLIBC_ERR_IO);
  }
  file->text = contents.text();
  return 0;
}

int WriteLineFile(const std::string &path, const LineFile &file) {
  const std::string_view contents = file.text;
  return ReplaceFile(path, {&contents, 1}, &file.status, Durability::kSynced);
}

LineRange FindLine(const std::string &text, std::string_view key) noexcept {
  const size_t at = text.find(key);
  if (at == std::string::npos) {
    return {0, 0, false};
  }
  const size_t before = at == 0 ? std::string::npos : text.rfind('\n', at - 1);
  const size_t after = text.find('\n', at);
  return {before == std::string::npos ? 0 : before + 1,
          after == std::string::npos ? text.size() : after + 1, true};
}

void AppendLine(std::string *text, std::string_view line) {
  if (!text->empty() && text->back() != '\n') {
    text->push_back('\n');
  }
  text->append(line).push_back('\n');
}

}  // namespace zelo
