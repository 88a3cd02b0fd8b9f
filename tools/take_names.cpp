// take-names: makes root the owner of the names in /tmp that the library uses, for package scripts
// and boot steps.
//
//   take-names            takes names that are free or another user's
//   take-names --anew     for a first installation: replaces whatever has these names, but for a
//                         store that equals the persistent copy
//   take-names --stand-in replaces the program that crontab lines start by the stand-in
//
// Exits with 1 when a name could not be taken.
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>

#include "sched_shared_names.h"
#include "sched_store_lock.h"

namespace {

constexpr const SchedSharedName *kNames[] = {&kSchedTaskProgram, &kSchedLockDirectory,
                                             &kSchedLockFile, &kSchedDatabase, &kSchedJournal};

std::string contentsOf(const char *path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

bool replace(const SchedSharedName &name) {
  SchedMovedTo movedTo;
  const bool isReplaced = schedReplaceName(name, &movedTo);
  if (movedTo[0] != '\0')
    fprintf(stderr, "take-names: what was %s is now %s\n", name.path, movedTo);
  return isReplaced;
}

// The library writes the persistent copy first, so that its store is not ahead of that copy.
bool replaceStore() {
  const std::string kept = contentsOf(kSchedPersistentStore);
  if (!kept.empty() && schedLookAt(kSchedStore, nullptr) == SchedNameState::kOurs &&
      contentsOf(kSchedStore.path) == kept) {
    return true;
  }
  return replace(schedAreTasksKept() ? kSchedStoreToRestore : kSchedStore);
}

bool said(const SchedSharedName &name, bool isTaken) {
  if (!isTaken) fprintf(stderr, "take-names: cannot take %s: %s\n", name.path, strerror(errno));
  return isTaken;
}

// Under the lock, since the store is behind the persistent copy while a change is being written.
bool takeStore(bool isAnew) {
  const StoreLock turn;
  if (!turn.isHeld()) {
    fprintf(stderr, "take-names: changes of tasks are locked: the system log says by whom\n");
    return false;
  }
  return said(kSchedStore, isAnew ? replaceStore() : schedTakeName(kSchedStoreToRestore));
}

int take(bool isAnew) {
  bool isDone = takeStore(isAnew);
  for (const SchedSharedName *name : kNames) {
    isDone = said(*name, isAnew ? replace(*name) : schedTakeName(*name)) && isDone;
  }
  return isDone ? 0 : 1;
}

}  // namespace

int main(int argc, char **argv) {
  const std::string option = argc == 2 ? argv[1] : "";
  if (argc > 2 || (argc == 2 && option != "--anew" && option != "--stand-in")) {
    fprintf(stderr, "usage: take-names [--anew | --stand-in]\n");
    return 2;
  }
  if (geteuid() != 0) {
    fprintf(stderr, "take-names: that takes root's rights\n");
    return 1;
  }
  if (option == "--stand-in") return said(kSchedTaskProgram, replace(kSchedTaskProgram)) ? 0 : 1;
  return take(option == "--anew");
}
