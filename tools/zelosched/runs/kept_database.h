// What must outlive a boot, in /usr/zelo/var/history.sqlite: the runs, since the status database
// goes with /tmp; when the machine was last known to be up; and the tasks whose time passed while
// it was off.
#pragma once

#include <memory>
#include <string>

struct sqlite3;
struct sqlite3_stmt;

// The database is there, and this user has not the rights to read it.
bool isKeptFromUs();

// The kernel's name of this boot. Throws Failure.
std::string bootId();

class KeptDatabase {
 public:
  enum Access { kRead, kChange };
  // For reading null inside when there is no database yet; for a change it is made. Throws Failure.
  explicit KeptDatabase(Access access);

  bool isThere() const { return db_ != nullptr; }
  sqlite3 *get() const { return db_.get(); }

 private:
  struct Close {
    void operator()(sqlite3 *db) const;
  };
  std::unique_ptr<sqlite3, Close> db_;
};

// One statement of it, which may be run several times. Each call throws Failure.
class Query {
 public:
  Query(const KeptDatabase &database, const char *sql);

  // The next parameter.
  Query &with(long number);
  Query &with(const std::string &text);

  // To the next row. False at the end, and it can be run again.
  bool next();
  // Of a statement without rows: how many it changed.
  long run();

  long number(int column) const;
  std::string text(int column) const;

 private:
  struct Finalize {
    void operator()(sqlite3_stmt *statement) const;
  };
  sqlite3 *db_;
  std::unique_ptr<sqlite3_stmt, Finalize> statement_;
  int parameters_ = 0;
};

// What is changed while one lives takes effect by commit(), all of it, or not at all.
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
