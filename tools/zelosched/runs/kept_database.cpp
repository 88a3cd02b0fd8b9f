#include "runs/kept_database.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "store/place_file.h"
#include "terminal/failure.h"

namespace {

constexpr char kHistoryPath[] = "/usr/zelo/var/history.sqlite";
constexpr mode_t kHistoryDirectoryMode = 0755;
constexpr mode_t kHistoryMode = 0600;  // only root may read results of commands
constexpr char kBootId[] = "/proc/sys/kernel/random/boot_id";
constexpr int64_t kFirstVersion = 1;
constexpr int64_t kVersion = 2;  // in user_version; 0 is a new database

// The number of a run is not reused. The ids of the status database begin anew with each boot, or
// when that database is removed, so that all columns that do not change there together identify a
// run. `moment` orders the runs: the start, or the first time that was known.
constexpr char kSchema[] =
    "CREATE TABLE task(generation INTEGER PRIMARY KEY AUTOINCREMENT, task INTEGER NOT NULL,"
    " app TEXT NOT NULL, name TEXT NOT NULL, schedule TEXT NOT NULL, command TEXT NOT NULL,"
    " enabled INTEGER NOT NULL, created INTEGER, changed INTEGER NOT NULL, removed INTEGER);"
    "CREATE UNIQUE INDEX task_of_today ON task(task) WHERE removed IS NULL;"
    "CREATE TABLE run(run INTEGER PRIMARY KEY AUTOINCREMENT, task INTEGER NOT NULL,"
    " generation INTEGER, task_name TEXT NOT NULL, app TEXT NOT NULL, owner TEXT NOT NULL,"
    " started_by INTEGER NOT NULL, due INTEGER, queued INTEGER, start INTEGER, ended INTEGER,"
    " duration REAL, state INTEGER NOT NULL, outcome INTEGER NOT NULL, exit_code INTEGER,"
    " signal INTEGER, output_bytes INTEGER NOT NULL, moment INTEGER NOT NULL,"
    " boot TEXT NOT NULL, status_id INTEGER, pid INTEGER NOT NULL, pid_born INTEGER,"
    " keeper INTEGER, keeper_born INTEGER, stop_asked INTEGER, told INTEGER NOT NULL,"
    " UNIQUE(start, status_id, pid, task, app));"
    "CREATE INDEX run_by_moment ON run(moment, run);"
    "CREATE INDEX run_of_task ON run(task, moment, run);"
    "CREATE INDEX run_of_generation ON run(generation, moment, run);"
    "CREATE INDEX run_under_way ON run(state) WHERE state < 2;"
    "CREATE INDEX run_untold ON run(told) WHERE told = 0;"
    "CREATE TABLE output(run INTEGER PRIMARY KEY, task INTEGER NOT NULL, size INTEGER NOT NULL,"
    " left_out INTEGER NOT NULL, head BLOB NOT NULL, tail BLOB NOT NULL);"
    "CREATE INDEX output_of_task ON output(task, run);"
    "CREATE INDEX output_size ON output(size);"
    "CREATE TRIGGER run_dropped AFTER DELETE ON run BEGIN"
    " DELETE FROM output WHERE run = OLD.run; END;"
    // How far a status database has been read.
    "CREATE TABLE swept(file TEXT PRIMARY KEY, status_id INTEGER NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE notice(kind TEXT NOT NULL, generation INTEGER NOT NULL, moment INTEGER NOT NULL,"
    " told INTEGER NOT NULL, PRIMARY KEY(kind, generation, moment)) WITHOUT ROWID;"
    // `began`: when the machine was started, by the clock of the last sweep.
    "CREATE TABLE boot(boot TEXT PRIMARY KEY, started INTEGER, began INTEGER NOT NULL,"
    " seen INTEGER NOT NULL, clock_from INTEGER, clock_until INTEGER) WITHOUT ROWID;"
    "CREATE TABLE acknowledged(generation INTEGER PRIMARY KEY, moment INTEGER NOT NULL,"
    " run INTEGER NOT NULL);"
    "PRAGMA user_version = 2;";

// Converts a database of version 1. The numbers are those of RunState, Outcome and Trigger
// (run_record.h). Only start and code of these runs are known, and no notices are sent of them.
constexpr char kFromFirst[] =
    "INSERT INTO run(task, task_name, app, owner, started_by, start, state, outcome, exit_code,"
    " signal, output_bytes, moment, boot, status_id, pid, told)"
    " SELECT task_id, '', app, '', 3, timestamp, CASE status_code WHEN 2 THEN 1 ELSE 2 END,"
    " CASE status_code WHEN 2 THEN 0 WHEN 3 THEN 1 WHEN 7 THEN 2 WHEN 5 THEN 3 WHEN 6 THEN 3"
    " WHEN 0 THEN 4 WHEN 4 THEN 4 ELSE 9 END,"
    " CASE status_code WHEN 3 THEN 0 WHEN 7 THEN CAST(comment AS INTEGER) END,"
    " CASE WHEN status_code IN (5, 6) THEN CAST(comment AS INTEGER) END,"
    " 0, timestamp, boot, status_id, pid, 1"
    " FROM run_of_first ORDER BY timestamp, status_id, pid, task_id, app;"
    "DROP TABLE run_of_first; DROP TABLE up; DROP TABLE missed;";

Failure cannot(const char *what, const char *why) {
  return Failure(std::string("cannot ") + what + " " + kHistoryPath + ": " + why);
}

// A busy database is a temporary failure.
[[noreturn]] void fail(const char *what, sqlite3 *db) {
  const char *const why = sqlite3_errmsg(db);
  if (sqlite3_errcode(db) == SQLITE_BUSY) throw DatabaseBusy(cannot(what, why).what());
  throw cannot(what, why);
}

void makeDirectories() {
  for (const char *directory : {"/usr/zelo", kHistoryDirectory}) {
    if (mkdir(directory, kHistoryDirectoryMode) != 0 && errno != EEXIST) {
      const int reason = errno;
      throw Failure(std::string("cannot make ") + directory + ": " + std::strerror(reason));
    }
  }
}

// SQLite would create it with a mode that depends on the umask.
void makeFile() {
  makeDirectories();
  const int file =
      open(kHistoryPath, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kHistoryMode);
  if (file >= 0) {
    close(file);
  } else if (errno != EEXIST) {
    throw cannot("make", std::strerror(errno));
  }
}

bool isOurs(const struct stat &info) {
  return info.st_uid == geteuid() && (info.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

// Whoever can write the directory can put a journal there, from which SQLite would take rows.
void requireOurFile() {
  struct stat file {};
  struct stat directory {};
  if (lstat(kHistoryPath, &file) != 0 || stat(kHistoryDirectory, &directory) != 0) {
    throw cannot("open", std::strerror(errno));
  }
  if (!isOurs(directory)) throw cannot("open", "its directory is not this user's alone");
  if (!S_ISREG(file.st_mode) || !isOurs(file)) {
    throw cannot("open", "it is not this user's own file alone");
  }
}

// The directory may be a link of root's to a data volume. It is resolved first, as SQLite is told
// to follow no link at all.
std::string pathBehindLinks() {
  const std::unique_ptr<char, decltype(&std::free)> directory(realpath(kHistoryDirectory, nullptr),
                                                              std::free);
  if (directory == nullptr) throw cannot("open", std::strerror(errno));
  return std::string(directory.get()) + std::strrchr(kHistoryPath, '/');
}

int64_t versionOf(const KeptDatabase &database) {
  Query query(database, "PRAGMA user_version");
  return query.next() ? query.number(0) : 0;
}

void execute(const KeptDatabase &database, const char *sql) {
  if (sqlite3_exec(database.get(), sql, nullptr, nullptr, nullptr) != SQLITE_OK) {
    fail("write", database.get());
  }
}

void makeTables(const KeptDatabase &database) {
  Transaction transaction(database);
  const int64_t version = versionOf(database);  // another command may have been first
  if (version == kFirstVersion) {
    execute(database, "DROP INDEX run_of_task; ALTER TABLE run RENAME TO run_of_first;");
  }
  if (version < kVersion) execute(database, kSchema);
  if (version == kFirstVersion) execute(database, kFromFirst);
  transaction.commit();
}

}  // namespace

bool isKeptFromUs() {
  return access(kHistoryPath, F_OK) == 0 && access(kHistoryPath, R_OK) != 0;
}

std::string bootId() {
  std::string id = contentsOf(kBootId);
  while (!id.empty() && id.back() == '\n') id.pop_back();
  return id;
}

KeptDatabase::KeptDatabase(Access access, std::chrono::milliseconds patience) {
  if (access == kRead && ::access(kHistoryPath, F_OK) != 0 && errno == ENOENT) return;
  if (isKeptFromUs()) throw cannot("read", "that takes root's rights");
  if (access == kChange) makeFile();
  requireOurFile();
  sqlite3 *opened = nullptr;
  const int result = sqlite3_open_v2(pathBehindLinks().c_str(), &opened,
                                     SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW, nullptr);
  db_.reset(opened);
  if (result != SQLITE_OK) fail("open", opened);
  sqlite3_busy_timeout(opened, static_cast<int>(patience.count()));
  const int64_t version = versionOf(*this);
  if (version > kVersion) throw cannot("read", "a later zelosched made it");
  if (version == kVersion) return;
  // An older version is converted for reading too; a database without tables is like none.
  if (access == kChange || version == kFirstVersion) {
    makeTables(*this);
  } else {
    db_.reset();
  }
}

Query::Query(const KeptDatabase &database, const char *sql) : db_(database.get()) {
  sqlite3_stmt *prepared = nullptr;
  if (sqlite3_prepare_v2(db_, sql, -1, &prepared, nullptr) != SQLITE_OK) fail("read", db_);
  statement_.reset(prepared);
}

Query &Query::bound(int result) {
  if (result != SQLITE_OK) fail("read", db_);
  return *this;
}

Query &Query::with(int64_t number) {
  return bound(sqlite3_bind_int64(statement_.get(), ++parameters_, number));
}

// Without a value it is NULL.
Query &Query::with(std::optional<int64_t> number) {
  if (number) return with(*number);
  return bound(sqlite3_bind_null(statement_.get(), ++parameters_));
}

Query &Query::with(std::optional<double> number) {
  ++parameters_;
  return bound(number ? sqlite3_bind_double(statement_.get(), parameters_, *number)
                      : sqlite3_bind_null(statement_.get(), parameters_));
}

Query &Query::with(const std::string &text) {
  return bound(sqlite3_bind_text(statement_.get(), ++parameters_, text.data(),
                                 static_cast<int>(text.size()), SQLITE_TRANSIENT));
}

Query &Query::withBytes(const std::string &bytes) {
  return bound(sqlite3_bind_blob(statement_.get(), ++parameters_, bytes.data(),
                                 static_cast<int>(bytes.size()), SQLITE_TRANSIENT));
}

bool Query::next() {
  const int result = sqlite3_step(statement_.get());
  if (result == SQLITE_ROW) return true;
  if (result != SQLITE_DONE) fail("read or write", db_);
  sqlite3_reset(statement_.get());
  parameters_ = 0;
  return false;
}

int64_t Query::run() {
  while (next()) {
  }
  return sqlite3_changes64(db_);
}

int64_t Query::number(int column) const {
  return sqlite3_column_int64(statement_.get(), column);
}

std::optional<int64_t> Query::optionalNumber(int column) const {
  if (sqlite3_column_type(statement_.get(), column) == SQLITE_NULL) return std::nullopt;
  return number(column);
}

std::optional<double> Query::optionalReal(int column) const {
  if (sqlite3_column_type(statement_.get(), column) == SQLITE_NULL) return std::nullopt;
  return sqlite3_column_double(statement_.get(), column);
}

int64_t Query::lastKey() const {
  return sqlite3_last_insert_rowid(db_);
}

std::string Query::text(int column) const {
  const void *text = sqlite3_column_blob(statement_.get(), column);
  const auto size = static_cast<size_t>(sqlite3_column_bytes(statement_.get(), column));
  return text == nullptr ? "" : std::string(static_cast<const char *>(text), size);
}

Transaction::Transaction(const KeptDatabase &database) : database_(database) {
  Query(database_, "BEGIN IMMEDIATE").run();
}

Transaction::~Transaction() {
  if (!isCommitted_) sqlite3_exec(database_.get(), "ROLLBACK", nullptr, nullptr, nullptr);
}

void Transaction::commit() {
  Query(database_, "COMMIT").run();
  isCommitted_ = true;
}

// Within a transaction there is a snapshot already.
Snapshot::Snapshot(const KeptDatabase &database)
    : database_(database),
      isOurs_(database.isThere() && sqlite3_get_autocommit(database.get()) != 0) {
  if (isOurs_) Query(database_, "BEGIN").run();
}

Snapshot::~Snapshot() {
  if (isOurs_) sqlite3_exec(database_.get(), "ROLLBACK", nullptr, nullptr, nullptr);
}

void KeptDatabase::Close::operator()(sqlite3 *db) const {
  sqlite3_close(db);
}

void Query::Finalize::operator()(sqlite3_stmt *statement) const {
  sqlite3_finalize(statement);
}
