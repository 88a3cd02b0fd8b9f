// Section files: reading them while others copy over them, and changing them.
//
// A list of n sections is one enumeration and n reads. The last file that was read is therefore
// kept with an index of its sections, and each call costs one stat and one look-up for as long as
// the file is the same.
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

// A copy in progress: one that is not done a second after its last write has lost its writer.
constexpr int64_t kCopyInProgress = kSecond;
constexpr int64_t kPause = 4 * kMillisecond;
constexpr int kMostPauses = kCopyInProgress / kPause;

// Time stamps without nanoseconds come from a file system that counts whole seconds, or pairs of
// them.
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

// Equal stamps alone do not say that the file still holds what was read: stamps advance by clock
// ticks, and a change in the tick of the last one leaves the same. The stamp must lie outside the
// time from the reading until now, in which such a change would be stamped:
//
// - before it, which is usual as soon as a tick has gone by; - or well after now, when the clock
// was set back since the file was written. No change made now can carry a stamp that is still to
// come, so that the file need not be read at every call until the clock has caught up.
//
// A clock that went back since the reading says nothing; the file is read again once, by the new
// time.
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

// Only the change time is asked: every write sets it, and nobody can forge it. One in the future
// tells nothing of the file's age, and does not wait.
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

// In the tick of its last change a file is read at every call. That it still holds the same is
// found sooner than where its sections lie.
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
    cache.reset();  // first, so that two large files are never held at once
    cache = load(path);
  }
  return cache == nullptr ? nullptr : &cache->text;
}

// ---- writing ----

// A file that is about to be changed. Its writer works on a copy of its own, so nobody is waited
// for, and it leaves the index of the readers' file alone.
struct Original {
  struct stat status;
  std::unique_ptr<const SectionText> text;
};

// A link is refused, for the change would replace the link and not the file. 0, or -1 (0x0900,
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

// What the caller asked for by flags that were checked.
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
