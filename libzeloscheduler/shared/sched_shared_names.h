// The names in "/tmp" that the library uses: whose they are, and how they become ours.
//
// The directory is everybody's and sticky: anybody can be first under a name there, but nobody can
// remove or rename another user's file. So a name that is ours alone stays so until we give it up,
// and one look at it holds; while it is free, the next look may find anything. Each name is
// therefore looked at once before it is used, and taken as soon as it is found free.
#ifndef SCHED_SHARED_NAMES_H
#define SCHED_SHARED_NAMES_H

#include <sys/stat.h>
#include <sys/types.h>

#include <string_view>

struct SchedSharedName {
  const char *path;
  mode_t mode;
  bool isDirectory;
  std::string_view contents;  // of a file that is made under the name
  off_t reserve = 0;          // bytes that it takes from the file system beforehand
};

extern const SchedSharedName kSchedStore;
extern const SchedSharedName
    kSchedStoreToRestore;  // the same name; no task is read before a restore
extern const SchedSharedName kSchedTaskProgram;
extern const SchedSharedName kSchedLockDirectory;
extern const SchedSharedName kSchedLockFile;
extern const SchedSharedName kSchedDatabase;
extern const SchedSharedName kSchedJournal;

// Why others could have made it or can change it, as in "is another user's"; null when it is root's
// or this process's user's, and nobody else's. One rule for all names, also for an open file.
const char *schedWhyForeign(const SchedSharedName &name, const struct stat &info);

enum class SchedNameState { kFree, kOurs, kForeign };

// By one look, which never follows a link. What cannot be looked at is foreign, with the reason in
// *pszWhy, which may be null.
SchedNameState schedLookAt(const SchedSharedName &name, const char **pszWhy);

// True when the name is ours in the end. A free one is made. For root, what stands in the way is
// exchanged for what is made, in one step, and then found in a directory that only root can enter,
// which the log names; an empty directory is removed. It logs nothing else, and sets no error code.
bool schedTakeName(const SchedSharedName &name);

// Takes the room that a file of ours shall have, where it was made in another way. Nobody may hold
// a POSIX lock on it yet: closing the file would drop it.
void schedReserve(const SchedSharedName &name);

// Makes it anew, in one step, whatever stands there: for root alone. True when the name has it;
// where the log names what was moved away, it is in *pMovedTo, which may be null, and is ""
// otherwise.
using SchedMovedTo = char[128];
bool schedReplaceName(const SchedSharedName &name, SchedMovedTo *pMovedTo);

// Makes it anew and keeps what stood there, also when that is ours; where, is in *pMovedTo.
bool schedMoveAside(const SchedSharedName &name, SchedMovedTo *pMovedTo);

// The same for a name that nothing is expected under: what stands there, ours too, is removed, or
// moved away when it is a directory. True when a new file of this process has the name.
bool schedMakeAnew(const SchedSharedName &name);

// The tasks for the next boot, and the same with the last change, for when the power goes while the
// first is written.
inline constexpr char kSchedPersistentStore[] = "/usr/zelo/etc/scheduled_tasks";
inline constexpr char kSchedLastGoodStore[] = "/usr/zelo/etc/scheduled_tasks.last-good";

// Whether tasks are kept for the next boot. A persistent copy without bytes was cut off, by a loss
// of power, when there is a last good one.
bool schedAreTasksKept();

// Takes all names but the store's, when the process is root's: a name that is free could be given
// to a file of root's that another user moved there.
void schedTakeNames();

#endif
