// What must outlive a boot, in /usr/zelo/var/history.sqlite: the runs and what they printed, since
// the status database goes with /tmp; the tasks as they were last seen; and when the machine was
// up.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "terminal/failure.h"

inline constexpr char kHistoryDirectory[] = "/usr/zelo/var";

struct sqlite3;
struct sqlite3_stmt;

// Whether the database is there, and this user has not the rights to read it.
bool isKeptFromUs();

// The kernel's id of this boot. Throws Failure.
std::string bootId();

// Another process has locked the database for longer than we wait.
class DatabaseBusy : public Failure {
 public:
  using Failure::Failure;
};

class KeptDatabase {
 public:
  enum Access { kRead, kChange };
  static constexpr std::chrono::milliseconds kUsualPatience{10000};

  // Without a database, isThere() is false for reading, and a change creates it. One of an earlier
  // version is converted. Throws Failure.
  explicit KeptDatabase(Access access, std::chrono::milliseconds patience = kUsualPatience);

  bool isThere() const { return db_ != nullptr; }
  sqlite3 *get() const { return db_.get(); }

 private:
  struct Close {
    void operator()(sqlite3 *db) const;
  };
  std::unique_ptr<sqlite3, Close> db_;
};

// A prepared statement, which may be run several times. Each call throws Failure.
class Query {
 public:
  Query(const KeptDatabase &database, const char *sql);

  // Binds the next parameter.
  Query &with(int64_t number);
  Query &with(std::optional<int64_t> number);
  Query &with(std::optional<double> number);
  Query &with(const std::string &text);
  Query &withBytes(const std::string &bytes);

  // To the next row. False at the end, and it can be run again.
  bool next();
  // Runs a statement to its end. Returns how many rows it changed.
  int64_t run();

  int64_t number(int column) const;
  std::optional<int64_t> optionalNumber(int column) const;
  std::optional<double> optionalReal(int column) const;
  std::string text(int column) const;  // or bytes
  // The key of the row last inserted.
  int64_t lastKey() const;

 private:
  struct Finalize {
    void operator()(sqlite3_stmt *statement) const;
  };
  Query &bound(int result);

  sqlite3 *db_;
  std::unique_ptr<sqlite3_stmt, Finalize> statement_;
  int parameters_ = 0;
};

// A write transaction, which is rolled back unless commit() is called.
class Transaction {
 public:
  explicit Transaction(const KeptDatabase &database);
  ~Transaction();
  Transaction(const Transaction &) = delete;
  Transaction &operator=(const Transaction &) = delete;
  void commit();

 private:
  const KeptDatabase &database_;
  bool isCommitted_ = false;
};

// A read transaction: its statements see one snapshot, and share one lock.
class Snapshot {
 public:
  explicit Snapshot(const KeptDatabase &database);
  ~Snapshot();
  Snapshot(const Snapshot &) = delete;
  Snapshot &operator=(const Snapshot &) = delete;

 private:
  const KeptDatabase &database_;
  bool isOurs_;
};
