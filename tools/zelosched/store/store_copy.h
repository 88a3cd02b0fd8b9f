// Whether a copy of the tasks is fit to be used.
#pragma once

#include <optional>
#include <string>

struct StoreCopy {
  enum Condition {
    kMissing,
    kEmpty,  // no bytes: made to reserve the name, or cut off
    kWhole,
    kDoubtful,  // it can be read, but is not as it was written
    kDamaged,
    kForeign,
    kDirectory
  } condition = kMissing;
  std::string why;        // what is wrong; empty for kMissing, kEmpty and kWhole
  int tasks = 0;          // that can be read
  bool isHeaded = false;  // it begins with the header of a store

  bool isWhole() const { return condition == kWhole; }
  bool isUsable() const { return condition == kWhole || condition == kDoubtful; }
};

// Whether the working copy has no task, though the copies for the next boot have: a change would
// write all copies anew without them. The first throws Failure then.
void requireTasksAreBack();
bool doTasksWaitForRestore();

StoreCopy judgeStore(const std::string &path);

// As judgeStore, for the copy in /tmp: the library also refuses it when it has a second hard link,
// which another user may be able to make. An empty file is kEmpty here, not kDamaged.
StoreCopy judgeWorkingStore(const std::string &path);

// How many sections the file has; nothing, with the error record set, when it cannot be read.
std::optional<int> countSections(const char *path);
