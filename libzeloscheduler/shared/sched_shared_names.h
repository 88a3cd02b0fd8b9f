// The names in "/tmp" that the library uses: whether the files are ours, and how to take the
// names.
//
// The directory is writable by all users and sticky: any user can make a file with a free name,
// but none can remove or rename another user's file. So a name that is ours stays ours until we
// remove it, and one check is enough; a free one can be taken at any time. Each name is therefore
// checked before it is used, and taken as soon as it is found free.
#ifndef SCHED_SHARED_NAMES_H
#define SCHED_SHARED_NAMES_H

#include <sys/stat.h>
#include <sys/types.h>

#include <string_view>

struct SchedSharedName {
  const char *path;
  mode_t mode;
  bool isDirectory;
  std::string_view contents;  // of a file that is made
  off_t reserve = 0;          // bytes that are allocated beforehand
};

extern const SchedSharedName kSchedStore;
extern const SchedSharedName kSchedStoreToRestore;  // empty: refused until it is restored
extern const SchedSharedName kSchedTaskProgram;
extern const SchedSharedName kSchedLockDirectory;
extern const SchedSharedName kSchedLockFile;
extern const SchedSharedName kSchedDatabase;
extern const SchedSharedName kSchedJournal;

// Why another user could have made or can change it, such as "is another user's"; null when only
// root or this process's user can. The one rule for all names, also for an open file.
const char *schedWhyForeign(const SchedSharedName &name, const struct stat &info);

enum class SchedNameState { kFree, kOurs, kForeign };

// By one lstat. What cannot be examined is foreign. The reason is in *pszWhy; pszWhy may be null.
SchedNameState schedLookAt(const SchedSharedName &name, const char **pszWhy);

// True when the name is ours in the end. A missing file is made. For root, a foreign one is
// exchanged for a new one, in one step, and kept in a directory that only root can enter, which
// the log names; an empty directory is removed. Logs nothing else, and sets no error code.
bool schedTakeName(const SchedSharedName &name);

// Allocates the reserved space for a file of ours that was made in another way. This process must
// hold no POSIX lock on it: closing the file here would drop it.
void schedReserve(const SchedSharedName &name);

// Replaces what has the name by a new file, in one step; only for root. True on success. *pMovedTo
// is the path of a foreign file that was moved away, which the log names too, or ""; pMovedTo may
// be null.
using SchedMovedTo = char[128];
bool schedReplaceName(const SchedSharedName &name, SchedMovedTo *pMovedTo);

// The same, but keeps also a file of ours; its new path is in *pMovedTo. Not only for root.
bool schedMoveAside(const SchedSharedName &name, SchedMovedTo *pMovedTo);

// For a name that should be free: a file there, even one of ours, is removed, and a directory is
// moved away (only for root). True when a new file of this process has the name.
bool schedMakeAnew(const SchedSharedName &name);

// The tasks for the next boot, and a copy for a loss of power while the first is written.
inline constexpr char kSchedPersistentStore[] = "/usr/zelo/etc/scheduled_tasks";
inline constexpr char kSchedLastGoodStore[] = "/usr/zelo/etc/scheduled_tasks.last-good";

// Whether tasks are stored for the next boot. An empty persistent copy beside a last good one was
// cut off by a loss of power.
bool schedAreTasksKept();

// Takes all names except the store's, when the process is root's: to a free name another user
// could move a file of root's.
void schedTakeNames();

#endif
