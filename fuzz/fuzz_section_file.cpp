// A section file of any bytes: each section that is listed can be read, and a change keeps the
// rest.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zelocore.h>

#include <string>

#include "fuzz_input.h"

namespace {

constexpr char kFile[] = "/tmp/fuzz_section_file";

void write(const uint8_t *data, size_t size) {
  unlink(kFile);
  const int file = open(kFile, O_WRONLY | O_CREAT | O_TRUNC, 0600);
  require(file >= 0 && ::write(file, data, size) == static_cast<ssize_t>(size));
  close(file);
}

}  // namespace

// A file that looks like a copy in progress stays as it is, so waiting is useless.
extern "C" int nanosleep(const timespec *, timespec *) {
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  write(data, size);
  PSZLIST names = QLIBCSzListAlloc(16);
  PSZHASH hash = QLIBCSzHashAlloc(16);
  const int count = QLIBCFileEnumSection(kFile, &names);
  for (int i = 0; i < count; ++i) {
    QLIBCHashRemoveAll(hash);
    require(QLIBCFileGetSection(kFile, QLIBCSzListGet(names, i), &hash) == 1);
  }
  if (count >= 0) {
    QLIBCHashRemoveAll(hash);
    QLIBCSzHashSetValue(&hash, "key", "a \"value\"\\ with\nall\x01");
    const int added = QLIBCFileAddSection(kFile, "added by the fuzzer", hash, 0);
    if (added == 1) {
      QLIBCHashRemoveAll(hash);
      require(QLIBCFileGetSection(kFile, "added by the fuzzer", &hash) == 1);
      require(std::string(QLIBCSzHashGetValue(hash, "key")) == "a \"value\"\\ with\nall\x01");
      PSZLIST after = QLIBCSzListAlloc(16);
      require(QLIBCFileEnumSection(kFile, &after) == count + 1);
      QLIBCSzListFree(after);
      require(QLIBCFileRemoveSection(kFile, "added by the fuzzer") == 1);
    }
  }
  QLIBCSzHashFree(hash);
  QLIBCSzListFree(names);
  return 0;
}
