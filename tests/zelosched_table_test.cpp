// Aligned output: what is safe to print, how wide it is, and how a table fits.
#include <gtest/gtest.h>

#include "terminal/table.h"
#include "terminal/text.h"

namespace support {
namespace {

TEST(ZeloschedTextTest, ControlCharactersAndDirectionMarksAreEscaped) {
  EXPECT_EQ(printable("a\nb\tc\rd"), "a\\nb\\tc\\rd");
  EXPECT_EQ(printable("\x1b[31mred\x07\x7f"), "\\x1b[31mred\\x07\\x7f");
  EXPECT_EQ(printable("\xc2\x9b"
                      "31m"),
            "\\xc2\\x9b31m");  // a one-byte escape sequence
  EXPECT_EQ(printable("a\xe2\x80\xae"
                      "b"),
            "a\\xe2\\x80\\xaeb");  // right to left
  EXPECT_EQ(printable(std::string("a\0b", 3)), "a\\x00b");
}

TEST(ZeloschedTextTest, WhatCannotBeSeenIsEscaped) {
  EXPECT_EQ(printable("a\xe2\x80\x8b"), "a\\xe2\\x80\\x8b");           // of no width
  EXPECT_EQ(printable("a\xc2\xad"), "a\\xc2\\xad");                    // a soft hyphen
  EXPECT_EQ(printable("a\xe2\x81\xa0"), "a\\xe2\\x81\\xa0");           // a joiner
  EXPECT_EQ(printable("a\xf3\xa0\x81\x81"), "a\\xf3\\xa0\\x81\\x81");  // a tag
  EXPECT_EQ(printable("\xe3\x85\xa4"), "\\xe3\\x85\\xa4");             // a filler
  EXPECT_EQ(printable("\xe2\xa0\x80"), "\\xe2\\xa0\\x80");             // an empty pattern
  EXPECT_EQ(printable("a\xcd\x8f"), "a\\xcd\\x8f");                    // a grapheme joiner
}

TEST(ZeloschedTextTest, BytesThatAreNoUtf8AreEscaped) {
  EXPECT_EQ(printable("\xff"), "\\xff");
  EXPECT_EQ(printable("\xc0\x8a"), "\\xc0\\x8a");                    // a line feed in disguise
  EXPECT_EQ(printable("\xe6\xbc"), "\\xe6\\xbc");                    // cut off
  EXPECT_EQ(printable("\xed\xa0\x80"), "\\xed\\xa0\\x80");           // half of a pair
  EXPECT_EQ(printable("\xf4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80");  // beyond the last character
}

TEST(ZeloschedTextTest, LinesKeepTheirEndsAndTabs) {
  EXPECT_EQ(printableLines("a\tb\n\nc\r\n\x1b[2J\xff\n"), "a\tb\n\nc\\r\n\\x1b[2J\\xff\n");
}

TEST(ZeloschedTextTest, ACharacterThatIsCutOffIsFoundAtTheEndAlone) {
  const std::pair<const char *, size_t> texts[] = {
      {"", 0},
      {"a", 0},
      {"a\xc3", 1},
      {"a\xc3\xa4", 0},
      {"\xe6\xbc", 2},
      {"\xe6\xbc\xa2", 0},
      {"\xf0\x9f\x98", 3},
      {"\xf0\x9f\x98\x80", 0},
      {"\x80\x80\x80\x80", 0},  // no beginning
      {"\xff", 0},
      {"\xc3\xa4\xa4", 0},
  };
  for (const auto &[text, bytes] : texts) {
    EXPECT_EQ(cutCharacterLength(text), bytes) << printable(text);
  }
}

TEST(ZeloschedTextTest, OtherTextStaysAsItIs) {
  for (const char *text : {"", "Nightly backup", "größe", "漢字", "\xf0\x9f\x98\x80", "a\\b"}) {
    EXPECT_EQ(printable(text), text);
  }
}

TEST(ZeloschedTextTest, WideCharactersTakeTwoColumnsAndCombiningOnesNone) {
  EXPECT_EQ(widthOf("abc"), 3U);
  EXPECT_EQ(widthOf("größe"), 5U);
  EXPECT_EQ(widthOf("漢字"), 4U);
  EXPECT_EQ(widthOf("e\xcc\x81"), 1U);
}

TEST(ZeloschedTextTest, ATextIsCutAtAWholeCharacter) {
  EXPECT_EQ(fitted("abcdef", 6), "abcdef");
  EXPECT_EQ(fitted("abcdef", 5), "abcd…");
  EXPECT_EQ(fitted("漢字漢字", 6), "漢字…");
  EXPECT_EQ(fitted("漢字漢字", 5), "漢字…");
  EXPECT_EQ(fitted("漢字漢字", 4), "漢…");
  EXPECT_EQ(fitted("abc", 0), "");
}

TEST(ZeloschedTextTest, AWordIsQuotedWhereTheShellWouldReadItOtherwise) {
  EXPECT_EQ(shellQuoted("/bin/echo-1.2"), "/bin/echo-1.2");
  EXPECT_EQ(shellQuoted(""), "''");
  EXPECT_EQ(shellQuoted("a b"), "'a b'");
  EXPECT_EQ(shellQuoted("it's"), "'it'\\''s'");
  EXPECT_EQ(shellQuoted("$HOME;~"), "'$HOME;~'");
  EXPECT_EQ(shellQuoted("a=b"), "'a=b'");
}

TEST(ZeloschedTextTest, OnlyOneIsCountedWithoutAnS) {
  EXPECT_EQ(counted(0, "task"), "0 tasks");
  EXPECT_EQ(counted(1, "task"), "1 task");
  EXPECT_EQ(counted(2, "task"), "2 tasks");
}

Table twoTasks() {
  Table table(
      {{"ID", Column::kRight}, {"OWNER", Column::kLeft, true}, {"NAME", Column::kLeft, true}});
  table.add({{"7"}, {"root"}, {"漢字の名前です"}});
  table.add({{"1234"}, {"somebody"}, {"short\n", Emphasis::kBad}});
  return table;
}

TEST(ZeloschedTableTest, ColumnsAreAlignedByWidthAndEndWithoutBlanks) {
  EXPECT_EQ(twoTasks().text(0, false),
            "  ID  OWNER     NAME\n"
            "   7  root      漢字の名前です\n"
            "1234  somebody  short\\n\n");
}

TEST(ZeloschedTableTest, ColumnsThatMayShrinkGiveWay) {
  EXPECT_EQ(twoTasks().text(26, false),
            "  ID  OWNER     NAME\n"
            "   7  root      漢字の名…\n"
            "1234  somebody  short\\n\n");
}

TEST(ZeloschedTableTest, NoColumnShrinksToNothing) {
  EXPECT_EQ(twoTasks().text(10, false),
            "  ID  OWNER     NAME\n"
            "   7  root      漢字の…\n"
            "1234  somebody  short\\n\n");
}

TEST(ZeloschedTableTest, ColourDoesNotCountForTheWidth) {
  EXPECT_NE(twoTasks().text(0, true).find("1234  somebody  \033[31mshort\\n\033[0m\n"),
            std::string::npos);
}

}  // namespace
}  // namespace support
