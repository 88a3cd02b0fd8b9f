// A connection to the status database that is closed at the end of its scope.
#ifndef SCHED_DB_GUARD_H
#define SCHED_DB_GUARD_H

#include <sqlite3.h>

#include <memory>

struct DBDeleter {
  void operator()(sqlite3 *db) const { sqlite3_close(db); }
};
using DBGuard = std::unique_ptr<sqlite3, DBDeleter>;

#endif
