// Files that others put next to the status database, under the names of SQLite's journals.
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <memory>
#include <thread>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "tasks.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

const std::string kJournal = std::string(kStatusDatabase) + "-journal";
const std::string kLog = std::string(kStatusDatabase) + "-wal";
const std::string kLogIndex = std::string(kStatusDatabase) + "-shm";
constexpr char kForge[] = "/tmp/forge/database";
constexpr char kVictim[] = "/tmp/victim";
constexpr uid_t kNobody = 65534;
constexpr size_t kPageSize = 4096;
constexpr size_t kSectorSize = 512;

struct CloseDatabase {
  void operator()(sqlite3 *db) const { sqlite3_close_v2(db); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

Database openPlainly(const char *szPath) {
  sqlite3 *db = nullptr;
  EXPECT_EQ(sqlite3_open_v2(szPath, &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr),
            SQLITE_OK);
  return Database(db);
}

// What the statements give, "|" between values and " " between rows, or SQLite's error.
std::string answer(sqlite3 *db, const std::string &sql) {
  const OwnWork own;
  std::string rows;
  char *error = nullptr;
  sqlite3_exec(
      db, sql.c_str(),
      [](void *text, int columns, char **values, char **) {
        auto *all = static_cast<std::string *>(text);
        if (!all->empty()) all->append(" ");
        for (int i = 0; i < columns; ++i) {
          all->append(i > 0 ? "|" : "").append(values[i] != nullptr ? values[i] : "");
        }
        return 0;
      },
      &rows, &error);
  if (error != nullptr) rows = error;
  sqlite3_free(error);
  return rows;
}

std::string applications(const Database &db) {
  return answer(db.get(), "SELECT app FROM task_status ORDER BY status_id");
}

void giveAway(const std::string &path) {
  EXPECT_EQ(chown(path.c_str(), kNobody, kNobody), 0) << path;
}

std::string bigEndian(size_t number) {
  std::string bytes;
  for (int shift = 24; shift >= 0; shift -= 8) {
    bytes.push_back(static_cast<char>(number >> static_cast<unsigned>(shift)));
  }
  return bytes;
}

constexpr char kJournalMagic[] = "\xd9\xd5\x05\xf9\x20\xa1\x63\xd7";

// A rollback journal that restores the database to `pages`.
std::string journalOf(const std::string &pages) {
  const size_t count = pages.size() / kPageSize;
  std::string journal = kJournalMagic + bigEndian(count) + bigEndian(0) + bigEndian(count) +
                        bigEndian(kSectorSize) + bigEndian(kPageSize);
  journal.resize(kSectorSize);
  for (size_t page = 0; page < count; ++page) {
    const std::string bytes = pages.substr(page * kPageSize, kPageSize);
    constexpr size_t kStep = 200;
    unsigned sum = 0;
    for (size_t i = kPageSize - kStep; i > 0; i -= kStep <= i ? kStep : i) {
      sum += static_cast<unsigned char>(bytes[i]);
    }
    journal += bigEndian(page + 1) + bytes + bigEndian(sum);
  }
  return journal;
}

// The end of a journal that names this super-journal.
std::string naming(const std::string &superJournal) {
  constexpr size_t kPageOfLocks = (size_t{1} << 30U) / kPageSize + 1;
  unsigned sum = 0;
  for (const char c : superJournal) sum += static_cast<unsigned>(c);
  return bigEndian(kPageOfLocks) + superJournal + bigEndian(superJournal.size()) + bigEndian(sum) +
         kJournalMagic;
}

class PlantedJournalTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    forget();
    std::filesystem::create_directory("/tmp/forge");
  }
  void TearDown() override {
    resetFailingCalls();
    forget();
    SandboxTest::TearDown();
  }

  static void forget() {
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
      const std::string name = entry.path().filename();
      if (name.starts_with("sched_status.sqlite") || name == "forge" || name == "victim") {
        std::filesystem::remove_all(entry.path());
      }
    }
  }

  // A closed database with one row.
  static void makeGenuine() {
    const Database db = init();
    add(db, "genuine");
  }
  static Database init() { return Database(ZELOSchedDBInit()); }
  static int add(const Database &db, const char *szApp) {
    const Task task = makeTask("task", "");
    setText(task->App, szApp);
    return ZELOSchedDBAddRecord(db.get(), task.get(), nullptr);
  }
  // A copy of the genuine database, to change.
  static Database forge() {
    const OwnWork own;
    std::filesystem::copy_file(kStatusDatabase, kForge,
                               std::filesystem::copy_options::overwrite_existing);
    return openPlainly(kForge);
  }
  static std::string forgedLog() {
    const OwnWork own;
    const Database db = forge();
    answer(db.get(), "PRAGMA journal_mode=WAL; UPDATE task_status SET app='forged'");
    return readFile(std::string(kForge) + "-wal");
  }
  static std::string forgedJournal() {
    const OwnWork own;
    answer(forge().get(), "UPDATE task_status SET app='forged'");
    return journalOf(readFile(kForge));
  }
  static void plant(const std::string &path, const std::string &contents) {
    const OwnWork own;
    writeFile(path, contents, 0666);
    giveAway(path);
  }
  static void expectStillHis(const std::string &path, const std::string &contents) {
    struct stat info = {};
    ASSERT_EQ(lstat(path.c_str(), &info), 0) << path;
    EXPECT_EQ(info.st_uid, kNobody);
    EXPECT_EQ(readFile(path), contents);
  }
};

// SQLite takes the forgeries for its own files.
TEST_F(PlantedJournalTest, SqliteBelievesThemByItself) {
  makeGenuine();
  writeFile(kLog, forgedLog());
  EXPECT_EQ(applications(openPlainly(kStatusDatabase)), "forged");
  forget();
  std::filesystem::create_directory("/tmp/forge");
  makeGenuine();
  writeFile(kVictim, "important");
  writeFile(kJournal, forgedJournal() + naming(kVictim));
  EXPECT_EQ(applications(openPlainly(kStatusDatabase)), "forged");
  EXPECT_FALSE(fileExists(kVictim));
}

TEST_F(PlantedJournalTest, ALogThatIsThereIsNeitherReadNorTouched) {
  REQUIRE_OTHER_USERS();
  makeGenuine();
  const std::string log = forgedLog();
  plant(kLog, log);
  plant(kLogIndex, "his");
  const Database db = init();
  ASSERT_NE(db, nullptr);
  EXPECT_EQ(add(db, "next"), 0);
  EXPECT_EQ(applications(db), "genuine next");
  expectStillHis(kLog, log);
  expectStillHis(kLogIndex, "his");
  EXPECT_EQ(logged(), Lines{});
}

// Whenever a log appears, between any two calls of an opening and a recording.
TEST_F(PlantedJournalTest, ALogThatAppearsMeanwhileIsNeitherReadNorTouched) {
  REQUIRE_OTHER_USERS();
  bool wasLast = false;
  for (unsigned nth = 1; !wasLast; ++nth) {
    SCOPED_TRACE(nth);
    forget();
    std::filesystem::create_directory("/tmp/forge");
    makeGenuine();
    const std::string log = forgedLog();
    unsigned calls = 0;
    beforeEachCall([&](const std::string &) {
      if (++calls == nth) plant(kLog, log);
    });
    const Database db = init();
    ASSERT_NE(db, nullptr);
    EXPECT_EQ(add(db, "next"), 0);
    resetFailingCalls();
    wasLast = calls < nth;
    EXPECT_EQ(applications(db), "genuine next");
    if (!wasLast) expectStillHis(kLog, log);
  }
}

// Otherwise another user could take it.
TEST_F(PlantedJournalTest, TheNameOfTheJournalIsNeverFreeAgain) {
  bool wasTaken = false;
  unsigned timesFree = 0;
  const auto watch = [&] {
    beforeEachCall([&](const std::string &call) {
      const bool isTaken = fileExists(kJournal);
      if (wasTaken && !isTaken) {
        ++timesFree;
        ADD_FAILURE() << "free before " << call;
      }
      wasTaken = isTaken;
    });
  };
  watch();
  const Database db = init();
  ASSERT_NE(db, nullptr);
  EXPECT_EQ(add(db, "first"), 0);
  // Also when a caller wants another mode.
  for (const char *mode : {"delete", "truncate", "memory", "off", "delete"}) {
    EXPECT_EQ(answer(db.get(), std::string("PRAGMA journal_mode=") + mode), mode);
    watch();
    EXPECT_EQ(add(db, "next"), 0) << mode;
  }
  const Database second = init();
  EXPECT_EQ(timesFree, 0U);
  EXPECT_TRUE(fileExists(kJournal));
  EXPECT_FALSE(fileExists(kLog));
}

TEST_F(PlantedJournalTest, AJournalThatIsNoLongerOursIsMovedAwayAndNotRolledBack) {
  REQUIRE_OTHER_USERS();
  makeGenuine();
  const std::string journal = forgedJournal() + naming(kVictim);
  writeFile(kVictim, "important");
  const Database db = init();
  // As the sqlite3 shell does when root runs it.
  std::filesystem::remove(kJournal);
  plant(kJournal, journal);
  EXPECT_EQ(applications(db), "genuine");
  failCall("renameat2", {.error = EIO});
  EXPECT_EQ(add(db, "next"), -1);
  EXPECT_EQ(applications(db), "genuine");
  expectStillHis(kJournal, journal);
  EXPECT_EQ(add(db, "next"), 0);
  EXPECT_EQ(applications(db), "genuine next");
  EXPECT_EQ(readFile(movedAway(kJournal)), journal);
  EXPECT_EQ(readFile(kVictim), "important");
}

TEST_F(PlantedJournalTest, AJournalOfOursThatIsHotIsRolledBack) {
  makeGenuine();
  writeFile(kJournal, forgedJournal(), 0600);
  EXPECT_EQ(applications(init()), "forged");
}

TEST_F(PlantedJournalTest, ASuperJournalIsNeitherBelievedNorDeleted) {
  makeGenuine();
  writeFile(kVictim, "important");
  writeFile(kJournal, forgedJournal() + naming(kVictim), 0600);
  EXPECT_EQ(applications(init()), "genuine");
  EXPECT_EQ(readFile(kVictim), "important");
}

// A file that somebody moved there from a directory of his own can be root's.
TEST_F(PlantedJournalTest, AJournalBesideAMissingDatabaseIsNotRolledBack) {
  makeGenuine();
  writeFile(kVictim, "important");
  const std::string journal = forgedJournal();
  for (const std::string &end : {std::string(), naming(kVictim)}) {
    std::filesystem::remove(kStatusDatabase);
    writeFile(kJournal, journal + end, 0600);
    EXPECT_EQ(applications(init()), "");
    EXPECT_EQ(readFile(kVictim), "important");
  }
}

TEST_F(PlantedJournalTest, ACallerCannotPutTheDatabaseIntoWalMode) {
  const Database db = init();
  EXPECT_EQ(answer(db.get(), "PRAGMA journal_mode=WAL"), "persist");
  EXPECT_EQ(add(db, "next"), 0);
  EXPECT_EQ(applications(init()), "next");
  EXPECT_FALSE(fileExists(kLog));
  EXPECT_FALSE(fileExists(kLogIndex));
}

// ---- a database in WAL mode

class WalModeTest : public PlantedJournalTest {
 protected:
  void SetUp() override {
    PlantedJournalTest::SetUp();
    makeGenuine();
    EXPECT_EQ(answer(openPlainly(kStatusDatabase).get(), "PRAGMA journal_mode=WAL"), "wal");
    clearLog();
  }
  static Lines namesAside() {
    Lines names;
    const std::string aside = movedAway(kStatusDatabase);
    if (aside.empty()) return names;
    const std::filesystem::path directory = std::filesystem::path(aside).parent_path();
    struct stat info = {};
    EXPECT_EQ(stat(directory.c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777U, 0700U);
    for (const auto &entry : std::filesystem::directory_iterator(directory)) {
      names.push_back(entry.path());
    }
    std::sort(names.begin(), names.end());
    return names;
  }
};

TEST_F(WalModeTest, ItIsMovedAsideAndMadeAnew) {
  bool wasFree = false;
  beforeEachCall([&](const std::string &) { wasFree = wasFree || !fileExists(kStatusDatabase); });
  const Database db = init();
  resetFailingCalls();
  ASSERT_NE(db, nullptr);
  EXPECT_FALSE(wasFree);
  EXPECT_EQ(add(db, "next"), 0);
  EXPECT_EQ(applications(db), "next");
  struct stat info = {};
  ASSERT_EQ(stat(kStatusDatabase, &info), 0);
  EXPECT_EQ(info.st_mode & 0777U, 0600U);
  ASSERT_EQ(namesAside().size(), 1U);
  EXPECT_EQ(applications(openPlainly(namesAside()[0].c_str())), "genuine");
  EXPECT_EQ(logged(), Lines{"sched_task_db.cpp:N " + std::string(kStatusDatabase) +
                            " was in WAL mode and is now " + namesAside()[0] + "\n"});
}

TEST_F(WalModeTest, ItsOwnLogGoesWithIt) {
  const std::string database = readFile(kStatusDatabase);
  {
    const Database open = openPlainly(kStatusDatabase);
    answer(open.get(), "UPDATE task_status SET app='logged'");
    const std::string log = readFile(kLog);
    std::filesystem::remove_all("/tmp/forge");
    writeFile("/tmp/forge/log", log);
  }
  writeFile(kStatusDatabase, database, 0600);
  writeFile(kLog, readFile("/tmp/forge/log"), 0600);
  const Database db = init();
  EXPECT_EQ(applications(db), "");
  EXPECT_FALSE(fileExists(kLog));
  ASSERT_EQ(namesAside().size(), 2U);
  EXPECT_EQ(applications(openPlainly(namesAside()[0].c_str())), "logged");
}

TEST_F(WalModeTest, SomebodyElsesLogStaysWhereItIs) {
  REQUIRE_OTHER_USERS();
  plant(kLog, "his");
  const Database db = init();
  ASSERT_NE(db, nullptr);
  EXPECT_EQ(namesAside().size(), 1U);
  expectStillHis(kLog, "his");
}

TEST_F(WalModeTest, WhatAnotherProcessHasJustMadeIsNotMovedAside) {
  bool isDone = false;
  beforeEachCall([&](const std::string &call) {
    if (call != "flock" || isDone) return;
    isDone = true;
    std::filesystem::remove(kStatusDatabase);
    addStatusRow({.pid = 1, .app = "made meanwhile"});
    chmod(kStatusDatabase, 0600);
  });
  const Database db = init();
  resetFailingCalls();
  EXPECT_TRUE(isDone);
  EXPECT_EQ(applications(db), "made meanwhile");
  EXPECT_EQ(namesAside(), Lines{});
}

TEST_F(WalModeTest, WithoutRoomForAnotherTheDatabaseIsNotOpened) {
  for (const char *call : {"mkdtemp", "flock"}) {
    clearLog();
    failCall(call, {.error = ENOSPC});
    EXPECT_EQ(init(), nullptr) << call;
    EXPECT_EQ(logged(),
              Lines{"sched_task_db.cpp:N Can't open database: unable to open database file\n"});
    resetFailingCalls();
  }
  EXPECT_EQ(namesAside(), Lines{});
}

TEST_F(WalModeTest, ADatabaseToBeReadFromALogOnlyIsInWalModeToo) {
  std::string header = readFile(kStatusDatabase);
  constexpr size_t kWriteVersion = 18;
  ASSERT_EQ(header.substr(kWriteVersion, 2), "\2\2");
  header[kWriteVersion] = 1;
  writeFile(kStatusDatabase, header, 0600);
  EXPECT_EQ(applications(init()), "");
  EXPECT_EQ(namesAside().size(), 1U);
}

TEST_F(WalModeTest, WithoutTheJournalThereAreNoTurnsAndItIsNotOpened) {
  bool isDone = false;
  beforeEachCall([&](const std::string &call) {
    if (call != "sqlite3_open" || isDone) return;
    isDone = true;
    std::filesystem::remove(kJournal);
  });
  EXPECT_EQ(init(), nullptr);
  resetFailingCalls();
  EXPECT_TRUE(isDone);
  EXPECT_EQ(namesAside(), Lines{});
}

TEST_F(WalModeTest, AnotherFailureMeanwhileMovesNothingAside) {
  failCall("sqlite3_open", {.from = 2});
  EXPECT_EQ(init(), nullptr);
  EXPECT_EQ(namesAside(), Lines{});
}

// ---- a database that is not this process's

TEST_F(PlantedJournalTest, WhoeverMayOnlyReadItMakesNoJournal) {
  REQUIRE_OTHER_USERS();
  makeGenuine();
  std::filesystem::remove(kJournal);
  chmod(kStatusDatabase, 0644);
  ASSERT_EQ(seteuid(kNobody), 0);
  const Database db = init();
  const std::string found = db != nullptr ? applications(db) : "";
  ASSERT_EQ(seteuid(0), 0);
  EXPECT_EQ(found, "genuine");
  EXPECT_FALSE(fileExists(kJournal));
}

TEST_F(PlantedJournalTest, OneThatBecomesOursWhenItCouldNotBeTakenIsNotOpened) {
  makeGenuine();
  chmod(kStatusDatabase, 0666);
  failCall("renameat2", {.error = EIO});
  bool couldNot = false;
  beforeEachCall([&](const std::string &call) {
    if (call == "lstat" && couldNot) chmod(kStatusDatabase, 0600);
    couldNot = couldNot || call == "renameat2";
  });
  EXPECT_EQ(init(), nullptr);
  resetFailingCalls();
  EXPECT_EQ(logged(), Lines{"sched_task_db.cpp:N Can't open database: " +
                            std::string(kStatusDatabase) + " was another user's\n"});
  EXPECT_EQ(applications(init()), "genuine");
}

// ---- other databases of the process

std::vector<sqlite3_vfs *> allVfs() {
  std::vector<sqlite3_vfs *> all;
  for (sqlite3_vfs *vfs = sqlite3_vfs_find(nullptr); vfs != nullptr; vfs = vfs->pNext) {
    all.push_back(vfs);
  }
  return all;
}

sqlite3_vfs *vfsOf(const Database &db) {
  sqlite3_vfs *vfs = nullptr;
  sqlite3_file_control(db.get(), "main", SQLITE_FCNTL_VFS_POINTER, &vfs);
  return vfs;
}

TEST_F(PlantedJournalTest, NothingIsLeftInSqliteAfterAnOpening) {
  const std::vector<sqlite3_vfs *> before = allVfs();
  const Database db = init();
  EXPECT_EQ(allVfs(), before);
  EXPECT_EQ(vfsOf(openPlainly(kForge)), before.front());
  failCall("sqlite3_open");
  EXPECT_EQ(init(), nullptr);
  EXPECT_EQ(allVfs(), before);
}

TEST_F(PlantedJournalTest, WhatACallerAttachesIsOpenedAsEver) {
  const Database db = init();
  EXPECT_EQ(answer(db.get(),
                   "ATTACH '/tmp/forge/other' AS other; CREATE TABLE other.t(a);"
                   "PRAGMA other.journal_mode=WAL; INSERT INTO other.t VALUES(1)"),
            "wal");
  EXPECT_TRUE(fileExists("/tmp/forge/other-wal"));
  EXPECT_EQ(answer(db.get(), "SELECT a FROM other.t"), "1");
}

void openOthersMeanwhile() {
  Database other;
  Database third;
  beforeEachCall([&](const std::string &call) {
    if (call != "sqlite3_open" || other != nullptr) return;
    other = openPlainly("/tmp/forge/other");
    third = openPlainly("/tmp/sched_status.sqlite.third");
  });
  const Database db(ZELOSchedDBInit());
  resetFailingCalls();
  ASSERT_NE(other, nullptr);
  EXPECT_EQ(answer(third.get(), "CREATE TABLE t(a)"), "");
  // Both in one transaction, for which SQLite makes a super-journal.
  EXPECT_EQ(answer(other.get(),
                   "CREATE TABLE t(a); ATTACH '/tmp/forge/second' AS second;"
                   "CREATE TABLE second.t(a); BEGIN; INSERT INTO t VALUES(1);"
                   "INSERT INTO second.t VALUES(2); COMMIT"),
            "");
  EXPECT_FALSE(fileExists("/tmp/forge/other-journal"));
  EXPECT_EQ(answer(other.get(), "DETACH second; PRAGMA journal_mode=WAL; INSERT INTO t VALUES(3)"),
            "wal");
  EXPECT_TRUE(fileExists("/tmp/forge/other-wal"));
  EXPECT_EQ(answer(other.get(), "SELECT a FROM t"), "1 3");
  EXPECT_EQ(applications(db), "genuine");
}

// As another thread could. In a forked process, since it changes how later calls are passed on.
TEST_F(PlantedJournalTest, ADatabaseOpenedMeanwhileIsOpenedAsEver) {
  makeGenuine();
  if (fork() == 0) {
    openOthersMeanwhile();
    fflush(stdout);
    exit(HasFailure() ? EXIT_FAILURE : EXIT_SUCCESS);  // not _exit, which writes no coverage data
  }
  EXPECT_EQ(waitForChildRuns(), std::vector<int>{0});
}

TEST_F(PlantedJournalTest, AProcessWithThreadsOpensAndUsesItTheSame) {
  const std::vector<sqlite3_vfs *> before = allVfs();
  std::string found;
  std::thread([&] {
    const Database db = init();
    EXPECT_EQ(add(db, "of a thread"), 0);
    found = applications(db);
  }).join();
  EXPECT_EQ(found, "of a thread");
  EXPECT_EQ(allVfs(), before);
}

// ---- what SQLite may ask for by a name

int sizeOnDiskOf(const std::string &path) {
  return static_cast<int>(std::filesystem::file_size(path));
}

class NamesTest : public PlantedJournalTest {
 protected:
  void SetUp() override {
    PlantedJournalTest::SetUp();
    db_ = init();
    ASSERT_EQ(add(db_, "genuine"), 0);
    vfs_ = vfsOf(db_);
    ASSERT_NE(vfs_, nullptr);
    writeFile(kVictim, "important");
  }
  void TearDown() override {
    db_.reset();
    PlantedJournalTest::TearDown();
  }

  bool isThere(const std::string &path) {
    int answer = -1;
    EXPECT_EQ(vfs_->xAccess(vfs_, path.c_str(), SQLITE_ACCESS_EXISTS, &answer), SQLITE_OK);
    return answer != 0;
  }
  int remove(const std::string &path) { return vfs_->xDelete(vfs_, path.c_str(), 0); }
  int open(const std::string &path, int flags) {
    const std::unique_ptr<void, decltype(&std::free)> file(
        std::calloc(1, static_cast<size_t>(vfs_->szOsFile)), &std::free);
    return vfs_->xOpen(vfs_, path.c_str(), static_cast<sqlite3_file *>(file.get()), flags, nullptr);
  }

  Database db_;
  sqlite3_vfs *vfs_ = nullptr;
};

TEST_F(NamesTest, OnlyTheDatabaseAndItsJournalAreThere) {
  writeFile(kLog, "a log");
  EXPECT_TRUE(isThere(kStatusDatabase));
  EXPECT_TRUE(isThere(kJournal));
  EXPECT_FALSE(isThere(kLog));
  EXPECT_FALSE(isThere(kVictim));
}

TEST_F(NamesTest, OnlyTheJournalIsDeletedAndThatByBeingEmptied) {
  writeFile(kLog, "a log");
  EXPECT_GT(sizeOnDiskOf(kJournal), 0);
  EXPECT_EQ(remove(kJournal), SQLITE_OK);
  EXPECT_EQ(sizeOnDiskOf(kJournal), 0);
  EXPECT_EQ(remove(kStatusDatabase), SQLITE_IOERR_DELETE);
  EXPECT_EQ(remove(kLog), SQLITE_IOERR_DELETE_NOENT);
  EXPECT_EQ(remove(kVictim), SQLITE_IOERR_DELETE_NOENT);
  EXPECT_EQ(readFile(kLog), "a log");
  EXPECT_EQ(readFile(kVictim), "important");
  std::filesystem::remove(kJournal);
  EXPECT_EQ(remove(kJournal), SQLITE_IOERR_DELETE);
  EXPECT_EQ(applications(db_), "genuine");
}

TEST_F(NamesTest, NeitherALogNorASuperJournalIsOpened) {
  constexpr int kMake = SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
  EXPECT_EQ(open(kLog, kMake | SQLITE_OPEN_WAL), SQLITE_CANTOPEN);
  EXPECT_EQ(open(kVictim, kMake | SQLITE_OPEN_SUPER_JOURNAL), SQLITE_CANTOPEN);
  EXPECT_EQ(open(std::string(kStatusDatabase) + "-mj01", kMake | SQLITE_OPEN_SUPER_JOURNAL),
            SQLITE_CANTOPEN);
  EXPECT_FALSE(fileExists(kLog));
}

// Temporary files have no name.
TEST_F(NamesTest, WhatDoesNotFitIntoMemoryGoesIntoATemporaryFile) {
  const char *const kOpen = sizeof(long) == sizeof(int32_t) ? "open" : "open64";
  bool wasOpened = false;
  beforeEachCall([&](const std::string &call) { wasOpened = wasOpened || call == kOpen; });
  char *error = nullptr;
  EXPECT_EQ(sqlite3_exec(db_.get(),
                         "PRAGMA temp_store=FILE; CREATE TEMP TABLE many(text);"
                         "PRAGMA temp.cache_size=1;"
                         "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n LIMIT 500) "
                         "INSERT INTO many SELECT hex(zeroblob(2000)) FROM n",
                         nullptr, nullptr, &error),
            SQLITE_OK)
      << error;
  resetFailingCalls();
  EXPECT_TRUE(wasOpened);
  EXPECT_EQ(answer(db_.get(), "SELECT count(*), sum(length(text)) FROM many"), "500|2000000");
}

TEST_F(NamesTest, AJournalThatCannotBeEmptiedFailsTheTransaction) {
  EXPECT_EQ(answer(db_.get(), "PRAGMA synchronous=EXTRA; PRAGMA journal_mode=DELETE"), "delete");
  const std::function<void()> failures[] = {
      [] { failCallFor("open", "-journal", {.times = kAlways, .error = EMFILE}); },
      [] { failCall("ftruncate", {.times = kAlways, .error = EIO}); },
  };
  for (const auto &fail : failures) {
    fail();
    EXPECT_EQ(add(db_, "lost"), -1);
    resetFailingCalls();
    EXPECT_EQ(applications(db_), "genuine");
  }
  EXPECT_EQ(add(db_, "next"), 0);
  EXPECT_EQ(applications(db_), "genuine next");
}

// The journal is truncated by then, so the change cannot be rolled back; whether the truncation
// survives a power cut is unknown.
TEST_F(NamesTest, AnEmptiedJournalThatMayNotHaveReachedTheDiskIsToldAsAFailure) {
  EXPECT_EQ(answer(db_.get(), "PRAGMA synchronous=EXTRA; PRAGMA journal_mode=DELETE"), "delete");
  failCall("fsync", {.error = EIO});
  EXPECT_EQ(add(db_, "next"), -1);
  EXPECT_EQ(callCount("fsync"), 1U);
}

TEST_F(NamesTest, TheRestIsSqlitesOwn) {
  sqlite3_vfs *const real = sqlite3_vfs_find(nullptr);
  ASSERT_NE(real, vfs_);
  EXPECT_STREQ(vfs_->zName, real->zName);
  EXPECT_EQ(vfs_->xGetSystemCall(vfs_, "open"), real->xGetSystemCall(real, "open"));
  EXPECT_STREQ(vfs_->xNextSystemCall(vfs_, "open"), real->xNextSystemCall(real, "open"));
  EXPECT_EQ(vfs_->xSetSystemCall(vfs_, "no such call", nullptr), SQLITE_NOTFOUND);
  EXPECT_EQ(vfs_->xDlOpen(vfs_, "/nonexistent/library"), nullptr);
  char text[64] = "";
  vfs_->xDlError(vfs_, sizeof(text), text);
  EXPECT_NE(text[0], '\0');
  EXPECT_EQ(vfs_->xRandomness(vfs_, sizeof(text), text), static_cast<int>(sizeof(text)));
  EXPECT_GE(vfs_->xSleep(vfs_, 1), 0);
  double days = 0;
  sqlite3_int64 milliseconds = 0;
  EXPECT_EQ(vfs_->xCurrentTime(vfs_, &days), SQLITE_OK);
  EXPECT_EQ(vfs_->xCurrentTimeInt64(vfs_, &milliseconds), SQLITE_OK);
  constexpr double kMillisecondsPerDay = 86400000;
  EXPECT_NEAR(days, static_cast<double>(milliseconds) / kMillisecondsPerDay, 1);
  vfs_->xGetLastError(vfs_, sizeof(text), text);
}

// A process that closes any descriptor of a file has lost its locks on it.
TEST_F(PlantedJournalTest, ASecondHandleDropsNoLockOfTheFirst) {
  const Database first = init();
  EXPECT_EQ(answer(first.get(), "BEGIN IMMEDIATE"), "");
  EXPECT_NE(init(), nullptr);
  if (fork() == 0) {
    const bool isLocked =
        answer(openPlainly(kStatusDatabase).get(), "BEGIN IMMEDIATE") == "database is locked";
    _exit(isLocked ? EXIT_SUCCESS : EXIT_FAILURE);
  }
  EXPECT_EQ(waitForChildRuns(), std::vector<int>{0});
}

}  // namespace
}  // namespace support
