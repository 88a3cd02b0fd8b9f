// Access to the files of one SQLite database in a directory where other users can make files.
#ifndef SCHED_DB_VFS_H
#define SCHED_DB_VFS_H

#include <sqlite3.h>

// Whether the file is ours, so that no other user can replace it. With `mayMake` a missing one is
// made.
using HoldName = bool (*)(const char *szPath, bool mayMake);

// The extended error code when the database was not opened because it is in WAL mode.
constexpr int kInWalMode = SQLITE_CANTOPEN_DIRTYWAL;

// As sqlite3_open, which it calls. The connection uses the database and its rollback journal, both
// only while `hold` says that they are ours. A "-wal" or "-shm" file and a super-journal do not
// exist for it. The journal is never deleted, so its name stays taken. szPath must stay valid as
// long as the connection. One database per process.
int openOwnFilesOnly(const char *szPath, HoldName hold, sqlite3 **ppHandle);

#endif
