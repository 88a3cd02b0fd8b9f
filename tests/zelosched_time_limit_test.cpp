// A time limit as a part of the stored command, written and read back.
#include <gtest/gtest.h>

#include <string>

#include "runs/time_limit.h"

namespace support {
namespace {

TEST(ZeloschedTimeLimitTest, ALimitIsANumberWithAUnit) {
  EXPECT_EQ(secondsOfLimit("90s"), 90);
  EXPECT_EQ(secondsOfLimit("30m"), 1800);
  EXPECT_EQ(secondsOfLimit("2h"), 7200);
  EXPECT_EQ(secondsOfLimit("1d"), 86400);
  EXPECT_EQ(secondsOfLimit("999999d"), 999999LL * 86400);
  for (const char *text : {"", "h", "2", "0s", "02h", "2w", "2 h", "-2h", "2.5h", "1000000s", "2hh",
                           "2h ", " 2h", "2H", "+2h", "infinity"}) {
    EXPECT_FALSE(secondsOfLimit(text)) << text;
  }
}

TEST(ZeloschedTimeLimitTest, TheStoredFormIsReadByTheShellAsTheCommand) {
  EXPECT_EQ(storedCommand({"backup --all", "2h"}),
            "timeout --kill-after=30s 2h sh -c 'backup --all'");
  EXPECT_EQ(storedCommand({"echo 'it''s'", "90s"}),
            "timeout --kill-after=30s 90s sh -c 'echo '\\''it'\\'''\\''s'\\'''");
  EXPECT_EQ(storedCommand({"true", ""}), "true");
}

TEST(ZeloschedTimeLimitTest, WhatIsStoredIsTakenApartAgain) {
  const std::string all = [] {
    std::string bytes;
    for (int byte = 1; byte < 256; ++byte) bytes += static_cast<char>(byte);
    return bytes;
  }();
  for (const std::string &command : {std::string("true"), std::string("'"), std::string("''"),
                                     std::string("'\\''"), std::string("a\nb"), std::string(), all,
                                     std::string("timeout --kill-after=30s 2h sh -c 'x'"),
                                     std::string("timeout --kill-after=30s 2h sh -c x")}) {
    for (const char *limit : {"90s", "30m", "2h", "1d"}) {
      const LimitedCommand back = takeApart(storedCommand({command, limit}));
      EXPECT_EQ(back.command, command);
      EXPECT_EQ(back.limit, limit);
    }
  }
}

TEST(ZeloschedTimeLimitTest, ACommandOfAnyOtherFormIsLeftAsItIs) {
  for (const char *stored : {
           "true",
           "",
           "timeout 2h sh -c 'x'",
           "timeout --kill-after=30s 2h x",
           "timeout --kill-after=30s 2h sh -c x",
           "timeout --kill-after=30s 2h sh -c \"x\"",
           "timeout --kill-after=30s 2h sh -c 'x' y",
           "timeout --kill-after=30s 2h sh -c 'x'; y",
           "timeout --kill-after=30s 2h sh -c 'x''y'",
           "timeout --kill-after=30s 2h sh -c 'x'\\'",
           "timeout --kill-after=30s 2h sh -c '",
           "timeout --kill-after=30s 2h sh -c ",
           "timeout --kill-after=30s 2h",
           "timeout --kill-after=30s 2 sh -c 'x'",
           "timeout --kill-after=30s 02h sh -c 'x'",
           "timeout --kill-after=30s 2h  sh -c 'x'",
           "timeout --kill-after=10s 2h sh -c 'x'",
           " timeout --kill-after=30s 2h sh -c 'x'",
           "timeout --kill-after=30s 2h sh -c 'x' ",
       }) {
    EXPECT_EQ(takeApart(stored).command, stored);
    EXPECT_EQ(takeApart(stored).limit, "") << stored;
  }
}

TEST(ZeloschedTimeLimitTest, OnlyAtOrAfterItsLimitACommandWasEndedByIt) {
  const std::string stored = storedCommand({"sleep 100", "90s"});
  EXPECT_TRUE(isEndedByLimit(stored, 124, 90.0));
  EXPECT_TRUE(isEndedByLimit(stored, 137, 120.5));
  EXPECT_FALSE(isEndedByLimit(stored, 124, 89.9));  // the command's own
  EXPECT_FALSE(isEndedByLimit(stored, 1, 100.0));
  EXPECT_FALSE(isEndedByLimit("sleep 100", 124, 100.0));
}

}  // namespace
}  // namespace support
