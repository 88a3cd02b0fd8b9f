// The process-wide error record.
#include <gtest/gtest.h>
#include <zelocore.h>

#include <string>

namespace {

// First in the file: the record is as it was when the program started.
TEST(ZelocoreErr, TheRecordIsEmptyAtStart) {
  EXPECT_EQ(QLIBCErrGet(), 0);
  EXPECT_STREQ(QLIBCErrorGetFile(), "");
  EXPECT_EQ(QLIBCErrorGetLine(), 0);
}

TEST(ZelocoreErr, TheRecordHoldsWhatWasSetLast) {
  QLIBCErrSetEx(QLIBC_ERR_IO, "first.cpp", 1);
  QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, "second.cpp", 22);

  EXPECT_EQ(QLIBCErrGet(), 0x2000);
  EXPECT_STREQ(QLIBCErrorGetFile(), "second.cpp");
  EXPECT_EQ(QLIBCErrorGetLine(), 22);
}

TEST(ZelocoreErr, TheFileNameIsCopied) {
  std::string file = "mine.cpp";
  QLIBCErrSetEx(1, file.c_str(), 1);
  file.assign("gone.cpp");

  EXPECT_STREQ(QLIBCErrorGetFile(), "mine.cpp");
}

TEST(ZelocoreErr, NoFileNameCountsAsAnEmptyOne) {
  QLIBCErrSetEx(1, nullptr, 1);

  EXPECT_STREQ(QLIBCErrorGetFile(), "");
}

TEST(ZelocoreErr, AnEndlessFileNameIsCut) {
  const std::string endless(100000, 'x');
  QLIBCErrSetEx(1, endless.c_str(), 1);

  const std::string kept = QLIBCErrorGetFile();
  EXPECT_LT(kept.size(), 1024U);
  EXPECT_EQ(kept, endless.substr(0, kept.size()));
}

TEST(ZelocoreErr, TheRecordsOwnTextCanBeSetAgain) {
  QLIBCErrSetEx(1, "again.cpp", 1);
  QLIBCErrSetEx(2, QLIBCErrorGetFile(), 2);

  EXPECT_STREQ(QLIBCErrorGetFile(), "again.cpp");
}

TEST(ZelocoreErr, ASuccessLeavesTheRecordAlone) {
  QLIBCErrSetEx(QLIBC_ERR_IO, "before.cpp", 7);
  QLIBCSzHashFree(QLIBCSzHashAlloc(1));

  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_IO);
  EXPECT_STREQ(QLIBCErrorGetFile(), "before.cpp");
}

TEST(ZelocoreErr, AFailureNamesItsOwnFileWithoutAPath) {
  QLIBCErrSetEx(0, "", 0);
  EXPECT_EQ(QLIBCSzHashSetValue(nullptr, "a", "b"), -1);

  EXPECT_EQ(QLIBCErrGet(), QLIBC_ERR_BAD_PARAMETER);
  EXPECT_STREQ(QLIBCErrorGetFile(), "szhash.cpp");
  EXPECT_GT(QLIBCErrorGetLine(), 0);
}

}  // namespace
