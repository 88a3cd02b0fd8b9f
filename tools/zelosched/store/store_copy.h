// Whether a copy of the tasks is fit to be used.
#pragma once

#include <optional>
#include <string>

struct StoreCopy {
  enum Condition {
    kMissing,
    kEmpty,  // no bytes: the name is taken, or a copy was cut off
    kWhole,
    kDoubtful,  // it can be read, but is not as it was written
    kDamaged,
    kForeign,
    kDirectory
  } condition = kMissing;
  std::string why;        // of all but the first two: what is wrong with it
  int tasks = 0;          // that can be read
  bool isHeaded = false;  // it begins as every store does

  bool isWhole() const { return condition == kWhole; }
  bool isUsable() const { return condition == kWhole || condition == kDoubtful; }
};

// There is no task in the working copy, and some are kept for the next boot. A change would write
// all copies anew without them. Throws Failure then.
void requireTasksAreBack();
bool doTasksWaitForRestore();

StoreCopy judgeStore(const std::string &path);

// As judgeStore, for the copy in /tmp: the library refuses it when it has a second name, too, which
// anybody can give it where the kernel lets him. There a file of no bytes is no damaged copy.
StoreCopy judgeWorkingStore(const std::string &path);

// How many sections the file has; nothing, with the error record set, when it cannot be read.
std::optional<int> countSections(const char *path);
