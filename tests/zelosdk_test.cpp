// Users and Base64.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <pwd.h>
#include <zelocore.h>
#include <zelosdk.h>

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <random>
#include <string>
#include <vector>

namespace {

size_t g_least_room = 0;
int g_user_error = 0;
int g_interruptions = 0;

using LookUp = int(uid_t, passwd *, char *, size_t, passwd **);

}  // namespace

#pragma GCC visibility push(default)
extern "C" int getpwuid_r(uid_t uid, passwd *entry, char *texts, size_t room, passwd **found) {
  static auto *const real = reinterpret_cast<LookUp *>(dlsym(RTLD_NEXT, "getpwuid_r"));
  *found = nullptr;
  if (g_interruptions > 0) {
    --g_interruptions;
    return EINTR;
  }
  if (g_user_error != 0) {
    return g_user_error;
  }
  return room < g_least_room ? ERANGE : real(uid, entry, texts, room, found);
}

#if !defined(__SANITIZE_ADDRESS__)
namespace {
constexpr long kPlenty = -1;
long g_allocations_left = kPlenty;
}  // namespace

extern "C" void *__libc_malloc(size_t size);

extern "C" void *malloc(size_t size) noexcept {
  if (g_allocations_left == 0) {
    errno = ENOMEM;
    return nullptr;
  }
  if (g_allocations_left > 0) {
    --g_allocations_left;
  }
  return __libc_malloc(size);
}
#endif
#pragma GCC visibility pop

namespace {

class ZelosdkUser : public testing::Test {
 protected:
  void SetUp() override {
    QLIBCErrSetEx(0, "", 0);
    g_least_room = 0;
    g_user_error = 0;
    g_interruptions = 0;
  }
  void TearDown() override { SetUp(); }
};

TEST_F(ZelosdkUser, RootIsFound) {
  PZELOUSER user = nullptr;
  ASSERT_EQ(ZELOUserGetByUID(0, &user), 0);
  EXPECT_STREQ(user->szName, "root");
  EXPECT_EQ(user->uid, 0U);
  EXPECT_EQ(user->gid, 0U);
  EXPECT_STREQ(user->szHome, "/root");
  EXPECT_EQ(user->szShell[0], '/');
  EXPECT_EQ(QLIBCErrGet(), 0);
  ZELOUserFree(user);
  ZELOUserFree(nullptr);
}

TEST_F(ZelosdkUser, ALargeEntryIsReadWhole) {
  g_least_room = 100000;
  PZELOUSER user = nullptr;
  ASSERT_EQ(ZELOUserGetByUID(0, &user), 0);
  EXPECT_STREQ(user->szName, "root");
  ZELOUserFree(user);
}

TEST_F(ZelosdkUser, AnInterruptedLookUpGoesOn) {
  g_interruptions = 3;
  PZELOUSER user = nullptr;
  ASSERT_EQ(ZELOUserGetByUID(0, &user), 0);
  EXPECT_EQ(g_interruptions, 0);
  EXPECT_STREQ(user->szName, "root");
  ZELOUserFree(user);
}

#if !defined(__SANITIZE_ADDRESS__) /* which allocates itself */
TEST_F(ZelosdkUser, ShortMemoryIsReported) {
  ZELOUSER mine{};
  PZELOUSER user = &mine;
  long after = 0;
  for (; after < 100; ++after) {
    QLIBCErrSetEx(0, "", 0);
    g_allocations_left = after;
    const int result = ZELOUserGetByUID(0, &user);
    g_allocations_left = kPlenty;
    if (result == 0) {
      break;
    }
    EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_OUT_OF_MEMORY) << after;
    EXPECT_EQ(user, &mine);
  }
  EXPECT_GE(after, 2) << "the texts, and the record";
  EXPECT_STREQ(user->szName, "root");
  ZELOUserFree(user);
}
#endif

TEST_F(ZelosdkUser, FailuresLeaveTheResultAlone) {
  struct Failure {
    int error;
    int code;
  };
  ZELOUSER mine{};
  PZELOUSER user = &mine;
  EXPECT_EQ(ZELOUserGetByUID(4000000000U, &user), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_NOT_FOUND);
  for (const Failure &failure :
       {Failure{ENOENT, QLIBC_ERR_NOT_FOUND}, Failure{ENOMEM, QLIBC_ERR_OUT_OF_MEMORY},
        Failure{EIO, QLIBC_ERR_SYSTEM}, Failure{ERANGE, QLIBC_ERR_SYSTEM}}) {
    g_user_error = failure.error;
    EXPECT_EQ(ZELOUserGetByUID(0, &user), -1);
    EXPECT_EQ(QLIBCErrGet(), failure.code) << failure.error;
  }
  EXPECT_EQ(user, &mine);
  EXPECT_EQ(ZELOUserGetByUID(0, nullptr), -1);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
}

class ZelosdkBase64 : public testing::Test {
 protected:
  void SetUp() override { QLIBCErrSetEx(0, "", 0); }

  static std::string Encode(const std::string &source) {
    std::vector<char> out(source.size() * 2 + 8, '#');
    EXPECT_EQ(SzBase64EncodeFull(source.data(), source.size(), out.data(), out.size(), 1), 1);
    return out.data();
  }
  static std::string Decode(const std::string &text, int expected = 1) {
    std::vector<char> out(text.size() + 1);
    size_t size = out.size();
    EXPECT_EQ(ZELOEncodingBase64Decode(text.data(), text.size(), out.data(), &size), expected)
        << text;
    return expected == 1 ? std::string(out.data(), size) : "";
  }
};

TEST_F(ZelosdkBase64, KnownTextsAreEncodedAndDecoded) {
  const std::pair<const char *, const char *> known[] = {{"", ""},
                                                         {"f", "Zg=="},
                                                         {"fo", "Zm8="},
                                                         {"foo", "Zm9v"},
                                                         {"foob", "Zm9vYg=="},
                                                         {"fooba", "Zm9vYmE="},
                                                         {"foobar", "Zm9vYmFy"},
                                                         {"\xff\xfe", "//4="}};
  for (const auto &[plain, encoded] : known) {
    EXPECT_EQ(Encode(plain), encoded);
    EXPECT_EQ(Decode(encoded), plain);
  }
}

TEST_F(ZelosdkBase64, AnyBytesComeBack) {
  std::mt19937 random(64);
  for (size_t size = 0; size < 2000; size += 7) {
    std::string bytes;
    for (size_t i = 0; i < size; ++i) {
      bytes.push_back(static_cast<char>(random()));
    }
    ASSERT_EQ(Decode(Encode(bytes)), bytes);
  }
}

TEST_F(ZelosdkBase64, TheEncodedTextMustFitWithItsEnd) {
  char out[9];
  std::memset(out, '#', sizeof out);
  EXPECT_EQ(SzBase64EncodeFull("foobar", 6, out, 8, 1), 0);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  EXPECT_EQ(out[0], '#');
  EXPECT_EQ(SzBase64EncodeFull("foobar", 6, out, 9, 1), 1);
  EXPECT_STREQ(out, "Zm9vYmFy");
  EXPECT_EQ(SzBase64EncodeFull("f", static_cast<size_t>(-1), out, sizeof out, 1), 0);
}

TEST_F(ZelosdkBase64, TheDecodedBytesMustFit) {
  char out[8];
  std::memset(out, '#', sizeof out);
  size_t size = 5;
  EXPECT_EQ(ZELOEncodingBase64Decode("Zm9vYmFy", 8, out, &size), 0);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  EXPECT_EQ(size, 5U);
  EXPECT_EQ(out[5], '#');
  size = 6;
  EXPECT_EQ(ZELOEncodingBase64Decode("Zm9vYmFy", 8, out, &size), 1);
  EXPECT_EQ(size, 6U);
  EXPECT_EQ(std::string(out, 6), "foobar");
  EXPECT_EQ(out[6], '#') << "no terminating zero is written";
}

TEST_F(ZelosdkBase64, ATextMayEndWithinAGroup) {
  EXPECT_EQ(Decode("Zm9vYg"), "foob");
  EXPECT_EQ(Decode("Zm9vYmE"), "fooba");
  EXPECT_EQ(Decode("Zm9vY"), "foo");
  EXPECT_EQ(Decode("Z"), "");
}

TEST_F(ZelosdkBase64, WhiteSpaceIsSkipped) {
  EXPECT_EQ(Decode(" Zm9v\r\n\tYmFy\n"), "foobar");
}

TEST_F(ZelosdkBase64, OtherCharactersAreRefused) {
  for (const char *text : {"Zm9v!", "Zm9v-_", "Zg==Zg==", "\xff", "=="}) {
    QLIBCErrSetEx(0, "", 0);
    Decode(text, 0);
    EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  }
  Decode(std::string("Zm9v\0", 5), 0);
}

TEST_F(ZelosdkBase64, NullArgumentsAreRefused) {
  char out[8];
  size_t size = sizeof out;
  EXPECT_EQ(SzBase64EncodeFull(nullptr, 0, out, sizeof out, 1), 0);
  EXPECT_EQ(SzBase64EncodeFull("a", 1, nullptr, 8, 1), 0);
  EXPECT_EQ(ZELOEncodingBase64Decode(nullptr, 0, out, &size), 0);
  EXPECT_EQ(ZELOEncodingBase64Decode("Zg==", 4, nullptr, &size), 0);
  EXPECT_EQ(ZELOEncodingBase64Decode("Zg==", 4, out, nullptr), 0);
  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
}

}  // namespace
