// Section files: reading them while others copy over them, and changing them.
//
// A list of n sections is one enumeration and n reads. The last file that was read is therefore
// cached with an index of its sections. While the file is the same, a call costs one stat and one
// look-up.
#include <fcntl.h>
#include <sys/stat.h>
#include <time.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "read_file.h"
#include "replace_file.h"
#include "section_line.h"
#include "section_text.h"
#include "support.h"
#include "szhash.h"
#include "szlist.h"

namespace zelo {
namespace {

constexpr int64_t kNanosecond = 1;
constexpr int64_t kMillisecond = 1'000'000 * kNanosecond;
constexpr int64_t kSecond = 1000 * kMillisecond;

// For how long after its last write a file may be a copy in progress.
constexpr int64_t kCopyInProgress = kSecond;
constexpr int64_t kPause = 4 * kMillisecond;
constexpr int kMostPauses = kCopyInProgress / kPause;

// Time stamps without nanoseconds come from a file system that counts in steps of 1 or 2 s.
constexpr int64_t kCoarseStamp = 2 * kSecond;
// Kernel clocks differ by a tick or two among themselves; this is far more.
constexpr int64_t kClockSlack = 2 * kSecond;

int64_t nanoseconds(const timespec &time) noexcept {
  return time.tv_sec * kSecond + time.tv_nsec;
}

int64_t nowBy(clockid_t clock) noexcept {
  timespec now{};
  clock_gettime(clock, &now);
  return nanoseconds(now);
}

// ---- the file that was read last ----

struct CachedFile {
  std::string path;
  struct stat status;
  int64_t opened;  // the clock that stamps files, before the file was opened
  SectionText text;
};

bool isSameFile(const CachedFile &cached, const std::string_view path,
                const struct stat &status) noexcept {
  return cached.path == path && sameContents(cached.status, status);
}

// Equal time stamps alone do not prove that the file is unchanged: stamps advance by clock ticks,
// and a change within the tick of the last one has the same stamp. A change since the reading has
// a stamp between that time and now, so the file's stamp must lie outside of these:
//
// - before them, as it usually does one tick after the last change;
// - or well after now, when the clock was set back since the file was written. Then the file need
//   not be read at every call until the clock has caught up.
//
// When the clock was set back since the reading, nothing is proved and the file is read once more.
bool stampsTell(const CachedFile &cached, const struct stat &status) noexcept {
  const int64_t stamp = nanoseconds(status.st_ctim);
  const int64_t granularity = status.st_ctim.tv_nsec == 0 ? kCoarseStamp : 0;
  const int64_t now = nowBy(CLOCK_REALTIME_COARSE);
  const bool stampedBefore = stamp + granularity < cached.opened && cached.opened <= now;
  const bool stampedAfter = now + kClockSlack < stamp;
  return stampedBefore || stampedAfter;
}

// Never destroyed, so that exit handlers can still read.
std::unique_ptr<CachedFile> &keptFile() {
  static auto &cache = *new std::unique_ptr<CachedFile>;
  return cache;
}

// By the change time, which every write sets and no caller can set. When it lies in the future,
// the age is unknown and no reader waits.
bool isYoung(const struct stat &status) noexcept {
  const int64_t age = nowBy(CLOCK_REALTIME) - nanoseconds(status.st_ctim);
  return -kCopyInProgress < age && age < kCopyInProgress;
}

bool looksTorn(const SectionText &text) noexcept {
  const SectionForm form = text.form();
  return form == SectionForm::kEmpty || form == SectionForm::kCutOff ||
         form == SectionForm::kEdited;
}

void pause() noexcept {
  const timespec pause{0, kPause};
  nanosleep(&pause, nullptr);
}

std::unique_ptr<CachedFile> load(const char *path) {
  for (int pauses = 0;; ++pauses) {
    const int64_t opened = nowBy(CLOCK_REALTIME_COARSE);
    FileContents read;
    if (readFile(path, 0, &read) < 0) {
      return nullptr;
    }
    // Made in place, since its names are views into itself.
    std::unique_ptr<CachedFile> file(
        new CachedFile{path, read.status, opened, SectionText(std::move(read.text))});
    if (pauses < kMostPauses && isYoung(read.status) && (!read.steady || looksTorn(file->text))) {
      pause();
      continue;
    }
    if (file->text.isCutOff()) {
      fail(QLIBC_ERR_IO);
      return nullptr;
    }
    return file;
  }
}

// A file is read at every call within the tick of its last change. Comparing its text is faster
// than indexing it again.
bool readsTheSame(CachedFile &cached) {
  const int64_t opened = nowBy(CLOCK_REALTIME_COARSE);
  FileContents read;
  if (readFile(cached.path, 0, &read) < 0 || !read.steady ||
      !sameContents(cached.status, read.status) || cached.text.contents() != read.text) {
    return false;
  }
  cached.opened = opened;
  return true;
}

bool isCurrent(CachedFile &cached, const char *path, const struct stat &status) {
  return isSameFile(cached, path, status) && (stampsTell(cached, status) || readsTheSame(cached));
}

// The text of the file as it is now. Null on failure (0x0900, 0x0B00).
const SectionText *current(const char *path) {
  std::unique_ptr<CachedFile> &cache = keptFile();
  struct stat status;
  if (stat(path, &status) != 0 || !S_ISREG(status.st_mode)) {
    cache.reset();
    fail(QLIBC_ERR_OPEN);
    return nullptr;
  }
  if (cache == nullptr || !isCurrent(*cache, path, status)) {
    cache.reset();  // first, so that the old text takes no memory while the new one is loaded
    cache = load(path);
  }
  return cache == nullptr ? nullptr : &cache->text;
}

// ---- writing ----

// A file that is about to be changed: read once, without waiting for a copy in progress, and kept
// out of the readers' cache.
struct Original {
  struct stat status;
  std::unique_ptr<const SectionText> text;
};

// A link is refused, as the change would replace the link and not the file. 0, or -1 (0x0900,
// 0x0B00).
int readOriginal(const char *path, Original *original) {
  FileContents read;
  if (readFile(path, O_NOFOLLOW, &read) < 0) {
    return -1;
  }
  original->status = read.status;
  original->text = std::make_unique<const SectionText>(std::move(read.text));
  if (!read.steady || original->text->isCutOff()) {
    return fail(QLIBC_ERR_IO);
  }
  return 0;
}

// For flags that were checked.
Durability durabilityOf(int flags) noexcept {
  return (flags & QLIBC_FILE_SYNC) != 0 ? Durability::kSynced : Durability::kNone;
}

bool areKnownFlags(int flags) noexcept {
  return (flags & ~QLIBC_FILE_SYNC) == 0;
}

bool hasWritableKeys(const QLIBC_SZHASH &hash) noexcept {
  return std::all_of(hash.entries().begin(), hash.entries().end(),
                     [](const auto &entry) { return isSectionKey(entry.first); });
}

int changed(int replaced) noexcept {
  return replaced < 0 ? -1 : 1;
}

int setSection(const char *path, std::string_view name, const QLIBC_SZHASH &hash,
               Durability durability) {
  Original original;
  if (readOriginal(path, &original) < 0) {
    return -1;
  }
  const Section *section = original.text->find(name);
  if (section == nullptr) {
    return 0;
  }
  return changed(
      replaceFile(path, original.text->withSet(*section, hash), &original.status, durability));
}

int addSection(const char *path, std::string_view name, const QLIBC_SZHASH &hash,
               Durability durability) {
  struct stat status;
  if (lstat(path, &status) != 0 && errno == ENOENT) {
    const SectionText empty{std::string()};
    return changed(replaceFile(path, empty.withAdded(name, hash), nullptr, durability));
  }
  Original original;
  if (readOriginal(path, &original) < 0) {
    return -1;
  }
  if (original.text->find(name) != nullptr) {
    return fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return changed(
      replaceFile(path, original.text->withAdded(name, hash), &original.status, durability));
}

int removeSection(const char *path, std::string_view name) {
  Original original;
  if (readOriginal(path, &original) < 0) {
    return -1;
  }
  const Section *section = original.text->find(name);
  if (section == nullptr) {
    return 0;
  }
  return changed(
      replaceFile(path, original.text->withRemoved(*section), &original.status, Durability::kNone));
}

}  // namespace
}  // namespace zelo

int QLIBCFileEnumSection(const char *szPath, PSZLIST *ppList) {
  if (szPath == nullptr || ppList == nullptr || *ppList == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  QLIBC_SZLIST &list = **ppList;
  const size_t before = list.count();
  const int count = zelo::atBoundary(-1, [&] {
    const zelo::SectionText *text = zelo::current(szPath);
    if (text == nullptr) {
      return -1;
    }
    for (const zelo::Section &section : text->sections()) {
      list.push(section.name);
    }
    return static_cast<int>(text->sections().size());
  });
  if (count < 0) {
    list.truncate(before);
  }
  return count;
}

int QLIBCFileGetSection(const char *szPath, const char *szSection, PSZHASH *ppHash) {
  if (szPath == nullptr || szSection == nullptr || ppHash == nullptr || *ppHash == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] {
    const zelo::SectionText *text = zelo::current(szPath);
    if (text == nullptr) {
      return -1;
    }
    const zelo::Section *section = text->find(szSection);
    if (section == nullptr) {
      return 0;
    }
    text->read(*section, **ppHash);
    return 1;
  });
}

int QLIBCFileSetSection(const char *szPath, const char *szSection, int flags, PSZHASH pHash,
                        int reserved) {
  if (szPath == nullptr || szSection == nullptr || pHash == nullptr ||
      !zelo::areKnownFlags(flags) || reserved != 0 || !zelo::hasWritableKeys(*pHash)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(
      -1, [&] { return zelo::setSection(szPath, szSection, *pHash, zelo::durabilityOf(flags)); });
}

int QLIBCFileAddSection(const char *szPath, const char *szSection, PSZHASH pHash, int flags) {
  if (szPath == nullptr || szSection == nullptr || pHash == nullptr ||
      !zelo::areKnownFlags(flags) || !zelo::isSectionName(szSection) ||
      !zelo::hasWritableKeys(*pHash)) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(
      -1, [&] { return zelo::addSection(szPath, szSection, *pHash, zelo::durabilityOf(flags)); });
}

int QLIBCFileRemoveSection(const char *szPath, const char *szSection) {
  if (szPath == nullptr || szSection == nullptr) {
    return zelo::fail(QLIBC_ERR_BAD_PARAMETER);
  }
  return zelo::atBoundary(-1, [&] { return zelo::removeSection(szPath, szSection); });
}
