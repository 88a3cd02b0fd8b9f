#include "terminal/input.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr size_t kMegabyte = size_t{1} << 20;
constexpr size_t kMostBytes = 16 * kMegabyte;

struct CloseFile {
  void operator()(FILE *file) const {
    if (file != stdin) std::fclose(file);
  }
};

}  // namespace

std::string readInput(const std::string &path) {
  const std::unique_ptr<FILE, CloseFile> file(
      path == kStandardInput ? stdin : std::fopen(path.c_str(), "re"));
  if (file == nullptr) {
    throw Failure("cannot open " + printable(path) + ": " + std::strerror(errno));
  }
  std::string text;
  char buffer[65536];
  for (size_t count; (count = std::fread(buffer, 1, sizeof buffer, file.get())) > 0;) {
    text.append(buffer, count);
    if (text.size() > kMostBytes) {
      throw Failure(printable(path) + " is larger than " + std::to_string(kMostBytes / kMegabyte) +
                    " MB: divide it");
    }
  }
  if (std::ferror(file.get()) != 0) {
    throw Failure("cannot read " + printable(path) + ": " + std::strerror(errno));
  }
  return text;
}
