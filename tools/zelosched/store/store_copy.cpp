#include "store/store_copy.h"

#include <sys/stat.h>
#include <zelocore.h>
#include <zelosched.h>

#include <cerrno>
#include <cstring>
#include <sstream>

#include "store/place_file.h"
#include "store/platform_guards.h"
#include "store/store_files.h"
#include "store/task_list.h"
#include "terminal/failure.h"

namespace {

constexpr int kHashCapacity = 64;

// Null when the file cannot be read as sections.
List sectionsOf(const std::string &path) {
  PSZLIST names = QLIBCSzListAlloc(1);
  forgetError();
  const int count = QLIBCFileEnumSection(path.c_str(), &names);
  List list(names);
  return count < 0 ? nullptr : std::move(list);
}

bool isTask(const std::string &path, const char *section) {
  PSZHASH raw = QLIBCSzHashAlloc(kHashCapacity);
  const bool isRead = raw != nullptr && QLIBCFileGetSection(path.c_str(), section, &raw) > 0;
  const Hash hash(raw);
  TaskRecord task = {};
  return isRead && ZELOSchedInitTaskFromHash(&task, hash.get()) == 0;
}

int countTasks(const std::string &path, const List &sections) {
  int tasks = 0;
  for (int i = 0; i < QLIBCSzListCount(sections.get()); ++i) {
    tasks += isTask(path, QLIBCSzListGet(sections.get(), i)) ? 1 : 0;
  }
  return tasks;
}

bool isBlankOrComment(const std::string &line) {
  return line.find_first_not_of(" \t\r") == std::string::npos || line[0] == '#' || line[0] == ';';
}

// A store without tasks has comments only. A file with other lines and no task is no store.
bool hasOtherLines(const std::string &contents) {
  std::istringstream lines(contents);
  for (std::string line; std::getline(lines, line);) {
    if (!isBlankOrComment(line)) return true;
  }
  return false;
}

// The text as the platform writes it, with a header and a trailer that has a checksum. Adding a
// section and removing it again writes both anew, and leaves all else as it was.
std::string writtenAnew(const std::string &contents) {
  constexpr char kScratch[] = "/run/zelosched.store";  // in memory, and root's alone
  constexpr char kSection[] = "zelosched looks whether this is whole";
  constexpr mode_t kMode = 0600;
  SchedNewFile scratch(kScratch);
  fill(&scratch, contents, kMode);
  PSZHASH raw = QLIBCSzHashAlloc(1);
  if (raw == nullptr) throw Failure("out of memory");
  const Hash nothing(raw);
  forgetError();
  if (QLIBCFileAddSection(scratch.path(), kSection, nothing.get(), 0) < 0 ||
      QLIBCFileRemoveSection(scratch.path(), kSection) < 0) {
    throw failedTo("examine a store");
  }
  return contentsOf(scratch.path());
}

std::string firstLine(const std::string &text) {
  return text.substr(0, text.find('\n') + 1);
}

StoreCopy doubtful(const std::string &why, int tasks, bool isHeaded) {
  return {StoreCopy::kDoubtful, why, tasks, isHeaded};
}

// A copy that cannot be checked is used where there is no better one, but not as the last good one.
StoreCopy judgeText(const std::string &contents, int tasks) {
  try {
    const std::string anew = writtenAnew(contents);
    if (anew == contents) return {StoreCopy::kWhole, "", tasks, true};
    const bool isHeaded = contents.starts_with(firstLine(anew));
    return doubtful("is not as it was written: its checksum does not fit", tasks, isHeaded);
  } catch (const Failure &failure) {
    return doubtful(std::string("cannot be checked (") + failure.what() + ")", tasks, true);
  }
}

StoreCopy damaged(const std::string &why) {
  return {StoreCopy::kDamaged, why};
}

// After a power failure, a file may be empty, or have its size and zero bytes only.
StoreCopy judgeContents(const std::string &path) {
  const std::string contents = contentsOf(path);
  if (contents.empty()) return damaged("is cut off: it has no bytes");
  const List sections = sectionsOf(path);
  if (sections == nullptr) return damaged("cannot be read: " + errorInWords());
  const int tasks = countTasks(path, sections);
  const bool isOther = tasks == 0 && hasOtherLines(contents);
  if (contents.find('\0') != std::string::npos || isOther) {
    return damaged("holds no tasks, but something else");
  }
  return judgeText(contents, tasks);
}

}  // namespace

StoreCopy judgeStore(const std::string &path) {
  struct stat info {};
  if (lstat(path.c_str(), &info) != 0) {
    if (errno == ENOENT) return {};
    return damaged(std::string("cannot be examined: ") + std::strerror(errno));
  }
  if (S_ISDIR(info.st_mode)) return {StoreCopy::kDirectory, "is a directory"};
  if (!S_ISREG(info.st_mode)) return {StoreCopy::kForeign, "is no regular file"};
  if (info.st_uid != 0 || (info.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
    return {StoreCopy::kForeign, "is not root's alone"};
  }
  try {
    return judgeContents(path);
  } catch (const Failure &failure) {
    return damaged(std::string("is unreadable (") + failure.what() + ")");
  }
}

StoreCopy judgeWorkingStore(const std::string &path) {
  struct stat info {};
  const bool isFile = lstat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode);
  if (isFile && info.st_nlink > 1) return {StoreCopy::kForeign, "has a second name"};
  StoreCopy copy = judgeStore(path);
  const bool isEmpty = copy.condition == StoreCopy::kDamaged && isFile && info.st_size == 0;
  return isEmpty ? StoreCopy{StoreCopy::kEmpty, ""} : copy;
}

bool doTasksWaitForRestore() {
  const auto holdsTasks = [](const char *path) {
    const List sections = sectionsOf(path);
    return sections != nullptr && QLIBCSzListCount(sections.get()) > 0;
  };
  struct stat kept {};
  if (stat(kPersistentCopy, &kept) != 0) return false;
  const bool isThere = QLIBCFileExist(kWorkingCopy) != 0;
  const List working = sectionsOf(kWorkingCopy);
  if (isThere && (working == nullptr || QLIBCSzListCount(working.get()) > 0)) return false;
  return holdsTasks(kept.st_size > 0 ? kPersistentCopy : kLastGoodCopy);
}

void requireTasksAreBack() {
  if (!doTasksWaitForRestore()) return;
  throw Failure(std::string(kWorkingCopy) +
                " has no tasks, though some are kept: 'zelosched restore' puts the tasks back");
}

std::optional<int> countSections(const char *path) {
  const List sections = sectionsOf(path);
  if (sections == nullptr) return std::nullopt;
  return QLIBCSzListCount(sections.get());
}
