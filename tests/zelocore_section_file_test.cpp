// Section files, in a directory of the test's own. The program defines some calls of the C library,
// which win over the real ones for the library under test too: to stand still in time, to go on
// with a copy while a reader pauses, and to fail.
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sched.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>
#include <zelocore.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <map>
#include <optional>
#include <random>
#include <sstream>
#include <string>
#include <vector>

namespace {

struct Calls {
  std::function<void(int)> on_pause; /* with the number of the pause, from 1 */
  std::function<void()> on_read;     /* after the read */
  bool real_pauses = false;
  int pauses = 0;
  int reads = 0;
  std::optional<timespec> now;
  std::optional<timespec> stamp; /* what every file is stamped with */
  std::optional<off_t> size;     /* that every file seems to have */
  int interruptions = 0;         /* of reads and writes, one after the other */
  int fail_rename = 0;
  int fail_write = 0;
  int fail_read = 0;
  int fail_fchmod = 0;
  int fail_fchown = 0;
};
Calls g_calls;

template <typename Function>
Function *Real(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

void Stamp(struct stat *status) {
  if (g_calls.stamp) {
    status->st_ctim = status->st_mtim = *g_calls.stamp;
  }
  status->st_size = g_calls.size.value_or(status->st_size);
}

bool IsInterrupted() {
  if (g_calls.interruptions == 0) {
    return false;
  }
  --g_calls.interruptions;
  errno = EINTR;
  return true;
}

bool Fails(int error) {
  errno = error;
  return error != 0;
}

}  // namespace

#pragma GCC visibility push(default)
extern "C" {

int nanosleep(const timespec *pause, timespec *left) {
  static auto *const real = Real<int(const timespec *, timespec *)>("nanosleep");
  ++g_calls.pauses;
  if (g_calls.real_pauses) {
    return real(pause, left);
  }
  if (g_calls.on_pause) {
    g_calls.on_pause(g_calls.pauses);
  }
  return 0;
}

int clock_gettime(clockid_t clock, timespec *time) noexcept {
  static auto *const real = Real<int(clockid_t, timespec *)>("clock_gettime");
  if (g_calls.now && (clock == CLOCK_REALTIME || clock == CLOCK_REALTIME_COARSE)) {
    *time = *g_calls.now;
    return 0;
  }
  return real(clock, time);
}

int stat(const char *path, struct stat *status) noexcept {
  static auto *const real = Real<int(const char *, struct stat *)>("stat");
  const int result = real(path, status);
  Stamp(status);
  return result;
}

int fstat(int fd, struct stat *status) noexcept {
  static auto *const real = Real<int(int, struct stat *)>("fstat");
  const int result = real(fd, status);
  Stamp(status);
  return result;
}

ssize_t read(int fd, void *buffer, size_t size) {
  static auto *const real = Real<ssize_t(int, void *, size_t)>("read");
  if (IsInterrupted() || Fails(g_calls.fail_read)) {
    return -1;
  }
  ++g_calls.reads;
  const ssize_t count = real(fd, buffer, size);
  if (g_calls.on_read) {
    g_calls.on_read();
  }
  return count;
}

ssize_t write(int fd, const void *buffer, size_t size) {
  static auto *const real = Real<ssize_t(int, const void *, size_t)>("write");
  return IsInterrupted() || Fails(g_calls.fail_write) ? -1 : real(fd, buffer, size);
}

int rename(const char *from, const char *to) noexcept {
  static auto *const real = Real<int(const char *, const char *)>("rename");
  return Fails(g_calls.fail_rename) ? -1 : real(from, to);
}

int fchmod(int fd, mode_t mode) noexcept {
  static auto *const real = Real<int(int, mode_t)>("fchmod");
  return Fails(g_calls.fail_fchmod) ? -1 : real(fd, mode);
}

int fchown(int fd, uid_t uid, gid_t gid) noexcept {
  static auto *const real = Real<int(int, uid_t, gid_t)>("fchown");
  return Fails(g_calls.fail_fchown) ? -1 : real(fd, uid, gid);
}
}
#pragma GCC visibility pop

namespace {

using std::string_literals::operator""s;
using Texts = std::vector<std::string>;
using Keys = std::map<std::string, std::string>;

constexpr char kHeader[] = "# zelo section file\n";

class ZelocoreSectionFile : public testing::Test {
 protected:
  void SetUp() override {
    char name[] = "/tmp/zelo-section-XXXXXX";
    ASSERT_NE(mkdtemp(name), nullptr);
    directory_ = name;
    path_ = directory_ + "/store";
    g_calls = {};
    QLIBCErrSetEx(0, "", 0);
  }
  void TearDown() override {
    g_calls = {};
    EXPECT_EQ(system(("rm -rf " + directory_).c_str()), 0);
  }

  void Write(const std::string &contents) { WriteTo(path_, contents); }
  static void WriteTo(const std::string &path, const std::string &contents) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << contents;
  }
  std::string Contents() const {
    std::ifstream file(path_, std::ios::binary);
    std::ostringstream text;
    text << file.rdbuf();
    return text.str();
  }
  /* What stands between header and trailer. */
  std::string Body() const {
    const std::string text = Contents();
    const size_t trailer = text.rfind("# end of file: ");
    if (!text.starts_with(kHeader) || trailer == std::string::npos) {
      return "(not sealed) " + text;
    }
    return text.substr(sizeof kHeader - 1, trailer - (sizeof kHeader - 1));
  }
  Texts Names(int *result = nullptr) const {
    PSZLIST list = QLIBCSzListAlloc(1);
    const int count = QLIBCFileEnumSection(path_.c_str(), &list);
    Texts names;
    for (int i = 0; i < QLIBCSzListCount(list); ++i) {
      names.emplace_back(QLIBCSzListGet(list, i));
    }
    QLIBCSzListFree(list);
    EXPECT_EQ(count < 0 ? 0U : static_cast<size_t>(count), names.size());
    if (result != nullptr) {
      *result = count;
    }
    return names;
  }
  int Enumerate() const {
    int result = 0;
    Names(&result);
    return result;
  }
  int Get(const std::string &section, Keys *keys = nullptr) const {
    PSZHASH hash = QLIBCSzHashAlloc(1);
    const int result = QLIBCFileGetSection(path_.c_str(), section.c_str(), &hash);
    if (keys != nullptr) {
      *keys = KeysOf(hash);
    }
    QLIBCSzHashFree(hash);
    return result;
  }
  Keys Section(const std::string &section) const {
    Keys keys;
    EXPECT_EQ(Get(section, &keys), 1) << section;
    return keys;
  }
  static Keys KeysOf(PSZHASH hash) {
    Keys keys;
    PSZLIST list = QLIBCSzListAlloc(1);
    QLIBCSzHashEnumKey(hash, &list);
    for (int i = 0; i < QLIBCSzListCount(list); ++i) {
      keys[QLIBCSzListGet(list, i)] = QLIBCSzHashGetValue(hash, QLIBCSzListGet(list, i));
    }
    QLIBCSzListFree(list);
    return keys;
  }
  static PSZHASH HashOf(const Keys &keys) {
    PSZHASH hash = QLIBCSzHashAlloc(1);
    for (const auto &[key, value] : keys) {
      QLIBCSzHashSetValue(&hash, key.c_str(), value.c_str());
    }
    return hash;
  }
  int Set(const std::string &section, const Keys &keys) const {
    PSZHASH hash = HashOf(keys);
    const int result = QLIBCFileSetSection(path_.c_str(), section.c_str(), 0, hash, 0);
    QLIBCSzHashFree(hash);
    return result;
  }
  int Add(const std::string &section, const Keys &keys) const {
    PSZHASH hash = HashOf(keys);
    const int result = QLIBCFileAddSection(path_.c_str(), section.c_str(), hash, 0);
    QLIBCSzHashFree(hash);
    return result;
  }
  int Remove(const std::string &section) const {
    return QLIBCFileRemoveSection(path_.c_str(), section.c_str());
  }
  /* Temporaries that were left, in truth any file but the store. */
  Texts Others() const {
    Texts names;
    DIR *directory = opendir(directory_.c_str());
    while (const dirent *entry = readdir(directory)) {
      if (entry->d_name[0] != '.' && std::string(entry->d_name) != "store") {
        names.emplace_back(entry->d_name);
      }
    }
    closedir(directory);
    return names;
  }
  static bool FailedWith(int result, int code) {
    const bool as_expected = result == -1 && QLIBCErrGet() == code;
    EXPECT_EQ(QLIBCErrGet(), code);
    QLIBCErrSetEx(0, "", 0);
    return as_expected;
  }
  static size_t HeapInUse() {
    const struct mallinfo2 info = mallinfo2();
    return info.uordblks + info.hblkhd;
  }
  /* In a user namespace root is alone. */
  bool GiveAway() const { return chown(path_.c_str(), 12, 34) == 0; }
  void MakeOld() {
    timespec now;
    g_calls.now.reset();
    clock_gettime(CLOCK_REALTIME, &now);
    now.tv_sec += 3600;
    g_calls.now = now;
  }

  std::string directory_;
  std::string path_;
};

/* ---- reading ---- */

TEST_F(ZelocoreSectionFile, AFileWrittenByHandIsRead) {
  Write(
      "; tasks\n"
      "[7]\n"
      "name=\"quoted \\\"name\\\"\"\n"
      "  run hour =  8 \n"
      "# a remark\n"
      "\n"
      "no equals sign\n"
      "cmd=C:\\new = it\n"
      "empty=\n"
      "  [ 8 ] # the other\n"
      "name='x'\n");
  EXPECT_EQ(Names(), (Texts{"7", "8"}));
  EXPECT_EQ(
      Section("7"),
      (Keys{
          {"name", "quoted \"name\""}, {"run hour", "8"}, {"cmd", "C:\\new = it"}, {"empty", ""}}));
  EXPECT_EQ(Section("8"), (Keys{{"name", "'x'"}}));
  EXPECT_EQ(Get("9"), 0);
  EXPECT_EQ(QLIBCErrGet(), 0);
  EXPECT_EQ(g_calls.pauses, 0) << "a file without the header is taken at once";
}

TEST_F(ZelocoreSectionFile, CarriageReturnsAtLineEndsAreNotPartOfTexts) {
  Write("[1]\r\na=\"x\"\r\nb=y\r\n[2]\r\na=\"z\"");
  EXPECT_EQ(Names(), (Texts{"1", "2"}));
  EXPECT_EQ(Section("1"), (Keys{{"a", "x"}, {"b", "y"}}));
  EXPECT_EQ(Section("2"), (Keys{{"a", "z"}}));
}

TEST_F(ZelocoreSectionFile, TheLastOfEqualKeysAndTheFirstOfEqualSectionsCount) {
  Write("[1]\na=\"x\"\na=\"y\"\n[1]\na=\"z\"\n");
  EXPECT_EQ(Names(), (Texts{"1", "1"}));
  EXPECT_EQ(Section("1"), (Keys{{"a", "y"}}));
}

TEST_F(ZelocoreSectionFile, MalformedLinesAreIgnored) {
  Write(
      "outside=1\n[]\n[open\n[5]x\n[a]b]\n[a]]\n[1]\n=\"no key\"\na=\"not closed\na=\"ends within "
      "\\\nb=\"x\" "
      "rest\n"
      "[c=\"d\"\n");
  EXPECT_EQ(Names(), (Texts{"1"}));
  EXPECT_EQ(Section("1"), (Keys{{"b", "x"}}));
}

TEST_F(ZelocoreSectionFile, AQuoteInATextEndsIt) {
  Write("[1]\na=\"x\"y\"\nb=\"z\"\n");
  EXPECT_EQ(Section("1"), (Keys{{"a", "x"}, {"b", "z"}}));
}

TEST_F(ZelocoreSectionFile, ALineOfQuotesIsIgnored) {
  Write("[1]\n\"\"\"\"\"\"\na=\"b\"\n");
  EXPECT_EQ(Section("1"), (Keys{{"a", "b"}}));
}

TEST_F(ZelocoreSectionFile, UnknownEscapesStandAsTheyAre) {
  Write("[1]\na=\"\\d\\x4\\xg1\\x00\\x41\\\"\n");
  EXPECT_EQ(Get("1"), 1);
  Write("[1]\na=\"\\d\\x4\\xg1\\x00\\x41\"\n");
  EXPECT_EQ(Section("1"), (Keys{{"a",
                                 "\\d\\x4\\xg1\\x00"
                                 "A"}}));
}

TEST_F(ZelocoreSectionFile, AZeroByteEndsItsText) {
  Write("[1]\na=\"x\0y\"\nb\0c=\"z\"\n"s);
  EXPECT_EQ(Section("1"), (Keys{{"a", "x"}, {"b", "z"}}));
}

TEST_F(ZelocoreSectionFile, WhatIsBehindAZeroByteIsNotWrittenBack) {
  Write("[1]\na=\"x\0y\"\nb\0c=\"z\"\n"s);
  PSZHASH hash = QLIBCSzHashAlloc(1);
  EXPECT_EQ(QLIBCFileGetSection(path_.c_str(), "1", &hash), 1);
  EXPECT_EQ(QLIBCFileSetSection(path_.c_str(), "1", 0, hash, 0), 1);
  QLIBCSzHashFree(hash);
  EXPECT_EQ(Body(), "[1]\na=\"x\"\nb=\"z\"\n");
}

TEST_F(ZelocoreSectionFile, ALargeSectionTakesNoMoreThanTwiceItsMemory) {
  constexpr size_t kSize = 1 << 20;
  Write("[1]\na=\"" + std::string(kSize, 'x') + "\"\n");
  EXPECT_EQ(Names(), Texts{"1"});
  PSZHASH hash = QLIBCSzHashAlloc(1);
  const size_t before = HeapInUse();
  EXPECT_EQ(QLIBCFileGetSection(path_.c_str(), "1", &hash), 1);
  EXPECT_LT(HeapInUse() - before, 2 * kSize + kSize / 2);
  QLIBCSzHashFree(hash);
}

TEST_F(ZelocoreSectionFile, AZeroByteEndsTheNameOfASection) {
  Write("[1\0x]\na=b\n[\0]\nc=d\n"s);
  EXPECT_EQ(Names(), Texts{"1"});
  EXPECT_EQ(Section("1"), (Keys{{"a", "b"}, {"c", "d"}}));
}

TEST_F(ZelocoreSectionFile, SectionsAreFoundInWhateverOrderTheyAreAskedFor) {
  Write("[1]\na=\"1\"\n[2]\na=\"2\"\n[2]\na=\"another\"\n[3]\na=\"3\"\n");
  MakeOld();
  for (const char *order : {"123", "321", "2213", "1222", "12232", "33", "4142", "44"}) {
    Write(Contents());
    for (const char *name = order; *name != '\0'; ++name) {
      SCOPED_TRACE(std::string(order) + " at " + *name);
      const std::string section(1, *name);
      if (section == "4") {
        EXPECT_EQ(Get(section), 0);
      } else {
        EXPECT_EQ(Section(section), (Keys{{"a", section}}));
      }
    }
  }
}

/* A hash that has served for other sections, the same keys among them, reads what a new one does.
 */
TEST_F(ZelocoreSectionFile, WhatAHashHeldBeforeDoesNotShow) {
  const std::vector<std::string> lines = {
      "a=\"one\"",      "b=\"\"",     "a=\"another, and longer than the first\"",
      "b=\"x\\ny\"",    " a=\"z\"",   "c = unquoted ",
      "d=\"not closed", "e=\"x\"y\"", "# f=\"a remark\"",
      "\"=\"x\"",       "=\"x\"",     "g=\"" + std::string(300, 'g') + "\"",
      "a=b=\"x\"",      "",           "h=\"\r\""};
  std::mt19937 random(4711);
  std::string text;
  constexpr int kSections = 500;
  for (int i = 0; i < kSections; ++i) {
    text += "[" + std::to_string(i) + "]\n";
    for (unsigned line = random() % 8; line > 0; --line) {
      text += lines[random() % lines.size()] + "\n";
    }
  }
  text.pop_back();
  Write(text);
  PSZHASH used = HashOf({{"a=b", "set"}, {"# f", "set"}, {"\"", "set"}});
  for (int i = 0; i < kSections; ++i) {
    const std::string name = std::to_string(i);
    QLIBCHashRemoveAll(used);
    ASSERT_EQ(QLIBCFileGetSection(path_.c_str(), name.c_str(), &used), 1);
    ASSERT_EQ(KeysOf(used), Section(name)) << text;
  }
  QLIBCSzHashFree(used);
}

TEST_F(ZelocoreSectionFile, OneHashServesForSectionsOfAllLengthsAndKeys) {
  PSZHASH used = HashOf({});
  constexpr size_t kAboveWhatIsTaken = 70000;
  for (size_t size = 1; size < kAboveWhatIsTaken; size += size < 3000 ? 37 : 9973) {
    const std::string number = std::to_string(size);
    const std::string half(size / 2, 'x');
    Write("[1]\n" + number + "a=\"" + half + "\"\n" + number + "b=\"" + half + "y\"\n" + number +
          "a=\"" + half + "z\"\n");
    QLIBCHashRemoveAll(used);
    ASSERT_EQ(QLIBCFileGetSection(path_.c_str(), "1", &used), 1);
    ASSERT_EQ(KeysOf(used), (Keys{{number + "a", half + "z"}, {number + "b", half + "y"}}));
  }
  QLIBCSzHashFree(used);
}

TEST_F(ZelocoreSectionFile, AFileThatGrewSinceItWasLookedAtIsReadToItsEnd) {
  const std::string value(20000, 'v');
  Write("[1]\na=\"" + value + "\"\n[2]\nb=\"end\"");
  g_calls.size = 3;
  EXPECT_EQ(Section("1"), (Keys{{"a", value}}));
  EXPECT_EQ(Section("2"), (Keys{{"b", "end"}}));
}

TEST_F(ZelocoreSectionFile, ReadingAddsToWhatTheHashHolds) {
  Write("[1]\na=\"x\"\n");
  PSZHASH hash = HashOf({{"a", "old"}, {"b", "kept"}});
  EXPECT_EQ(QLIBCFileGetSection(path_.c_str(), "1", &hash), 1);
  EXPECT_EQ(KeysOf(hash), (Keys{{"a", "x"}, {"b", "kept"}}));
  QLIBCSzHashFree(hash);
}

/* ---- writing ---- */

TEST_F(ZelocoreSectionFile, AnyTextReadsBackUnchanged) {
  std::string bytes;
  for (int byte = 1; byte < 256; ++byte) {
    bytes.push_back(static_cast<char>(byte));
  }
  const Keys keys{{"all", bytes},
                  {"run hour", ""},
                  {"blank edges", "  x  "},
                  {"like a section", "[2]\n[3]"},
                  {"like a trailer", "\n# end of file: 1 sections, checksum 0123456789abcdef\n"},
                  {"end", "\\"},
                  {"\xff\"\\", "\xff\xfe"}};
  ASSERT_EQ(Add("1", keys), 1);
  EXPECT_EQ(Section("1"), keys);
  EXPECT_EQ(Names(), (Texts{"1"}));
  ASSERT_EQ(Set("1", keys), 1);
  EXPECT_EQ(Section("1"), keys);
}

TEST_F(ZelocoreSectionFile, EqualContentMakesEqualFiles) {
  ASSERT_EQ(Add("1", {{"b", "2"}, {"a", "1"}}), 1);
  EXPECT_EQ(Body(), "[1]\na=\"1\"\nb=\"2\"\n");
  const std::string before = Contents();
  ASSERT_EQ(Set("1", {{"a", "1"}, {"b", "2"}}), 1);
  EXPECT_EQ(Contents(), before);
}

TEST_F(ZelocoreSectionFile, SettingKeepsEveryOtherLine) {
  Write(
      "; first of all\n\n[1]\r\na = kept as it is\r\n# inside\n[2]\nold=\"x\"\n# about 3\n[3]\nz");
  ASSERT_EQ(Set("2", {{"new", "y"}}), 1);
  EXPECT_EQ(Body(),
            "; first of all\n\n[1]\r\na = kept as it is\r\n# inside\n[2]\nnew=\"y\"\n"
            "# about 3\n[3]\nz\n");
  EXPECT_EQ(Names(), (Texts{"1", "2", "3"}));
}

TEST_F(ZelocoreSectionFile, AFileOfManyPartsIsPutTogetherWhole) {
  Write(
      "# zelo section file\n[0]\nq=1\n[1]\na=\"x\"\n# about the next\n"
      "# end of file: 2 sections, checksum 0123456789abcdef\n[2]\nb=\"y\"");
  ASSERT_EQ(Set("1", {{"a", "z"}}), 1);
  EXPECT_EQ(Body(), "[0]\nq=1\n[1]\na=\"z\"\n# about the next\n[2]\nb=\"y\"\n");
  EXPECT_NE(Contents().find("# end of file: 3 sections, checksum "), std::string::npos);
  EXPECT_EQ(Names(), (Texts{"0", "1", "2"}));
  EXPECT_EQ(g_calls.pauses, 0) << "its checksum is right";
}

TEST_F(ZelocoreSectionFile, OfEqualSectionsOnlyTheFirstIsChanged) {
  Write("[1]\na=\"x\"\n[1]\na=\"y\"\n");
  ASSERT_EQ(Set("1", {{"a", "z"}}), 1);
  EXPECT_EQ(Body(), "[1]\na=\"z\"\n[1]\na=\"y\"\n");
  ASSERT_EQ(Remove("1"), 1);
  EXPECT_EQ(Body(), "[1]\na=\"y\"\n");
}

TEST_F(ZelocoreSectionFile, SectionsComeAndGo) {
  ASSERT_EQ(QLIBCFileTouch(path_.c_str()), 0);
  ASSERT_EQ(Set("1", {{"a", "x"}}), 0);
  ASSERT_EQ(Contents(), "") << "nothing is written for a section that is not there";
  ASSERT_EQ(Add("1", {{"a", "x"}}), 1);
  ASSERT_EQ(Add("2", {}), 1);
  ASSERT_EQ(Add("3", {{"a", "z"}}), 1);
  EXPECT_EQ(Names(), (Texts{"1", "2", "3"}));
  EXPECT_EQ(Section("2"), Keys{});
  ASSERT_EQ(Remove("2"), 1);
  ASSERT_EQ(Remove("2"), 0);
  EXPECT_EQ(Names(), (Texts{"1", "3"}));
  ASSERT_EQ(Remove("1"), 1);
  ASSERT_EQ(Remove("3"), 1);
  EXPECT_EQ(Body(), "");
  EXPECT_EQ(Enumerate(), 0);
}

TEST_F(ZelocoreSectionFile, AFileWithoutLastLineFeedTakesAnotherSection) {
  Write("[1]\na=\"x\"");
  ASSERT_EQ(Add("2", {{"b", "y"}}), 1);
  EXPECT_EQ(Body(), "[1]\na=\"x\"\n[2]\nb=\"y\"\n");
}

TEST_F(ZelocoreSectionFile, TheTrailerIsMadeAnewByEveryWrite) {
  ASSERT_EQ(Add("1", {}), 1);
  EXPECT_NE(Contents().find("# end of file: 1 sections, checksum "), std::string::npos);
  Write(Contents() + "[by hand]\n");
  ASSERT_EQ(Add("2", {}), 1);
  EXPECT_EQ(Body(), "[1]\n[by hand]\n[2]\n");
  EXPECT_NE(Contents().find("# end of file: 3 sections, checksum "), std::string::npos);
}

TEST_F(ZelocoreSectionFile, ASectionThatExistsIsNotAddedAgain) {
  ASSERT_EQ(Add("1", {{"a", "x"}}), 1);
  const std::string before = Contents();
  EXPECT_TRUE(FailedWith(Add("1", {{"a", "y"}}), QLIBC_ERR_BAD_PARAMETER));
  EXPECT_EQ(Contents(), before);
}

TEST_F(ZelocoreSectionFile, NamesThatCannotBeReadBackAreRefused) {
  for (const char *name : {"", "a]b", "a\nb", " a", "a ", "a\tb", "\x7f"}) {
    EXPECT_TRUE(FailedWith(Add(name, {}), QLIBC_ERR_BAD_PARAMETER)) << name;
  }
  EXPECT_EQ(QLIBCFileExist(path_.c_str()), 0);
  EXPECT_EQ(Add("a[b # \"c\" ü", {{"k", "v"}}), 1);
  EXPECT_EQ(Section("a[b # \"c\" ü"), (Keys{{"k", "v"}}));
}

TEST_F(ZelocoreSectionFile, KeysThatCannotBeReadBackAreRefused) {
  ASSERT_EQ(Add("1", {}), 1);
  for (const char *key : {"", "a=b", "a\nb", " a", "a ", "#a", ";a", "[a", "\x01"}) {
    EXPECT_TRUE(FailedWith(Add("2", {{key, "v"}}), QLIBC_ERR_BAD_PARAMETER)) << key;
    EXPECT_TRUE(FailedWith(Set("1", {{key, "v"}}), QLIBC_ERR_BAD_PARAMETER)) << key;
  }
  EXPECT_EQ(Body(), "[1]\n");
}

TEST_F(ZelocoreSectionFile, OwnerAndModeOutliveAWrite) {
  Write("[1]\n");
  ASSERT_EQ(chmod(path_.c_str(), 0640), 0);
  const bool given_away = GiveAway();
  struct stat before;
  ASSERT_EQ(stat(path_.c_str(), &before), 0);
  ASSERT_EQ(Set("1", {{"a", "x"}}), 1);
  struct stat after;
  ASSERT_EQ(stat(path_.c_str(), &after), 0);
  EXPECT_EQ(after.st_mode, before.st_mode);
  EXPECT_EQ(after.st_uid, before.st_uid);
  EXPECT_EQ(after.st_gid, before.st_gid);
  EXPECT_EQ(after.st_uid == 12, given_away);
}

TEST_F(ZelocoreSectionFile, ANewFileIsWritableByItsOwnerOnly) {
  const mode_t mask = umask(0);
  ASSERT_EQ(Add("1", {}), 1);
  ASSERT_EQ(QLIBCFileTouch((directory_ + "/touched").c_str()), 0);
  umask(mask);
  struct stat status;
  ASSERT_EQ(stat(path_.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0644U);
  ASSERT_EQ(stat((directory_ + "/touched").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0644U);
}

/* ---- failures ---- */

TEST_F(ZelocoreSectionFile, AMissingFileFailsAllButAdding) {
  EXPECT_TRUE(FailedWith(Enumerate(), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(Get("1"), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(Set("1", {}), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(Remove("1"), QLIBC_ERR_OPEN));
  EXPECT_EQ(Add("1", {}), 1);
}

TEST_F(ZelocoreSectionFile, WhatIsNoRegularFileIsRefused) {
  const auto all_fail = [&] {
    return FailedWith(Enumerate(), QLIBC_ERR_OPEN) && FailedWith(Get("1"), QLIBC_ERR_OPEN) &&
           FailedWith(Set("1", {}), QLIBC_ERR_OPEN) && FailedWith(Add("1", {}), QLIBC_ERR_OPEN) &&
           FailedWith(Remove("1"), QLIBC_ERR_OPEN) &&
           FailedWith(QLIBCFileTouch(path_.c_str()), QLIBC_ERR_OPEN);
  };
  ASSERT_EQ(mkdir(path_.c_str(), 0700), 0);
  EXPECT_TRUE(all_fail());
  ASSERT_EQ(rmdir(path_.c_str()), 0);
  ASSERT_EQ(mkfifo(path_.c_str(), 0600), 0);
  EXPECT_TRUE(all_fail()) << "and a FIFO does not hang";
}

TEST_F(ZelocoreSectionFile, ALinkIsReadButNotReplaced) {
  const std::string target = directory_ + "/target";
  WriteTo(target, "[1]\na=\"x\"\n");
  ASSERT_EQ(symlink(target.c_str(), path_.c_str()), 0);
  EXPECT_EQ(Section("1"), (Keys{{"a", "x"}}));
  EXPECT_TRUE(FailedWith(Set("1", {}), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(Add("2", {}), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(Remove("1"), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(QLIBCFileTouch(path_.c_str()), QLIBC_ERR_OPEN));
}

TEST_F(ZelocoreSectionFile, AFileThatMayNotBeReadFails) {
  Write("[1]\n");
  ASSERT_EQ(chmod(path_.c_str(), 0600), 0);
  ASSERT_EQ(chmod(directory_.c_str(), 0755), 0);
  if (geteuid() != 0 || seteuid(65534) != 0) {
    GTEST_SKIP() << "needs root to become somebody else";
  }
  const bool failed = FailedWith(Enumerate(), QLIBC_ERR_OPEN) &&
                      FailedWith(Set("1", {}), QLIBC_ERR_OPEN) &&
                      FailedWith(QLIBCFileTouch(path_.c_str()), QLIBC_ERR_OPEN);
  ASSERT_EQ(seteuid(0), 0);
  EXPECT_TRUE(failed);
}

TEST_F(ZelocoreSectionFile, AFailedReadIsReported) {
  Write("[1]\n");
  g_calls.fail_read = EIO;
  const int enumerated = Enumerate();
  const int code = QLIBCErrGet();
  const int set = Set("1", {});
  g_calls.fail_read = 0;
  EXPECT_EQ(enumerated, -1);
  EXPECT_EQ(code, QLIBC_ERR_IO);
  EXPECT_TRUE(FailedWith(set, QLIBC_ERR_IO));
}

TEST_F(ZelocoreSectionFile, AnInterruptedReadGoesOn) {
  Write("[1]\n");
  g_calls.interruptions = 2;
  EXPECT_EQ(Names(), Texts{"1"});
  EXPECT_EQ(g_calls.interruptions, 0);
}

TEST_F(ZelocoreSectionFile, AnInterruptedWriteGoesOn) {
  g_calls.interruptions = 2; /* there is nothing to be read */
  EXPECT_EQ(Add("1", {{"a", "x"}}), 1);
  EXPECT_EQ(g_calls.interruptions, 0);
  EXPECT_EQ(Section("1"), (Keys{{"a", "x"}}));
}

TEST_F(ZelocoreSectionFile, AFailedWriteLeavesTheFileAndNoTemporary) {
  struct Failure {
    int Calls::*call;
    int error;
    int code;
  };
  Write("[1]\na=\"x\"\n");
  const std::string before = Contents();
  for (const Failure &failure : {Failure{&Calls::fail_write, ENOSPC, QLIBC_ERR_IO},
                                 Failure{&Calls::fail_fchmod, EPERM, QLIBC_ERR_IO},
                                 Failure{&Calls::fail_rename, EBUSY, QLIBC_ERR_RENAME}}) {
    g_calls.*failure.call = failure.error;
    const int set = Set("1", {{"a", "y"}});
    g_calls.*failure.call = 0;
    EXPECT_TRUE(FailedWith(set, failure.code));
    g_calls.*failure.call = failure.error;
    const int added = Add("2", {{"a", "y"}});
    g_calls.*failure.call = 0;
    EXPECT_TRUE(FailedWith(added, failure.code));
    g_calls.*failure.call = failure.error;
    const int removed = Remove("1");
    g_calls.*failure.call = 0;
    EXPECT_TRUE(FailedWith(removed, failure.code));
    EXPECT_EQ(Contents(), before);
    EXPECT_EQ(Others(), Texts{});
  }
}

TEST_F(ZelocoreSectionFile, AnOwnerThatCannotBeKeptFailsTheWrite) {
  Write("[1]\n");
  if (!GiveAway()) {
    GTEST_SKIP() << "needs root to give a file away";
  }
  g_calls.fail_fchown = EPERM;
  const int set = Set("1", {{"a", "y"}});
  g_calls.fail_fchown = 0;
  EXPECT_TRUE(FailedWith(set, QLIBC_ERR_IO));
  EXPECT_EQ(Contents(), "[1]\n");
  EXPECT_EQ(Others(), Texts{});
}

TEST_F(ZelocoreSectionFile, AFullDiskLeavesTheFileAndNoTemporary) {
  Write("[1]\na=\"x\"\n");
  const std::string before = Contents();
  rlimit limit;
  ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &limit), 0);
  const rlimit small{4096, limit.rlim_max};
  auto *const handler = signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
  const int set = Set("1", {{"a", std::string(100000, 'y')}});
  ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
  signal(SIGXFSZ, handler);
  EXPECT_TRUE(FailedWith(set, QLIBC_ERR_IO));
  EXPECT_EQ(Contents(), before);
  EXPECT_EQ(Others(), Texts{});
}

TEST_F(ZelocoreSectionFile, ADirectoryThatIsNotThereCannotBeWrittenTo) {
  path_ = directory_ + "/no/store";
  EXPECT_TRUE(FailedWith(Add("1", {}), QLIBC_ERR_OPEN));
  EXPECT_TRUE(FailedWith(QLIBCFileTouch(path_.c_str()), QLIBC_ERR_OPEN));
}

TEST_F(ZelocoreSectionFile, NullAndReservedArgumentsAreRefused) {
  PSZHASH hash = QLIBCSzHashAlloc(1);
  PSZLIST list = QLIBCSzListAlloc(1);
  PSZHASH no_hash = nullptr;
  PSZLIST no_list = nullptr;
  const char *path = path_.c_str();
  const int code = QLIBC_ERR_BAD_PARAMETER;
  EXPECT_TRUE(FailedWith(QLIBCFileEnumSection(nullptr, &list), code));
  EXPECT_TRUE(FailedWith(QLIBCFileEnumSection(path, nullptr), code));
  EXPECT_TRUE(FailedWith(QLIBCFileEnumSection(path, &no_list), code));
  EXPECT_TRUE(FailedWith(QLIBCFileGetSection(nullptr, "1", &hash), code));
  EXPECT_TRUE(FailedWith(QLIBCFileGetSection(path, nullptr, &hash), code));
  EXPECT_TRUE(FailedWith(QLIBCFileGetSection(path, "1", nullptr), code));
  EXPECT_TRUE(FailedWith(QLIBCFileGetSection(path, "1", &no_hash), code));
  EXPECT_TRUE(FailedWith(QLIBCFileSetSection(nullptr, "1", 0, hash, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileSetSection(path, nullptr, 0, hash, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileSetSection(path, "1", 0, nullptr, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileSetSection(path, "1", 2, hash, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileSetSection(path, "1", 0, hash, 1), code));
  EXPECT_TRUE(FailedWith(QLIBCFileAddSection(nullptr, "1", hash, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileAddSection(path, nullptr, hash, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileAddSection(path, "1", nullptr, 0), code));
  EXPECT_TRUE(FailedWith(QLIBCFileAddSection(path, "1", hash, 2), code));
  EXPECT_TRUE(FailedWith(QLIBCFileRemoveSection(nullptr, "1"), code));
  EXPECT_TRUE(FailedWith(QLIBCFileRemoveSection(path, nullptr), code));
  EXPECT_TRUE(FailedWith(QLIBCFileTouch(nullptr), code));
  EXPECT_EQ(QLIBCFileExist(nullptr), 0);
  QLIBCSzHashFree(hash);
  QLIBCSzListFree(list);
}

TEST_F(ZelocoreSectionFile, APathThatCannotBeLookedAtIsNotTakenForMissing) {
  EXPECT_EQ(QLIBCFileExist((path_ + "/below").c_str()), 0);
  Write("");
  EXPECT_EQ(QLIBCFileExist((path_ + "/below").c_str()), 0) << "a file has nothing below it";
  ASSERT_EQ(symlink("loop", (directory_ + "/loop").c_str()), 0);
  EXPECT_EQ(QLIBCFileExist((directory_ + "/loop").c_str()), 1);
  EXPECT_EQ(QLIBCFileExist(std::string(5000, 'x').c_str()), 1);
}

TEST_F(ZelocoreSectionFile, TouchingMakesAFileOrRenewsItsTimes) {
  EXPECT_EQ(QLIBCFileExist(path_.c_str()), 0);
  ASSERT_EQ(QLIBCFileTouch(path_.c_str()), 0);
  EXPECT_EQ(QLIBCFileExist(path_.c_str()), 1);
  EXPECT_EQ(QLIBCFileExist(directory_.c_str()), 1);
  Write("kept");
  const timespec old[2] = {{1000, 0}, {1000, 0}};
  ASSERT_EQ(utimensat(AT_FDCWD, path_.c_str(), old, 0), 0);
  ASSERT_EQ(QLIBCFileTouch(path_.c_str()), 0);
  struct stat status;
  ASSERT_EQ(stat(path_.c_str(), &status), 0);
  EXPECT_GT(status.st_mtim.tv_sec, 1000);
  EXPECT_EQ(Contents(), "kept");
}

/* ---- copies in progress ---- */

class ZelocoreTornSectionFile : public ZelocoreSectionFile {
 protected:
  void SetUp() override {
    ZelocoreSectionFile::SetUp();
    ASSERT_EQ(Add("1", {{"a", std::string(100, 'x')}}), 1);
    ASSERT_EQ(Add("2", {{"a", std::string(100, 'y')}}), 1);
    whole_ = Contents();
  }
  std::string whole_;
};

TEST_F(ZelocoreTornSectionFile, AReaderWaitsForTheRestFromEveryByteOn) {
  for (size_t size = 0; size + 1 < whole_.size(); ++size) {
    Write(whole_.substr(0, size));
    g_calls.pauses = 0;
    g_calls.on_pause = [&](int pause) {
      if (pause == 2) {
        Write(whole_);
      }
    };
    ASSERT_EQ(Names(), (Texts{"1", "2"})) << size;
    ASSERT_EQ(g_calls.pauses, 2) << size;
  }
}

TEST_F(ZelocoreTornSectionFile, AReaderWaitsOverAMixture) {
  std::string mixed = whole_;
  mixed[mixed.find('x')] = 'z';
  Write(mixed);
  g_calls.on_pause = [&](int) { Write(whole_); };
  EXPECT_EQ(Section("1"), (Keys{{"a", std::string(100, 'x')}}));
  EXPECT_EQ(g_calls.pauses, 1);
}

TEST_F(ZelocoreTornSectionFile, AFileThatChangesWhileItIsReadIsReadAgain) {
  Write("[1]\na=\"old\"\n");
  g_calls.on_read = [&] {
    g_calls.on_read = nullptr;
    Write("[1]\na=\"much newer\"\n");
  };
  EXPECT_EQ(Section("1"), (Keys{{"a", "much newer"}}));
  EXPECT_EQ(g_calls.pauses, 1);
}

TEST_F(ZelocoreTornSectionFile, WaitingEnds) {
  constexpr int kMostPauses = 1000;
  Write("");
  EXPECT_EQ(Enumerate(), 0);
  EXPECT_GT(g_calls.pauses, 1);
  EXPECT_LE(g_calls.pauses, kMostPauses);

  Write(whole_.substr(0, whole_.size() / 2));
  g_calls.pauses = 0;
  EXPECT_TRUE(FailedWith(Enumerate(), QLIBC_ERR_IO));
  EXPECT_LE(g_calls.pauses, kMostPauses);

  Write(whole_ + "[3]\nby=\"hand\"\n");
  g_calls.pauses = 0;
  EXPECT_EQ(Names(), (Texts{"1", "2", "3"}));
  EXPECT_LE(g_calls.pauses, kMostPauses);
}

/* Edited by hand, on every processor. */
TEST_F(ZelocoreTornSectionFile, ATrailerOfMoreSectionsThan32BitsCountIsOneThatDisagrees) {
  Write(
      "# zelo section file\n[1]\na=\"x\"\n# end of file: 4294967296 sections, checksum "
      "0123456789abcdef\n");
  MakeOld();
  EXPECT_EQ(Names(), Texts{"1"});
}

TEST_F(ZelocoreTornSectionFile, AnOldFileIsNotWaitedFor) {
  Write("");
  MakeOld();
  EXPECT_EQ(Enumerate(), 0);
  EXPECT_EQ(Get("1"), 0);

  Write(whole_.substr(0, whole_.size() / 2));
  EXPECT_TRUE(FailedWith(Enumerate(), QLIBC_ERR_IO));
  EXPECT_TRUE(FailedWith(Get("1"), QLIBC_ERR_IO));

  Write(whole_ + "[3]\nby=\"hand\"\n");
  EXPECT_EQ(Section("3"), (Keys{{"by", "hand"}}));
  EXPECT_EQ(g_calls.pauses, 0);
}

TEST_F(ZelocoreTornSectionFile, AFileFromTheFutureIsNotWaitedFor) {
  Write("");
  g_calls.now = timespec{1000000000, 0};
  EXPECT_EQ(Enumerate(), 0);
  EXPECT_EQ(g_calls.pauses, 0);
}

TEST_F(ZelocoreTornSectionFile, AWriterRefusesAFileCutOffAtOnce) {
  const std::string torn = whole_.substr(0, whole_.size() / 2);
  Write(torn);
  EXPECT_TRUE(FailedWith(Set("1", {}), QLIBC_ERR_IO));
  EXPECT_TRUE(FailedWith(Add("3", {}), QLIBC_ERR_IO));
  EXPECT_TRUE(FailedWith(Remove("1"), QLIBC_ERR_IO));
  EXPECT_EQ(Contents(), torn);
  EXPECT_EQ(g_calls.pauses, 0);
}

TEST_F(ZelocoreTornSectionFile, AWriterTakesAnEditedFileAndSealsIt) {
  Write(whole_ + "[3]\n");
  ASSERT_EQ(Remove("1"), 1);
  EXPECT_EQ(Names(), (Texts{"2", "3"}));
  EXPECT_EQ(g_calls.pauses, 0);
}

TEST_F(ZelocoreTornSectionFile, AFileWhoseLastLineFeedWasLostIsWhole) {
  Write(whole_.substr(0, whole_.size() - 1));
  EXPECT_EQ(Names(), (Texts{"1", "2"}));
  EXPECT_EQ(g_calls.pauses, 0);
}

/* Another process copies over the file again and again, truncating it and
 * writing it piece by piece; each version has the same value in all sections. */
TEST_F(ZelocoreTornSectionFile, AReaderSeesOneVersionWhileOthersCopyOver) {
  constexpr int kVersions = 100;
  constexpr int kSections = 40;
  constexpr size_t kPiece = 700;
  Texts versions;
  for (const char value : {'x', 'y'}) {
    unlink(path_.c_str());
    for (int i = 0; i < kSections; ++i) {
      ASSERT_EQ(Add(std::to_string(i), {{"a", std::string(100, value)}}), 1);
    }
    versions.push_back(Contents());
  }
  g_calls.real_pauses = true;
  const pid_t writer = fork();
  if (writer == 0) {
    for (int i = 0; i < kVersions; ++i) {
      const std::string &version = versions[static_cast<size_t>(i % 2)];
      const int fd = open(path_.c_str(), O_WRONLY | O_TRUNC);
      for (size_t at = 0; at < version.size(); at += kPiece) {
        if (write(fd, version.data() + at, std::min(kPiece, version.size() - at)) < 0) {
          _exit(1);
        }
        sched_yield();
      }
      close(fd);
      const timespec rest{0, 1'000'000};
      nanosleep(&rest, nullptr);
    }
    _exit(0);
  }
  int status = -1;
  int looks = 0;
  for (; waitpid(writer, &status, WNOHANG) == 0; ++looks) {
    ASSERT_EQ(Enumerate(), kSections);
    const std::string value = Section("7")["a"];
    ASSERT_TRUE(value == std::string(100, 'x') || value == std::string(100, 'y')) << value;
  }
  EXPECT_EQ(status, 0);
  EXPECT_GT(looks, 0);
}

/* ---- the index between calls ---- */

class ZelocoreSectionIndex : public ZelocoreSectionFile {
 protected:
  static constexpr time_t kStamp = 1'700'000'000;
  static constexpr long kTick = 4'000'000;

  /* The file as an index sees it: always stamped alike. */
  void StampAt(long nanoseconds) { g_calls.stamp = timespec{kStamp, nanoseconds}; }
  static void ClockAt(time_t seconds, long nanoseconds) {
    g_calls.now = timespec{seconds, nanoseconds};
  }
  /* In place, with the same size: only the contents tell them apart. */
  void Rewrite(char value) {
    const int fd = open(path_.c_str(), O_WRONLY | O_CREAT, 0600);
    const std::string text = std::string("[1]\na=\"") + value + "\"\n";
    ASSERT_EQ(pwrite(fd, text.data(), text.size(), 0), static_cast<ssize_t>(text.size()));
    close(fd);
  }
  std::string Value() { return Section("1")["a"]; }
};

TEST_F(ZelocoreSectionIndex, AFileThatStaysIsReadOnce) {
  Rewrite('x');
  StampAt(kTick);
  ClockAt(kStamp, 2 * kTick);
  EXPECT_EQ(Value(), "x");
  const int reads = g_calls.reads;
  for (int i = 0; i < 100; ++i) {
    ASSERT_EQ(Value(), "x");
    ASSERT_EQ(Enumerate(), 1);
  }
  EXPECT_EQ(g_calls.reads, reads);
}

TEST_F(ZelocoreSectionIndex, AChangeInTheTickOfTheLastOneIsSeen) {
  Rewrite('x');
  StampAt(kTick);
  ClockAt(kStamp, kTick);
  EXPECT_EQ(Value(), "x");
  Rewrite('y');
  EXPECT_EQ(Value(), "y");
  Rewrite('z');
  ClockAt(kStamp, 2 * kTick);
  EXPECT_EQ(Value(), "z") << "what was read in the tick is not trusted after it either";
}

TEST_F(ZelocoreSectionIndex, ASectionThatComesInTheTickIsFound) {
  Write("[2]\na=\"x\"\n");
  StampAt(kTick);
  ClockAt(kStamp, kTick);
  EXPECT_EQ(Get("1"), 0);
  Rewrite('y');
  EXPECT_EQ(Value(), "y");
  EXPECT_EQ(Get("2"), 0);
}

TEST_F(ZelocoreSectionIndex, NoFileStaysOpen) {
  Rewrite('x');
  StampAt(kTick);
  ClockAt(kStamp, kTick);
  const int open_before = open("/dev/null", O_RDONLY);
  close(open_before);
  EXPECT_EQ(Value(), "x");
  const int open_after = open("/dev/null", O_RDONLY);
  close(open_after);
  EXPECT_EQ(open_after, open_before);
}

TEST_F(ZelocoreSectionIndex, StampsOfWholeSecondsAreTrustedLater) {
  Rewrite('x');
  StampAt(0);
  ClockAt(kStamp + 1, 500'000'000);
  EXPECT_EQ(Value(), "x");
  Rewrite('y');
  EXPECT_EQ(Value(), "y");
  ClockAt(kStamp + 3, 0);
  EXPECT_EQ(Value(), "y");
  const int reads = g_calls.reads;
  EXPECT_EQ(Value(), "y");
  EXPECT_EQ(g_calls.reads, reads);
}

TEST_F(ZelocoreSectionIndex, AStampFarAheadDoesNotMakeEveryCallRead) {
  Rewrite('x');
  StampAt(kTick);
  ClockAt(kStamp - 3600, 0);
  EXPECT_EQ(Value(), "x");
  const int reads = g_calls.reads;
  ClockAt(kStamp - 1800, 0);
  EXPECT_EQ(Value(), "x");
  EXPECT_EQ(g_calls.reads, reads);
  ClockAt(kStamp, kTick);
  Rewrite('y');
  EXPECT_EQ(Value(), "y") << "the clock has reached the stamp, and a change could carry it";
}

TEST_F(ZelocoreSectionIndex, AClockSetBackMakesTheFileReadAgain) {
  Rewrite('x');
  StampAt(kTick);
  ClockAt(kStamp + 100, 0);
  EXPECT_EQ(Value(), "x");
  const int reads = g_calls.reads;
  ClockAt(kStamp + 50, 0);
  EXPECT_EQ(Value(), "x");
  EXPECT_GT(g_calls.reads, reads);
}

TEST_F(ZelocoreSectionIndex, AFileThatIsReplacedIsReadAgain) {
  Rewrite('x');
  EXPECT_EQ(Value(), "x");
  WriteTo(directory_ + "/new", "[1]\na=\"y\"\n");
  ASSERT_EQ(std::rename((directory_ + "/new").c_str(), path_.c_str()), 0);
  EXPECT_EQ(Value(), "y");
  ASSERT_EQ(unlink(path_.c_str()), 0);
  EXPECT_TRUE(FailedWith(Get("1"), QLIBC_ERR_OPEN));
  Rewrite('z');
  EXPECT_EQ(Value(), "z");
}

TEST_F(ZelocoreSectionIndex, TwoFilesAreNotMixedUp) {
  Rewrite('x');
  EXPECT_EQ(Value(), "x");
  const std::string first = path_;
  path_ = directory_ + "/other";
  Rewrite('y');
  EXPECT_EQ(Value(), "y");
  path_ = first;
  EXPECT_EQ(Value(), "x");
}

TEST_F(ZelocoreSectionIndex, WritingIsSeenByTheNextRead) {
  for (int i = 0; i < 200; ++i) {
    const Keys keys{{"a", std::to_string(i % 10)}};
    ASSERT_EQ(i == 0 ? Add("1", keys) : Set("1", keys), 1);
    ASSERT_EQ(Section("1"), keys);
  }
}

TEST_F(ZelocoreSectionIndex, ReadingManySectionsReadsTheFileOnce) {
  constexpr int kSections = 10000;
  std::string text;
  for (int i = 0; i < kSections; ++i) {
    text += "[" + std::to_string(i) + "]\nid=\"" + std::to_string(i) + "\"\n";
  }
  Write(text);
  MakeOld();
  const Texts names = Names();
  ASSERT_EQ(names.size(), static_cast<size_t>(kSections));
  const int reads = g_calls.reads;
  for (const std::string &name : names) {
    ASSERT_EQ(Section(name), (Keys{{"id", name}}));
  }
  EXPECT_EQ(g_calls.reads, reads);
}

}  // namespace
