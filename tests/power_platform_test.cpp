// What the platform does for the power schedule: the stored lists, the alarm of the real-time
// clock, the lines of the crontab.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <random>

#include "failing_calls.h"
#include "fake_clock.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "zelocore.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr int kOutOfMemory = 0x0200;
constexpr int kOpen = 0x0900;
constexpr int kIo = 0x0B00;
constexpr int kBadArgument = 0x0D00;
constexpr int kRename = 0x2800;
constexpr int kSystem = 0x2A00;
constexpr int kMalformed = 0x4000;

constexpr char kFile[] = "/tmp/power_platform_test.txt";

long filesIn(const char *directory) {
  return std::distance(std::filesystem::directory_iterator(directory), {});
}

testing::AssertionResult failedWith(int result, int code) {
  if (result == -1 && errorRecord().code == code) return testing::AssertionSuccess();
  return testing::AssertionFailure() << "result " << result << ", record " << errorRecord();
}

class PlatformTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    haveClock();
    std::filesystem::remove_all(kFile);
  }
};

// ---- one line of a file

class SetLineTest : public PlatformTest {
 protected:
  static int set(const char *key, const char *value = nullptr) {
    return QLIBCFileSetLine(kFile, key, value, 0);
  }
};

TEST_F(SetLineTest, OneLineThatHoldsTheKeyIsRemovedAtATime) {
  writeFile(kFile, "a\nkey 1\nb\n2 key\nc\n");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(readFile(kFile), "a\nb\n2 key\nc\n");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(readFile(kFile), "a\nb\nc\n");
  EXPECT_EQ(set("key"), 0);
  EXPECT_EQ(readFile(kFile), "a\nb\nc\n");
  EXPECT_EQ(errorRecord().code, 0);
}

TEST_F(SetLineTest, TheFirstAndTheLastLineAreRemovedWhole) {
  writeFile(kFile, "key\nb\nkey");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(readFile(kFile), "b\nkey");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(readFile(kFile), "b\n");
}

TEST_F(SetLineTest, AFileOfTheWorkingDirectoryIsNamedWithoutIt) {
  writeFile(kFile, "a\nkey 1\n");
  const std::filesystem::path before = std::filesystem::current_path();
  const std::filesystem::path file(kFile);
  std::filesystem::current_path(file.parent_path());
  const int result = QLIBCFileSetLine(file.filename().c_str(), "key", "key 2", 0);
  std::filesystem::current_path(before);
  EXPECT_EQ(result, 1);
  EXPECT_EQ(readFile(kFile), "a\nkey 2\n");
}

TEST_F(SetLineTest, OtherLinesStayByteForByte) {
  const std::string before("\r\n\n\0x\xff\t\n", 8);
  writeFile(kFile, before + "key\nlast without its end");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(readFile(kFile), before + "last without its end");
}

TEST_F(SetLineTest, AValueTakesThePlaceOfTheFirstLineThatHoldsTheKey) {
  writeFile(kFile, "a\nkey 1\nkey 2\n");
  EXPECT_EQ(set("key", "new"), 1);
  EXPECT_EQ(readFile(kFile), "a\nnew\nkey 2\n");
}

TEST_F(SetLineTest, AValueWithoutALineToReplaceIsAppended) {
  writeFile(kFile, "a");
  EXPECT_EQ(set("key", "key=1"), 1);
  EXPECT_EQ(readFile(kFile), "a\nkey=1\n");
  writeFile(kFile, "");
  EXPECT_EQ(set("key", "key=1"), 1);
  EXPECT_EQ(readFile(kFile), "key=1\n");
}

TEST_F(SetLineTest, AFileThatIsNotThereHoldsNoLineAndIsNotMade) {
  EXPECT_EQ(set("key"), 0);
  EXPECT_TRUE(failedWith(set("key", "key=1"), kOpen));
  EXPECT_FALSE(fileExists(kFile));
}

TEST_F(SetLineTest, OwnerAndModeAreKept) {
  writeFile(kFile, "key\n", 0640);
  const bool others = otherUsersExist();
  if (others) {
    ASSERT_EQ(chown(kFile, 1234, 4321), 0);
  }
  EXPECT_EQ(set("key"), 1);
  struct stat status = {};
  ASSERT_EQ(stat(kFile, &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0640U);
  EXPECT_EQ(status.st_uid, others ? 1234U : 0U);
  EXPECT_EQ(status.st_gid, others ? 4321U : 0U);
}

// A change of the owner clears such bits.
TEST_F(SetLineTest, TheBitsOfTheModeOutliveTheOwner) {
  if (!otherUsersExist()) GTEST_SKIP() << "needs other users";
  writeFile(kFile, "key\n");
  ASSERT_EQ(chown(kFile, 1234, 4321), 0);
  ASSERT_EQ(chmod(kFile, 06755), 0);
  EXPECT_EQ(set("key"), 1);
  struct stat status = {};
  ASSERT_EQ(stat(kFile, &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 06755U);
  EXPECT_EQ(status.st_uid, 1234U);
}

TEST_F(SetLineTest, ADirectoryThatCannotBeSyncedIsAFailureWithTheNewFileInPlace) {
  writeFile(kFile, "a\nkey\n");
  failCall("fsync", {.from = 2, .error = EIO});
  EXPECT_TRUE(failedWith(set("key"), kIo));
  EXPECT_EQ(readFile(kFile), "a\n");
}

TEST_F(SetLineTest, TheChangeIsOnTheDiskBeforeTheFileTakesItsName) {
  writeFile(kFile, "key\n");
  EXPECT_EQ(set("key"), 1);
  EXPECT_EQ(callCount("fsync"), 2U) << "of the file and of its directory";
  writeFile(kFile, "key\n");
  resetFailingCalls();
  failCall("rename", {.error = EXDEV});
  EXPECT_TRUE(failedWith(set("key"), kRename));
  EXPECT_EQ(callCount("fsync"), 1U);
}

TEST_F(SetLineTest, AFailureLeavesTheFileAsItWasAndNoTemporary) {
  struct Failure {
    const char *call;
    int code;
  };
  for (const Failure &failure :
       {Failure{"write", kIo}, Failure{"fsync", kIo}, Failure{"fchmod", kIo},
        Failure{"rename", kRename}, Failure{"read", kIo}, Failure{"fstat", kIo}}) {
    SCOPED_TRACE(failure.call);
    writeFile(kFile, "key\nother\n");
    const auto files = filesIn("/tmp");
    failCall(failure.call, {.error = EIO});
    EXPECT_TRUE(failedWith(set("key"), failure.code));
    EXPECT_EQ(readFile(kFile), "key\nother\n");
    EXPECT_EQ(filesIn("/tmp"), files);
    resetFailingCalls();
  }
}

TEST_F(SetLineTest, LinksAndWhatIsNoFileAreRefused) {
  writeFile("/tmp/power_platform_test.target", "key\n");
  std::filesystem::create_symlink("/tmp/power_platform_test.target", kFile);
  EXPECT_TRUE(failedWith(set("key"), kOpen));
  EXPECT_EQ(readFile("/tmp/power_platform_test.target"), "key\n");
  std::filesystem::remove(kFile);
  std::filesystem::create_directory(kFile);
  EXPECT_TRUE(failedWith(set("key"), kOpen));
}

TEST_F(SetLineTest, BadArgumentsAreRefused) {
  writeFile(kFile, "key\n");
  EXPECT_TRUE(failedWith(QLIBCFileSetLine(nullptr, "key", nullptr, 0), kBadArgument));
  EXPECT_TRUE(failedWith(set(nullptr), kBadArgument));
  EXPECT_TRUE(failedWith(set(""), kBadArgument));
  EXPECT_TRUE(failedWith(set("a\nb"), kBadArgument));
  EXPECT_TRUE(failedWith(set("key", "a\nb"), kBadArgument));
  EXPECT_TRUE(failedWith(QLIBCFileSetLine(kFile, "key", nullptr, 1), kBadArgument));
  EXPECT_EQ(readFile(kFile), "key\n");
}

// ---- the lists

class PowerConfTest : public PlatformTest {};

TEST_F(PowerConfTest, BothListsAreEmptyBeforeAnythingIsStored) {
  EXPECT_EQ(powerList(kOn), Entries{});
  EXPECT_EQ(powerList(kOff), Entries{});
  EXPECT_EQ(errorRecord().code, 0);
}

TEST_F(PowerConfTest, AListReadsBackInItsOrderAndLeavesTheOtherAlone) {
  const Entries on = {{1, 127, 7, 30}, {0, 0, 0, 0}, {1, 1, 23, 59}};
  const Entries off = {{1, 64, 22, 0}};
  setPowerList(kOn, on);
  setPowerList(kOff, off);
  EXPECT_EQ(powerList(kOn), on);
  EXPECT_EQ(powerList(kOff), off);
  setPowerList(kOn, {});
  EXPECT_EQ(powerList(kOn), Entries{});
  EXPECT_EQ(powerList(kOff), off);
}

Entries differentEntries(unsigned char count) {
  Entries entries;
  for (unsigned char i = 0; i < count; ++i) {
    entries.push_back(
        {1, 127, static_cast<unsigned char>(i / 60), static_cast<unsigned char>(i % 60)});
  }
  return entries;
}

TEST_F(PowerConfTest, AListMayBeLongerThanWhatIsAskedFor) {
  const Entries many = differentEntries(100);
  setPowerList(kOn, many);
  Entries some(50);
  EXPECT_EQ(ZELOAutoPowerConfGet(kOn, 50, some.data()), 50);
  EXPECT_TRUE(std::equal(some.begin(), some.end(), many.begin()));
  EXPECT_EQ(powerList(kOn), many);
  EXPECT_EQ(ZELOAutoPowerConfGet(kOn, 0, some.data()), 0);
}

// Who reads a list has room for as many.
TEST_F(PowerConfTest, AListOfMoreThanAHundredEntriesIsRefusedAndNothingIsStored) {
  const Entries full = differentEntries(100);
  setPowerList(kOn, full);
  const std::string before = readFile(kPowerSchedule);
  const Entries many = differentEntries(101);
  for (const int list : {kOn, kOff}) {
    QLIBCErrSetEx(0, "", 0);
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(list, 101, many.data()), kBadArgument));
  }
  EXPECT_EQ(readFile(kPowerSchedule), before);
}

TEST_F(PowerConfTest, TheFileIsASectionFileForPeopleToReadAndWrite) {
  setPowerList(kOff, {{1, 62, 22, 15}, {0, 65, 23, 0}});
  EXPECT_NE(readFile(kPowerSchedule).find("[poweroff]\ntimes=\"1 62 22 15; 0 65 23 0\"\n"),
            std::string::npos);
  writeFile(kPowerSchedule, "; mine\n[poweron]\ntimes=1 127 7 30;0 1\t2 3 ;\n[other]\nx=y\n");
  EXPECT_EQ(powerList(kOn), (Entries{{1, 127, 7, 30}, {0, 1, 2, 3}}));
  setPowerList(kOff, {{1, 1, 1, 1}});
  EXPECT_EQ(powerList(kOn), (Entries{{1, 127, 7, 30}, {0, 1, 2, 3}}));
  EXPECT_NE(readFile(kPowerSchedule).find("[other]\nx=y\n"), std::string::npos);
}

TEST_F(PowerConfTest, AFileWithSomethingElseThanPowerTimesIsAFailure) {
  Entry entry{};
  for (const char *times : {"x", "1", "1 127 7", "1 127 7 30 5", "2 127 7 30", "1 128 7 30",
                            "1 127 24 30", "1 127 7 60", "1 127 7 300", "-1 127 7 30", "1,127,7,30",
                            "1 127 7 30 1 127 7 30", ";", "1 127 7 30;;1 127 7 30"}) {
    SCOPED_TRACE(times);
    QLIBCErrSetEx(0, "", 0);
    writeFile(kPowerSchedule, std::string("[poweron]\ntimes=\"") + times + "\"\n");
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOn, 1, &entry), kMalformed));
    EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kMalformed));
    EXPECT_EQ(ZELOAutoPowerConfGet(kOff, 1, &entry), 0);
  }
}

TEST_F(PowerConfTest, AListWhoseLineWasDamagedIsAFailureAndIsNotWrittenOver) {
  for (const char *text : {"[poweroff]\ntimes=\"1 127 22 15\n", "[poweroff]\n",
                           "[poweroff]\n[poweroff]\ntimes=\"1 127 22 15\"\n"}) {
    SCOPED_TRACE(text);
    writeFile(kPowerSchedule, text);
    Entry entry = {};
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOff, 1, &entry), kMalformed));
    EXPECT_EQ(ZELOAutoPowerConfGet(kOn, 1, &entry), 0);
  }
}

TEST_F(PowerConfTest, AFileCutOffIsAFailureAndIsNotBuiltUpon) {
  setPowerList(kOn, {{1, 127, 7, 30}});
  const std::string whole = readFile(kPowerSchedule);
  const std::string torn = whole.substr(0, whole.size() - 10);
  writeFile(kPowerSchedule, torn);
  Entry entry{};
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOn, 1, &entry), kIo));
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, 1, &entry), kIo));
  EXPECT_EQ(readFile(kPowerSchedule), torn);
}

TEST_F(PowerConfTest, BadArgumentsAreRefusedAndNothingIsStored) {
  const Entry good{1, 127, 7, 30};
  Entry entry{};
  for (const int list : {-1, 2}) {
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(list, 1, &entry), kBadArgument));
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(list, 1, &good), kBadArgument));
  }
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOn, -1, &entry), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOn, 1, nullptr), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, -1, &good), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, 1, nullptr), kBadArgument));
  for (const Entry &bad :
       {Entry{2, 127, 7, 30}, Entry{1, 128, 7, 30}, Entry{1, 127, 24, 30}, Entry{1, 127, 7, 60}}) {
    const Entries entries = {good, bad};
    EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, 2, entries.data()), kBadArgument));
  }
  EXPECT_FALSE(fileExists(kPowerSchedule));
}

TEST_F(PowerConfTest, ADirectoryThatIsNotThereIsAFailure) {
  std::filesystem::rename("/usr/zelo/etc", "/usr/zelo/away");
  const Entry entry{1, 127, 7, 30};
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, 1, &entry), kOpen));
  std::filesystem::rename("/usr/zelo/away", "/usr/zelo/etc");
}

TEST_F(PowerConfTest, MemoryThatRunsShortIsAFailure) {
  setPowerList(kOn, {{1, 127, 7, 30}});
  const Entry entry{1, 127, 7, 30};
  Entry read{};
  failCall("QLIBCSzHashAlloc", {.times = kAlways, .code = kOutOfMemory});
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfSet(kOn, 1, &entry), kOutOfMemory));
  QLIBCErrSetEx(0, "", 0);
  EXPECT_TRUE(failedWith(ZELOAutoPowerConfGet(kOn, 1, &read), kOutOfMemory));
}

TEST_F(PowerConfTest, AListIsOnTheDiskWhenItIsStored) {
  setPowerList(kOn, {{1, 127, 7, 30}});
  EXPECT_EQ(callCount("fsync"), 2U) << "of a new file and of its directory";
  setPowerList(kOn, {});
  EXPECT_EQ(callCount("fsync"), 4U) << "of one that replaces another";
}

TEST_F(PowerConfTest, AFailureWhileStoringLeavesTheOldLists) {
  const Entries old = {{1, 127, 7, 30}};
  setPowerList(kOn, old);
  for (const char *call : {"write", "fsync", "fchmod", "rename"}) {
    SCOPED_TRACE(call);
    failCall(call, {.error = EIO});
    EXPECT_EQ(ZELOAutoPowerConfSet(kOn, 0, nullptr), -1);
    resetFailingCalls();
    EXPECT_EQ(powerList(kOn), old);
  }
  EXPECT_EQ(filesIn("/usr/zelo/etc"), 1);
}

// A writer is killed at whatever point it has come to while somebody reads.
TEST_F(PowerConfTest, AWriterThatIsKilledLeavesTheOldOrTheNewList) {
  constexpr int kWriters = 60;
  constexpr int kReads = 7;
  const Entries few = {{1, 127, 7, 30}};
  const Entries many(100, {0, 1, 23, 59});
  setPowerList(kOff, few);
  setPowerList(kOn, few);
  for (int i = 0; i < kWriters; ++i) {
    const pid_t writer = fork();
    ASSERT_GE(writer, 0);
    if (writer == 0) {
      for (;;) {
        ZELOAutoPowerConfSet(kOn, static_cast<int>(many.size()), many.data());
        ZELOAutoPowerConfSet(kOn, static_cast<int>(few.size()), few.data());
      }
    }
    for (int read = 0; read < kReads + i; ++read) {
      const Entries seen = powerList(kOn);
      EXPECT_TRUE(seen == few || seen == many);
    }
    ASSERT_EQ(kill(writer, SIGKILL), 0);
    ASSERT_EQ(waitpid(writer, nullptr, 0), writer);
    const Entries left = powerList(kOn);
    EXPECT_TRUE(left == few || left == many);
    EXPECT_EQ(powerList(kOff), few);
  }
  std::filesystem::remove_all("/usr/zelo/etc");
  std::filesystem::create_directory("/usr/zelo/etc");
}

// ---- the alarm

constexpr unsigned char kSaturdays = 64;

class PoweronSetTest : public PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    setClock("2013-05-07 08:30");  // a Tuesday
  }

  // What stands in the alarm file for these entries, as UTC.
  static std::string armed(const Entries &entries) {
    setPowerList(kOn, entries);
    EXPECT_EQ(ZELOAutoPoweronSet(), 0);
    const std::string text = alarm();
    if (text.empty() || text == "0\n") return "none";
    const time_t moment = std::stoll(text);
    tm utc = {};
    gmtime_r(&moment, &utc);
    char shown[32];
    strftime(shown, sizeof(shown), "%Y-%m-%d %H:%M:%S", &utc);
    EXPECT_EQ(text, std::to_string(moment) + "\n");
    return shown;
  }
};

TEST_F(PoweronSetTest, TheNextTimeOfTheDayIsArmed) {
  EXPECT_EQ(armed({{1, 127, 8, 31}}), "2013-05-07 08:31:00");
  EXPECT_EQ(armed({{1, 127, 7, 30}}), "2013-05-08 07:30:00");
}

TEST_F(PoweronSetTest, ATimeOfThisVeryMinuteIsOver) {
  EXPECT_EQ(armed({{1, 127, 8, 30}}), "2013-05-08 08:30:00");
}

TEST_F(PoweronSetTest, TheWeekdayMaskCounts) {
  EXPECT_EQ(armed({{1, 1, 8, 0}}), "2013-05-12 08:00:00") << "Sunday";
  EXPECT_EQ(armed({{1, 64, 8, 0}}), "2013-05-11 08:00:00") << "Saturday";
  EXPECT_EQ(armed({{1, 4, 8, 31}}), "2013-05-07 08:31:00") << "Tuesday, ahead";
  EXPECT_EQ(armed({{1, 4, 8, 29}}), "2013-05-14 08:29:00") << "Tuesday, over";
}

TEST_F(PoweronSetTest, OfSeveralEntriesTheFirstToComeIsArmed) {
  EXPECT_EQ(armed({{1, 127, 23, 0}, {1, 4, 9, 0}, {1, 127, 12, 0}}), "2013-05-07 09:00:00");
  EXPECT_EQ(armed({{1, 8, 1, 0}, {1, 127, 2, 0}}), "2013-05-08 01:00:00");
}

TEST_F(PoweronSetTest, DisabledEntriesAndEntriesWithoutAWeekdayNeverCome) {
  EXPECT_EQ(armed({{0, 127, 9, 0}, {1, 0, 10, 0}}), "none");
  EXPECT_EQ(armed({{0, 127, 9, 0}, {1, 127, 12, 0}}), "2013-05-07 12:00:00");
}

TEST_F(PoweronSetTest, TimesAreLocal) {
  setZone("Asia/Tokyo");
  setClock("2013-05-07 08:30");
  EXPECT_EQ(armed({{1, 127, 9, 0}}), "2013-05-07 00:00:00");
  EXPECT_EQ(armed({{1, 2, 9, 0}}), "2013-05-13 00:00:00") << "Monday";
}

TEST_F(PoweronSetTest, ATimeAfterTheChangeToSummerTimeIsArmedInSummerTime) {
  setZone("Europe/Berlin");
  setClock("2013-03-30 20:00");
  EXPECT_EQ(armed({{1, 127, 7, 30}}), "2013-03-31 05:30:00");
}

TEST_F(PoweronSetTest, ATimeAfterTheChangeToStandardTimeIsArmedInStandardTime) {
  setZone("Europe/Berlin");
  setClock("2013-10-26 20:00");
  EXPECT_EQ(armed({{1, 127, 7, 30}}), "2013-10-27 06:30:00");
}

TEST_F(PoweronSetTest, ATimeThatIsSkippedComesByTheSkippedHourLater) {
  setZone("Europe/Berlin");
  setClock("2013-03-31 01:00");
  EXPECT_EQ(armed({{1, 127, 2, 30}}), "2013-03-31 01:30:00") << "03:30 in summer time";
  setClock("2013-03-31 03:45");
  EXPECT_EQ(armed({{1, 127, 2, 30}}), "2013-04-01 00:30:00");
}

TEST_F(PoweronSetTest, ATimeThatComesTwiceComesTheFirstTime) {
  setZone("Europe/Berlin");
  setClock("2013-10-27 00:00");
  EXPECT_EQ(armed({{1, 127, 2, 30}}), "2013-10-27 00:30:00");
  setClock(localTime("2013-10-27 00:00") + 3 * 3600);  // 02:00 for the second time
  EXPECT_EQ(armed({{1, 127, 2, 30}}), "2013-10-28 01:30:00");
}

TEST_F(PoweronSetTest, AZoneWithItsSummerTimeInWinterIsServed) {
  setZone("Europe/Dublin");
  setClock("2013-03-31 00:30");
  EXPECT_EQ(armed({{1, 127, 1, 30}}), "2013-03-31 01:30:00") << "02:30 in summer time";
  setClock("2013-10-26 20:00");
  EXPECT_EQ(armed({{1, 127, 1, 30}}), "2013-10-27 00:30:00");
}

TEST_F(PoweronSetTest, AWeekdayThatTheCalendarSkipsComesAWeekLater) {
  setZone("Pacific/Apia");  // where Friday, 30 December 2011 never was
  setClock("2011-12-29 12:00");
  EXPECT_EQ(armed({{1, 32, 9, 0}}), "2012-01-05 19:00:00");
}

// The first minute after now that shows the time, found by looking at each.
time_t nextByLooking(const Entries &entries, time_t now) {
  constexpr time_t kMinute = 60;
  constexpr time_t kEightDays = time_t{8} * 24 * 60 * kMinute;
  for (time_t moment = now - now % kMinute + kMinute; moment < now + kEightDays;
       moment += kMinute) {
    tm local = {};
    localtime_r(&moment, &local);
    for (const Entry &entry : entries) {
      if (entry.enabled == 1 && (entry.weekdays >> local.tm_wday & 1) != 0 &&
          entry.hour == local.tm_hour && entry.minute == local.tm_min) {
        return moment;
      }
    }
  }
  return 0;
}

// The hours in which clocks are changed have tests of their own.
TEST_F(PoweronSetTest, TheAlarmIsTheFirstMinuteThatShowsATimeOfTheList) {
  std::mt19937 random(61);
  const auto below = [&](unsigned limit) { return static_cast<unsigned char>(random() % limit); };
  for (const char *zone : {"UTC", "Europe/Berlin", "America/New_York", "Australia/Lord_Howe",
                           "Asia/Kolkata", "America/Santiago"}) {
    SCOPED_TRACE(zone);
    setZone(zone);
    for (int i = 0; i < 40; ++i) {
      const time_t now = 1357000000 + static_cast<time_t>(random() % 31536000);
      setClock(now);
      Entries entries(1 + random() % 4);
      for (Entry &entry : entries) {
        entry = {static_cast<unsigned char>(random() % 4 != 0), below(128),
                 static_cast<unsigned char>(4 + below(19)), below(60)};
      }
      setPowerList(kOn, entries);
      ASSERT_EQ(ZELOAutoPoweronSet(), 0);
      EXPECT_EQ(alarm(), std::to_string(nextByLooking(entries, now)) + "\n");
    }
  }
}

TEST_F(PoweronSetTest, AnArmedAlarmIsDisarmedBeforeItIsArmedAnew) {
  armed({{1, 127, 9, 0}});
  failCall("write", {.from = 2, .error = EBUSY});  // the file of the lists is not written here
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kIo));
  EXPECT_EQ(alarm(), "") << "the second write is to an emptied file";
}

TEST_F(PoweronSetTest, ItIsDisarmedByAZero) {
  armed({{1, 127, 9, 0}});
  failCallFor("open", kWakeAlarm, {.from = 2, .error = EBUSY});
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kOpen));
  EXPECT_EQ(alarm(), "0\n");
}

TEST_F(PoweronSetTest, AClockThatIsNotArmedIsNotWrittenTo) {
  for (const char *unarmed : {"", "0\n"}) {
    writeFile(kWakeAlarm, unarmed);
    setPowerList(kOn, {});
    failCall("write", {.times = kAlways, .error = EROFS});
    EXPECT_EQ(ZELOAutoPoweronSet(), 0);
    EXPECT_EQ(alarm(), unarmed);
    resetFailingCalls();
  }
}

TEST_F(PoweronSetTest, AnArmedClockThatCannotBeDisarmedIsAFailure) {
  armed({{1, 127, 9, 0}});
  setPowerList(kOn, {});
  failCall("write", {.error = EIO});
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kIo));
}

TEST_F(PoweronSetTest, ATimeSkippedBeforeMidnightComesAfterIt) {
  setZone("<-02>2<-01>,M3.5.0/-1,M10.5.0/0");  // on Saturday from 23:00 to Sunday 00:00
  setClock("2025-03-29 20:00");
  EXPECT_EQ(armed({{1, kSaturdays, 23, 30}}), "2025-03-30 01:30:00");
  setClock("2025-03-30 00:10");
  EXPECT_EQ(armed({{1, kSaturdays, 23, 30}}), "2025-03-30 01:30:00") << "20 minutes from now";
  setClock("2025-03-30 00:40");
  EXPECT_EQ(armed({{1, kSaturdays, 23, 30}}), "2025-04-06 00:30:00");
}

TEST_F(PoweronSetTest, TheClockIsArmedAfter2038) {
  setZone("UTC");
  setClock("2038-01-19 03:14");  // the last minute that 32 bits can tell
  EXPECT_EQ(armed({{1, 127, 3, 15}}), "2038-01-19 03:15:00");
  EXPECT_EQ(alarm(), "2147483700\n");
  setClock("2106-02-07 06:00");  // and with 32 bits without a sign
  EXPECT_EQ(armed({{1, 127, 6, 30}}), "2106-02-07 06:30:00");
  EXPECT_EQ(alarm(), "4294967400\n");
}

TEST_F(PoweronSetTest, AZoneThatWasChangedSinceTheStartCounts) {
  EXPECT_EQ(armed({{1, 127, 9, 0}}), "2013-05-07 09:00:00");
  ASSERT_EQ(setenv("TZ", "XXX-1", 1), 0);  // and no call that takes it over
  EXPECT_EQ(armed({{1, 127, 10, 0}}), "2013-05-07 09:00:00");
}

TEST_F(PoweronSetTest, AListWithoutATimeDisarmsTheClock) {
  EXPECT_NE(armed({{1, 127, 9, 0}}), "none");
  EXPECT_EQ(armed({}), "none");
}

TEST_F(PoweronSetTest, WithoutAClockThereIsNothingToDisarm) {
  haveNoClock();
  EXPECT_EQ(ZELOAutoPoweronSet(), 0);
  setPowerList(kOn, {{0, 127, 9, 0}});
  EXPECT_EQ(ZELOAutoPoweronSet(), 0);
  EXPECT_EQ(errorRecord().code, 0);
  EXPECT_FALSE(fileExists(kWakeAlarm));
}

TEST_F(PoweronSetTest, ATimeThatIsWantedWithoutAClockIsAFailure) {
  haveNoClock();
  setPowerList(kOn, {{1, 127, 9, 0}});
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kOpen));
  EXPECT_EQ(errorRecord().file, "power_on.cpp");
  EXPECT_FALSE(fileExists(kWakeAlarm)) << "none is made";
}

TEST_F(PoweronSetTest, ATimeThatTheKernelRefusesIsAFailure) {
  setPowerList(kOn, {{1, 127, 9, 0}});
  failCall("write", {.error = EINVAL});
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kIo));
}

TEST_F(PoweronSetTest, AnUnknownLocalTimeIsAFailure) {
  setPowerList(kOn, {{1, 127, 9, 0}});
  failCall("localtime_r", {.error = EOVERFLOW});
  EXPECT_TRUE(failedWith(ZELOAutoPoweronSet(), kSystem));
}

// ---- crontab entries

class ScheduleSetTest : public PlatformTest {
 protected:
  static ZELO_SCHEDULE schedule(int32_t weekdays, int32_t hour, int32_t minute,
                                const std::string &command = "/bin/true") {
    ZELO_SCHEDULE made = {};
    made.weekdays = weekdays;
    made.hour = made.lastHour = hour;
    made.minute = minute;
    std::strncpy(made.szCommand, command.c_str(), sizeof(made.szCommand) - 1);
    return made;
  }
  static int set(const ZELO_SCHEDULE &given) { return ZELOScheduleSet(&given, 1); }
};

TEST_F(ScheduleSetTest, AScheduleIsALineAtTheEndOfTheCrontab) {
  EXPECT_EQ(set(schedule(62, 22, 5)), 0);
  EXPECT_EQ(set(schedule(65, 0, 59, "/bin/echo 'a b'")), 0);
  EXPECT_EQ(readFile(kCrontab), std::string(kPlainCrontab) +
                                    "5\t22\t*\t*\t1,2,3,4,5\troot\t/bin/true\n"
                                    "59\t0\t*\t*\t0,6\troot\t/bin/echo 'a b'\n");
}

TEST_F(ScheduleSetTest, EveryDayIsAStar) {
  EXPECT_EQ(set(schedule(127, 23, 0)), 0);
  EXPECT_EQ(crontabLines(), Lines{"0\t23\t*\t*\t*\troot\t/bin/true"});
}

TEST_F(ScheduleSetTest, AScheduleWithoutAWeekdayGetsNoLine) {
  EXPECT_EQ(set(schedule(0, 23, 0)), 0);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

TEST_F(ScheduleSetTest, AScheduleThatIsNotEnabledGetsNoLine) {
  const ZELO_SCHEDULE made = schedule(127, 23, 0);
  EXPECT_EQ(ZELOScheduleSet(&made, 0), 0);
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

TEST_F(ScheduleSetTest, ACrontabWithoutALastLineFeedIsNotJoinedTo) {
  writeFile(kCrontab, "SHELL=/bin/sh");
  EXPECT_EQ(set(schedule(1, 1, 1)), 0);
  EXPECT_EQ(readFile(kCrontab), "SHELL=/bin/sh\n1\t1\t*\t*\t0\troot\t/bin/true\n");
}

TEST_F(ScheduleSetTest, WithoutACrontabNoneIsMade) {
  std::filesystem::remove(kCrontab);
  EXPECT_TRUE(failedWith(set(schedule(1, 1, 1)), kOpen));
  EXPECT_FALSE(fileExists(kCrontab));
}

TEST_F(ScheduleSetTest, OwnerAndModeOfTheCrontabAreKeptAndItIsOnTheDisk) {
  std::filesystem::permissions(kCrontab, std::filesystem::perms(0600));
  EXPECT_EQ(set(schedule(1, 1, 1)), 0);
  struct stat status = {};
  ASSERT_EQ(stat(kCrontab, &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0600U);
  EXPECT_EQ(callCount("fsync"), 2U);
}

TEST_F(ScheduleSetTest, RecordsOutOfTheirRangesAreRefused) {
  const auto changed = [](auto change) {
    ZELO_SCHEDULE made = schedule(127, 1, 1);
    change(&made);
    return made;
  };
  const ZELO_SCHEDULE bad[] = {
      changed([](ZELO_SCHEDULE *s) { s->weekdays = 128; }),
      changed([](ZELO_SCHEDULE *s) { s->weekdays = -1; }),
      changed([](ZELO_SCHEDULE *s) { s->hour = 24; }),
      changed([](ZELO_SCHEDULE *s) { s->hour = -1; }),
      changed([](ZELO_SCHEDULE *s) { s->repeat = 1; }),
      changed([](ZELO_SCHEDULE *s) { s->lastHour = 24; }),
      changed([](ZELO_SCHEDULE *s) { s->minute = 60; }),
      changed([](ZELO_SCHEDULE *s) { s->minute = -1; }),
      changed([](ZELO_SCHEDULE *s) { s->reserved = 1; }),
      changed([](ZELO_SCHEDULE *s) { s->szCommand[0] = '\0'; }),
      changed([](ZELO_SCHEDULE *s) { std::strcpy(s->szCommand, "a\n* * * * * root b"); }),
      changed([](ZELO_SCHEDULE *s) { std::strcpy(s->szCommand, "date +%s"); }),
      changed([](ZELO_SCHEDULE *s) { std::memset(s->szCommand, 'a', sizeof(s->szCommand)); }),
  };
  for (const ZELO_SCHEDULE &given : bad) {
    SCOPED_TRACE(&given - bad);
    QLIBCErrSetEx(0, "", 0);
    EXPECT_TRUE(failedWith(set(given), kBadArgument));
  }
  const ZELO_SCHEDULE good = schedule(127, 1, 1);
  EXPECT_TRUE(failedWith(ZELOScheduleSet(&good, 2), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOScheduleSet(nullptr, 1), kBadArgument));
  EXPECT_EQ(readFile(kCrontab), kPlainCrontab);
}

// ---- the daemon

class UpdateCrontabTest : public PlatformTest {
 protected:
  static int update() { return ZELOUpdateCrontab("/bin/true", 0, 1); }
};

TEST_F(UpdateCrontabTest, TheDaemonOfThePidFileGetsAHangUpSignal) {
  const pid_t daemon = fork();
  ASSERT_GE(daemon, 0);
  if (daemon == 0) {
    for (;;) pause();
  }
  writeFile(kCronPidFile, std::to_string(daemon) + "\n");
  EXPECT_EQ(ZELOUpdateCrontab("/bin/true", 0, 0), 0);
  EXPECT_EQ(waitpid(daemon, nullptr, WNOHANG), 0) << "a reload was not asked for";
  EXPECT_EQ(update(), 0);
  int status = 0;
  ASSERT_EQ(waitpid(daemon, &status, 0), daemon);
  EXPECT_TRUE(WIFSIGNALED(status));
  EXPECT_EQ(WTERMSIG(status), SIGHUP);
  EXPECT_EQ(update(), 0) << "it is gone now";
}

TEST_F(UpdateCrontabTest, ADaemonThatCannotBeSignalledIsAFailure) {
  writeFile(kCronPidFile, std::to_string(getpid()) + "\n");
  failCall("kill", {.times = kAlways, .error = EPERM});
  EXPECT_TRUE(failedWith(update(), kSystem));
  EXPECT_EQ(errorRecord().file, "crontab.cpp");
  resetFailingCalls();
  failCall("kill", {.times = kAlways, .error = ESRCH});
  EXPECT_EQ(update(), 0) << "it ended meanwhile";
}

TEST_F(UpdateCrontabTest, WithoutADaemonThereIsNothingToDo) {
  EXPECT_EQ(update(), 0);
  EXPECT_EQ(errorRecord().code, 0);
}

TEST_F(UpdateCrontabTest, ANumberThatIsNoSingleProcessIsNotSignalled) {
  struct sigaction ignored = {};
  struct sigaction former = {};
  ignored.sa_handler = [](int) { ADD_FAILURE() << "the test itself was signalled"; };
  ASSERT_EQ(sigaction(SIGHUP, &ignored, &former), 0);
  for (const char *text : {"", "0\n", "-1\n", "1\n", "x\n", "99999999999999999999\n"}) {
    SCOPED_TRACE(text);
    writeFile(kCronPidFile, text);
    EXPECT_EQ(update(), 0);
  }
  ASSERT_EQ(sigaction(SIGHUP, &former, nullptr), 0);
}

TEST_F(UpdateCrontabTest, APidFileThatCannotBeReadIsAFailure) {
  writeFile(kCronPidFile, "2\n");
  failCall("read", {.error = EIO});
  EXPECT_TRUE(failedWith(update(), kIo));
}

TEST_F(UpdateCrontabTest, BadArgumentsAreRefused) {
  EXPECT_TRUE(failedWith(ZELOUpdateCrontab(nullptr, 0, 1), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOUpdateCrontab("/bin/true", 1, 1), kBadArgument));
  EXPECT_TRUE(failedWith(ZELOUpdateCrontab("/bin/true", 0, 2), kBadArgument));
}

}  // namespace
}  // namespace support
