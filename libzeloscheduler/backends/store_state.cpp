#include "store_state.h"

#include <sys/stat.h>
#include <unistd.h>

off_t schedSizeOf(const char *szPath) {
  struct stat info = {};
  return stat(szPath, &info) == 0 ? info.st_size : 0;
}

bool schedIsCutToNothing(const char *szStore) {
  return schedSizeOf(szStore) == 0 && schedAreTasksKept();
}

SchedNameState schedLookAtStore() {
  const SchedNameState state = schedLookAt(kSchedStore, nullptr);
  if (state != SchedNameState::kForeign || geteuid() != 0) {
    return state;
  }
  return schedTakeName(schedAreTasksKept() ? kSchedStoreToRestore : kSchedStore)
             ? SchedNameState::kOurs
             : state;
}

void schedTakeFreeStore() {
  if (geteuid() == 0) {
    schedTakeName(kSchedStore);
  }
}
