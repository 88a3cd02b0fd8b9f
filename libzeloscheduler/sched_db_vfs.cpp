// SQLite takes files beside a database that have the names of its journals for part of it: it
// rolls back a rollback journal, deletes a file that the journal names, and reads a write-ahead
// log in place of the database. In a directory where other users can make files, they could plant
// these at any time.
//
// So the connection is opened with a VFS of ours, which passes all calls on to the default one
// except those on these names. sqlite3_open uses the default VFS, so ours is registered as the
// default during the call. It has the name of the other, so that databases attached later use that
// one; the connection keeps its pointer to ours. No file that SQLite locks is opened here: closing
// it would drop the locks of other connections of this process.
#include "sched_db_vfs.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/single_threaded.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cstring>
#include <string_view>

namespace {

constexpr char kJournalSuffix[] = "-journal";
constexpr char kMagic[] = "SQLite format 3";  // with the terminating zero
constexpr int kWriteVersion = 18;             // its offset; the read version follows
constexpr char kVersionOfWal = 2;

struct OwnFilesVfs {
  sqlite3_vfs vfs;
  sqlite3_vfs *real;
  sqlite3_io_methods methods;
  std::string_view path;
  HoldName hold;
  // Whether another thread has opened a database of its own during our sqlite3_open.
  std::atomic<bool> servesOthers;
};

OwnFilesVfs own;

enum class File { kDatabase, kJournal, kOtherOfOurs, kForeign };

// Temporary files have no name.
File fileOf(const char *szName) {
  if (szName == nullptr) {
    return File::kForeign;
  }
  const std::string_view name(szName);
  if (!name.starts_with(own.path)) {
    return File::kForeign;
  }
  const std::string_view suffix = name.substr(own.path.size());
  if (suffix.empty()) {
    return File::kDatabase;
  }
  if (suffix == kJournalSuffix) {
    return File::kJournal;
  }
  return suffix.front() == '-' ? File::kOtherOfOurs : File::kForeign;
}

// The only foreign files of our connection are temporary files, which are not accessed by name,
// and super-journals, which a journal names.
bool isNotThere(File file) {
  return file == File::kOtherOfOurs || (file == File::kForeign && !own.servesOthers);
}

bool isInWalMode(sqlite3_file *file) {
  char header[kWriteVersion + 2];
  return file->pMethods->xRead(file, header, sizeof(header), 0) == SQLITE_OK &&
         memcmp(header, kMagic, sizeof(kMagic)) == 0 &&
         (header[kWriteVersion] == kVersionOfWal || header[kWriteVersion + 1] == kVersionOfWal);
}

// Without the methods for shared memory, which the default VFS would open under a name of its own,
// SQLite does not enter WAL mode, even when a caller asks for it.
void takeSharedMemory(sqlite3_file *file) {
  own.methods = *file->pMethods;
  own.methods.iVersion = 1;
  file->pMethods = &own.methods;
}

int openDatabase(const char *szName, sqlite3_file *file, int flags, int *pFlags) {
  const int result = own.real->xOpen(own.real, szName, file, flags, pFlags);
  if (result != SQLITE_OK) {
    return result;
  }
  if (isInWalMode(file)) {
    file->pMethods->xClose(file);
    file->pMethods = nullptr;
    return kInWalMode;
  }
  takeSharedMemory(file);
  return SQLITE_OK;
}

int openFile(sqlite3_vfs *, const char *szName, sqlite3_file *file, int flags, int *pFlags) {
  file->pMethods = nullptr;
  const File kind = fileOf(szName);
  if (kind == File::kForeign) {
    if ((flags & SQLITE_OPEN_SUPER_JOURNAL) != 0 && !own.servesOthers) {
      return SQLITE_CANTOPEN;
    }
    const int result = own.real->xOpen(own.real, szName, file, flags, pFlags);
    if (result == SQLITE_OK && (flags & SQLITE_OPEN_MAIN_DB) != 0) {
      own.servesOthers = true;
    }
    return result;
  }
  if (kind == File::kOtherOfOurs || !own.hold(szName, (flags & SQLITE_OPEN_CREATE) != 0)) {
    return SQLITE_CANTOPEN;
  }
  flags |= SQLITE_OPEN_NOFOLLOW;
  return kind == File::kDatabase ? openDatabase(szName, file, flags, pFlags)
                                 : own.real->xOpen(own.real, szName, file, flags, pFlags);
}

// Allocates the blocks again that the file had before it was truncated.
void keepRoom(int descriptor, const struct stat &before) {
  constexpr off_t kBlock = 512;  // the unit of st_blocks
  fallocate(descriptor, FALLOC_FL_KEEP_SIZE, 0, before.st_blocks * kBlock);
}

// SQLite takes an empty journal for none. Its name and its blocks stay taken.
int emptyJournal(const char *szName, bool toDisk) {
  const int descriptor = open(szName, O_WRONLY | O_NOFOLLOW | O_CLOEXEC);
  if (descriptor < 0) {
    return SQLITE_IOERR_DELETE;
  }
  struct stat before = {};
  fstat(descriptor, &before);
  const bool isEmpty = ftruncate(descriptor, 0) == 0 && (!toDisk || fsync(descriptor) == 0);
  if (before.st_blocks > 0) {
    keepRoom(descriptor, before);
  }
  close(descriptor);
  return isEmpty ? SQLITE_OK : SQLITE_IOERR_DELETE;
}

int deleteFile(sqlite3_vfs *, const char *szName, int syncDirectory) {
  const File file = fileOf(szName);
  if (isNotThere(file)) {
    return SQLITE_IOERR_DELETE_NOENT;
  }
  if (file == File::kForeign) {
    return own.real->xDelete(own.real, szName, syncDirectory);
  }
  return file == File::kJournal && own.hold(szName, false)
             ? emptyJournal(szName, syncDirectory != 0)
             : SQLITE_IOERR_DELETE;
}

int lookAtFile(sqlite3_vfs *, const char *szName, int flags, int *pIsThere) {
  const File file = fileOf(szName);
  if (file == File::kForeign && own.servesOthers) {
    return own.real->xAccess(own.real, szName, flags, pIsThere);
  }
  *pIsThere = !isNotThere(file) && own.hold(szName, false) ? 1 : 0;
  return SQLITE_OK;
}

// The path is absolute already, and resolving it would follow a link.
int completeName(sqlite3_vfs *, const char *szName, int size, char *szFullName) {
  if (fileOf(szName) != File::kDatabase) {
    return own.real->xFullPathname(own.real, szName, size, szFullName);
  }
  sqlite3_snprintf(size, szFullName, "%s", szName);
  return SQLITE_OK;
}

// A method that only passes the call on.
template <auto Method>
struct Passed;
template <class Result, class... Arguments,
          Result (*sqlite3_vfs::*Method)(sqlite3_vfs *, Arguments...)>
struct Passed<Method> {
  static Result call(sqlite3_vfs *, Arguments... arguments) {
    return (own.real->*Method)(own.real, arguments...);
  }
};

template <auto Method>
void pass() {
  own.vfs.*Method = own.real->*Method != nullptr ? Passed<Method>::call : nullptr;
}

void passTheRest() {
  constexpr int kFirstWithTimes = 2;
  constexpr int kFirstWithSystemCalls = 3;
  pass<&sqlite3_vfs::xDlOpen>();
  pass<&sqlite3_vfs::xDlError>();
  pass<&sqlite3_vfs::xDlSym>();
  pass<&sqlite3_vfs::xDlClose>();
  pass<&sqlite3_vfs::xRandomness>();
  pass<&sqlite3_vfs::xSleep>();
  pass<&sqlite3_vfs::xCurrentTime>();
  pass<&sqlite3_vfs::xGetLastError>();
  if (own.real->iVersion >= kFirstWithTimes) {
    pass<&sqlite3_vfs::xCurrentTimeInt64>();
  }
  if (own.real->iVersion >= kFirstWithSystemCalls) {
    pass<&sqlite3_vfs::xSetSystemCall>();
    pass<&sqlite3_vfs::xGetSystemCall>();
    pass<&sqlite3_vfs::xNextSystemCall>();
  }
}

// Never undone: open connections point to it.
bool isPrepared(const char *szPath, HoldName hold) {
  if (own.real != nullptr) {
    return true;
  }
  sqlite3_vfs *const real = sqlite3_vfs_find(nullptr);
  if (real == nullptr) {
    return false;
  }
  own.real = real;
  own.path = szPath;
  own.hold = hold;
  own.vfs = {};
  own.vfs.iVersion = real->iVersion;
  own.vfs.szOsFile = real->szOsFile;
  own.vfs.mxPathname = real->mxPathname;
  own.vfs.zName = real->zName;
  own.vfs.xOpen = openFile;
  own.vfs.xDelete = deleteFile;
  own.vfs.xAccess = lookAtFile;
  own.vfs.xFullPathname = completeName;
  passTheRest();
  return true;
}

// Makes ours the default VFS while it lives. A database that another thread opens meanwhile keeps
// pointing to it, so in a process with threads this library must not be unloaded.
class DefaultVfs {
 public:
  DefaultVfs() {
    if (__libc_single_threaded == 0) {
      stayLoaded();
    }
    isDefault_ = sqlite3_vfs_register(&own.vfs, 1) == SQLITE_OK;
  }
  ~DefaultVfs() { sqlite3_vfs_unregister(&own.vfs); }
  DefaultVfs(const DefaultVfs &) = delete;
  DefaultVfs &operator=(const DefaultVfs &) = delete;

  bool isDefault() const { return isDefault_; }

 private:
  static void stayLoaded() {
    Dl_info info = {};
    if (dladdr(&own, &info) != 0) {
      void *const library = dlopen(info.dli_fname, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE);
      if (library != nullptr) {
        dlclose(library);
      }
    }
  }

  bool isDefault_ = false;
};

}  // namespace

int openOwnFilesOnly(const char *szPath, HoldName hold, sqlite3 **ppHandle) {
  *ppHandle = nullptr;
  if (!isPrepared(szPath, hold)) {
    return SQLITE_NOMEM;
  }
  const DefaultVfs vfs;
  return vfs.isDefault() ? sqlite3_open(szPath, ppHandle) : SQLITE_NOMEM;
}
