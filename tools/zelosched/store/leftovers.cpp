#include "store/leftovers.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <string>
#include <string_view>

#include "store/directory.h"
#include "terminal/failure.h"

namespace {

constexpr size_t kRandomCharacters = 6;  // of mkstemp
constexpr time_t kOldest = 60;           // seconds; a younger one may be in use

struct Replaced {
  const char *directory;
  std::string_view name;
};
constexpr Replaced kReplaced[] = {
    {"/etc", "crontab"},
    {"/usr/zelo/etc", "power_sched.conf"},
    {"/usr/zelo/etc", "scheduled_tasks.last-good"},
};

bool isBetween(char c, char first, char last) {
  return c >= first && c <= last;
}

bool isCapital(char c) {
  return isBetween(c, 'A', 'Z');
}

bool isSmall(char c) {
  return isBetween(c, 'a', 'z');
}

bool isDigit(char c) {
  return isBetween(c, '0', '9');
}

// A word, a number, or a word with a number, as in crontab.backup and crontab.old001, was chosen by
// a person: few random names look like that.
bool looksRandom(std::string_view characters) {
  bool isMixed = false;
  for (size_t i = 0; i < characters.size(); ++i) {
    const char c = characters[i];
    if (!isCapital(c) && !isSmall(c) && !isDigit(c)) return false;
    if (i == 0) continue;
    const char before = characters[i - 1];
    isMixed = isMixed || (isDigit(before) && !isDigit(c)) || (isSmall(before) && isCapital(c));
  }
  return isMixed;
}

bool isScratchName(std::string_view entry, std::string_view name) {
  return entry.size() == name.size() + 1 + kRandomCharacters && entry.starts_with(name) &&
         entry[name.size()] == '.' && looksRandom(entry.substr(name.size() + 1));
}

bool isLeftOver(int directory, const char *entry) {
  struct stat info {};
  return fstatat(directory, entry, &info, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(info.st_mode) &&
         info.st_uid == 0 && info.st_mtime < time(nullptr) - kOldest;
}

void removeBeside(const Replaced &replaced) {
  const Directory directory(opendir(replaced.directory));
  if (directory == nullptr) return;
  const int descriptor = dirfd(directory.get());
  while (const dirent *entry = readdir(directory.get())) {
    if (!isScratchName(entry->d_name, replaced.name)) continue;
    if (!isLeftOver(descriptor, entry->d_name)) continue;
    const std::string path = std::string(replaced.directory) + "/" + entry->d_name;
    if (unlinkat(descriptor, entry->d_name, 0) != 0) {
      const int reason = errno;
      throw Failure("cannot remove " + path + ": " + std::strerror(reason));
    }
    std::printf("%s was left by a program that was ended: it is removed\n", path.c_str());
  }
}

}  // namespace

void removeLeftovers() {
  for (const Replaced &replaced : kReplaced) removeBeside(replaced);
}
