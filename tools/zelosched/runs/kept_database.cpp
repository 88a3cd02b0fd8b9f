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

constexpr char kPath[] = "/usr/zelo/var/history.sqlite";
constexpr char kDirectory[] = "/usr/zelo/var";
constexpr mode_t kDirectoryMode = 0755;
constexpr mode_t kMode = 0600;  // command results are nobody else's business
constexpr char kBootId[] = "/proc/sys/kernel/random/boot_id";
constexpr int kPatience = 10000;  // milliseconds, while another command writes

constexpr long kVersion = 1;  // in user_version; 0 is a new database
// The ids of runs begin anew with each boot, so that it takes all that never changes to tell two
// rows apart.
constexpr char kSchema[] =
    "CREATE TABLE run(timestamp INTEGER NOT NULL, status_id INTEGER NOT NULL,"
    " pid INTEGER NOT NULL, task_id INTEGER NOT NULL, app TEXT NOT NULL,"
    " status_code INTEGER NOT NULL, comment TEXT NOT NULL, boot TEXT NOT NULL,"
    " PRIMARY KEY(timestamp, status_id, pid, task_id, app)) WITHOUT ROWID;"
    "CREATE INDEX run_of_task ON run(task_id, timestamp);"
    "CREATE TABLE up(boot TEXT NOT NULL, seen INTEGER NOT NULL);"
    "CREATE TABLE missed(task_id INTEGER PRIMARY KEY, app TEXT NOT NULL, due INTEGER NOT NULL);"
    "PRAGMA user_version = 1;";

Failure cannot(const char *what, const char *why) {
  return Failure(std::string("cannot ") + what + " " + kPath + ": " + why);
}

void makeDirectories() {
  for (const char *directory : {"/usr/zelo", kDirectory}) {
    if (mkdir(directory, kDirectoryMode) != 0 && errno != EEXIST) {
      const int reason = errno;
      throw Failure(std::string("cannot make ") + directory + ": " + std::strerror(reason));
    }
  }
}

// SQLite would give it the mode of the day.
void makeFile() {
  makeDirectories();
  const int file = open(kPath, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kMode);
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
  if (lstat(kPath, &file) != 0 || stat(kDirectory, &directory) != 0) {
    throw cannot("open", std::strerror(errno));
  }
  if (!isOurs(directory)) throw cannot("open", "its directory is not this user's alone");
  if (!S_ISREG(file.st_mode) || !isOurs(file)) {
    throw cannot("open", "it is not this user's own file alone");
  }
}

// A data volume may stand behind a link of root's to the directory, where SQLite, told to follow no
// link, would follow none of these either.
std::string pathBehindLinks() {
  const std::unique_ptr<char, decltype(&std::free)> directory(realpath(kDirectory, nullptr),
                                                              std::free);
  if (directory == nullptr) throw cannot("open", std::strerror(errno));
  return std::string(directory.get()) + std::strrchr(kPath, '/');
}

long versionOf(const KeptDatabase &database) {
  Query query(database, "PRAGMA user_version");
  return query.next() ? query.number(0) : 0;
}

void makeTables(const KeptDatabase &database) {
  Transaction transaction(database);
  // Another command may have been first.
  if (versionOf(database) == 0 &&
      sqlite3_exec(database.get(), kSchema, nullptr, nullptr, nullptr) != SQLITE_OK) {
    throw cannot("write", sqlite3_errmsg(database.get()));
  }
  transaction.commit();
}

}  // namespace

bool isKeptFromUs() {
  return access(kPath, F_OK) == 0 && access(kPath, R_OK) != 0;
}

std::string bootId() {
  std::string id = contentsOf(kBootId);
  while (!id.empty() && id.back() == '\n') id.pop_back();
  return id;
}

KeptDatabase::KeptDatabase(Access access) {
  if (access == kRead && ::access(kPath, F_OK) != 0 && errno == ENOENT) return;
  if (isKeptFromUs()) throw cannot("read", "that takes root's rights");
  if (access == kChange) makeFile();
  requireOurFile();
  sqlite3 *opened = nullptr;
  const int result = sqlite3_open_v2(pathBehindLinks().c_str(), &opened,
                                     SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW, nullptr);
  db_.reset(opened);
  if (result != SQLITE_OK) throw cannot("open", sqlite3_errmsg(opened));
  sqlite3_busy_timeout(opened, kPatience);
  const long version = versionOf(*this);
  if (version > kVersion) throw cannot("read", "a later zelosched made it");
  if (version == kVersion) return;
  if (access == kChange) {
    makeTables(*this);
  } else {
    db_.reset();
  }
}

Query::Query(const KeptDatabase &database, const char *sql) : db_(database.get()) {
  sqlite3_stmt *prepared = nullptr;
  if (sqlite3_prepare_v2(db_, sql, -1, &prepared, nullptr) != SQLITE_OK) {
    throw cannot("read", sqlite3_errmsg(db_));
  }
  statement_.reset(prepared);
}

Query &Query::with(long number) {
  if (sqlite3_bind_int64(statement_.get(), ++parameters_, number) != SQLITE_OK) {
    throw cannot("read", sqlite3_errmsg(db_));
  }
  return *this;
}

Query &Query::with(const std::string &text) {
  if (sqlite3_bind_text(statement_.get(), ++parameters_, text.data(), static_cast<int>(text.size()),
                        SQLITE_TRANSIENT) != SQLITE_OK) {
    throw cannot("read", sqlite3_errmsg(db_));
  }
  return *this;
}

bool Query::next() {
  const int result = sqlite3_step(statement_.get());
  if (result == SQLITE_ROW) return true;
  const std::string why = sqlite3_errmsg(db_);
  sqlite3_reset(statement_.get());
  parameters_ = 0;
  if (result != SQLITE_DONE) throw cannot("read or write", why.c_str());
  return false;
}

long Query::run() {
  while (next()) {
  }
  return sqlite3_changes64(db_);
}

long Query::number(int column) const {
  return sqlite3_column_int64(statement_.get(), column);
}

std::string Query::text(int column) const {
  const unsigned char *text = sqlite3_column_text(statement_.get(), column);
  const auto size = static_cast<size_t>(sqlite3_column_bytes(statement_.get(), column));
  return text == nullptr ? "" : std::string(reinterpret_cast<const char *>(text), size);
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

void KeptDatabase::Close::operator()(sqlite3 *db) const {
  sqlite3_close(db);
}

void Query::Finalize::operator()(sqlite3_stmt *statement) const {
  sqlite3_finalize(statement);
}
