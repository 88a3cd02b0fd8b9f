// SQLite's way to the files of one database in a directory where others can make files.
#ifndef SCHED_DB_VFS_H
#define SCHED_DB_VFS_H

#include <sqlite3.h>

// Whether the file is ours, so that nobody else can put another in its place. With `mayMake` it is
// made when there is none.
using HoldName = bool (*)(const char *szPath, bool mayMake);

// The extended code of a handle whose database was not opened because it is in WAL mode.
constexpr int kInWalMode = SQLITE_CANTOPEN_DIRTYWAL;

// As sqlite3_open, which it calls. The handle reads and writes the database and its rollback
// journal, both only while `hold` says that they are ours, and nothing else that SQLite looks for
// beside a database: a "-wal" or "-shm" is not there for it, nor is a super-journal. The name of
// the journal never becomes free. szPath must stay valid as long as the handle. One database a
// process.
int openOwnFilesOnly(const char *szPath, HoldName hold, sqlite3 **ppHandle);

#endif
