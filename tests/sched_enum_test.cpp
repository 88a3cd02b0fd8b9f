// Names for numbers: enumeration values, and on/off characters as lists of names.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "zelosched.h"

namespace support {
namespace {

class SchedEnumTest : public SandboxTest {};

using Lines = std::vector<std::string>;

constexpr ZELO_SCHED_ENUM kStates[] = {
    {0, "disabled"}, {1, "enabled"}, {2, "NotExisted"}, {-1, nullptr}};
constexpr ZELO_SCHED_ENUM kWithTwins[] = {
    {7, "first"}, {7, "second"}, {8, "first"}, {9, ""}, {-1, nullptr}};
constexpr ZELO_SCHED_ENUM kEmptyList[] = {{-1, nullptr}};

constexpr const char *kDays[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
constexpr size_t kDayCount = std::size(kDays);
constexpr size_t kResultCapacity = 4096;

void expectNotFoundInSilence() {
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_enum.cpp"}));
  EXPECT_EQ(logged(), Lines{});
}

void expectSilence() {
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_EQ(logged(), Lines{});
}

// ---- value to name

TEST_F(SchedEnumTest, AValueGivesItsName) {
  EXPECT_STREQ(ZELOSchedEnumToName(kStates, 0), "disabled");
  EXPECT_STREQ(ZELOSchedEnumToName(kStates, 1), "enabled");
  expectSilence();
}

TEST_F(SchedEnumTest, StateTwoIsNotExisted) {
  EXPECT_STREQ(ZELOSchedEnumToName(kStates, 2), "NotExisted");
}

TEST_F(SchedEnumTest, TheNamePointsIntoTheList) {
  EXPECT_EQ(ZELOSchedEnumToName(kStates, 1), kStates[1].szName);
}

TEST_F(SchedEnumTest, TheFirstPairWithTheValueWins) {
  EXPECT_STREQ(ZELOSchedEnumToName(kWithTwins, 7), "first");
}

TEST_F(SchedEnumTest, AValueWithoutANameIsNotFound) {
  EXPECT_EQ(ZELOSchedEnumToName(kStates, 3), nullptr);
  expectNotFoundInSilence();
}

TEST_F(SchedEnumTest, ThePairThatEndsTheListHasNoName) {
  EXPECT_EQ(ZELOSchedEnumToName(kStates, -1), nullptr);
  expectNotFoundInSilence();
}

TEST_F(SchedEnumTest, AnEmptyListHasNoNames) {
  EXPECT_EQ(ZELOSchedEnumToName(kEmptyList, 0), nullptr);
  expectNotFoundInSilence();
}

TEST_F(SchedEnumTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  expectRefused(
      "sched_enum.cpp",
      {{"((void *)0) != enum_list",
        [] { return ZELOSchedEnumToName(nullptr, 0) == nullptr ? -1 : 0; }},
       {"((void *)0) != enum_list", [] { return ZELOSchedEnumToValue(nullptr, "enabled"); }},
       {"((void *)0) != enum_list", [] { return ZELOSchedEnumToValue(nullptr, nullptr); }},
       {"NULL != szName", [] { return ZELOSchedEnumToValue(kStates, nullptr); }}});
}

// ---- name to value

TEST_F(SchedEnumTest, ANameGivesItsValue) {
  for (const ZELO_SCHED_ENUM *entry = kStates; entry->szName != nullptr; ++entry) {
    EXPECT_EQ(ZELOSchedEnumToValue(kStates, std::string(entry->szName).c_str()), entry->value);
  }
  expectSilence();
}

TEST_F(SchedEnumTest, TheFirstPairWithTheNameWins) {
  EXPECT_EQ(ZELOSchedEnumToValue(kWithTwins, "first"), 7);
}

TEST_F(SchedEnumTest, AnEmptyNameIsANameLikeAnyOther) {
  EXPECT_EQ(ZELOSchedEnumToValue(kWithTwins, ""), 9);
}

TEST_F(SchedEnumTest, ACapitalLetterMakesAnotherName) {
  EXPECT_EQ(ZELOSchedEnumToValue(kStates, "Enabled"), -1);
  expectNotFoundInSilence();
}

TEST_F(SchedEnumTest, APartOfANameIsNotFound) {
  EXPECT_EQ(ZELOSchedEnumToValue(kStates, "enable"), -1);
  EXPECT_EQ(ZELOSchedEnumToValue(kStates, "enabled "), -1);
  expectNotFoundInSilence();
}

// ---- on/off characters to names

TEST_F(SchedEnumTest, TheDaysThatAreOnAreNamed) {
  EXPECT_STREQ(ZELOSchedMultiSelectToText("1000001", kDays, kDayCount), "Sun,Sat");
  EXPECT_STREQ(ZELOSchedMultiSelectToText("0001000", kDays, kDayCount), "Wed");
  EXPECT_STREQ(ZELOSchedMultiSelectToText("1111111", kDays, kDayCount),
               "Sun,Mon,Tue,Wed,Thu,Fri,Sat");
}

TEST_F(SchedEnumTest, AnythingButAZeroIsOn) {
  EXPECT_STREQ(ZELOSchedMultiSelectToText("0x2 0\xFF"
                                          "0",
                                          kDays, kDayCount),
               "Mon,Tue,Wed,Fri");
}

TEST_F(SchedEnumTest, NoDayIsAnEmptyTextAndNotNull) {
  EXPECT_STREQ(ZELOSchedMultiSelectToText("0000000", kDays, kDayCount), "");
  EXPECT_STREQ(ZELOSchedMultiSelectToText("", kDays, 0), "");
}

TEST_F(SchedEnumTest, FlagsThatAreTooShortGiveNull) {
  EXPECT_EQ(ZELOSchedMultiSelectToText("111111", kDays, kDayCount), nullptr);
  expectSilence();
}

TEST_F(SchedEnumTest, FlagsBeyondTheCountAreReadToTheirEnd) {
  EXPECT_STREQ(ZELOSchedMultiSelectToText("1000001", kDays, 3), "Sun,Sat");
}

TEST_F(SchedEnumTest, ToTextNeedsFlagsAndNamesButSaysNothing) {
  EXPECT_EQ(ZELOSchedMultiSelectToText(nullptr, kDays, kDayCount), nullptr);
  EXPECT_EQ(ZELOSchedMultiSelectToText("1000001", nullptr, kDayCount), nullptr);
  expectSilence();
}

TEST_F(SchedEnumTest, ALaterTextReplacesAnEarlierOne) {
  const char *first = ZELOSchedMultiSelectToText("1111111", kDays, kDayCount);
  const char *second = ZELOSchedMultiSelectToText("0100000", kDays, kDayCount);
  EXPECT_EQ(first, second);
  EXPECT_STREQ(second, "Mon");
}

TEST_F(SchedEnumTest, TheTwoDirectionsHaveBuffersOfTheirOwn) {
  const char *text = ZELOSchedMultiSelectToText("1000001", kDays, kDayCount);
  const char *flags = ZELOSchedMultiSelectFromText(text, kDays, kDayCount);
  EXPECT_NE(text, flags);
  EXPECT_STREQ(text, "Sun,Sat");
  EXPECT_STREQ(flags, "1000001");
}

TEST_F(SchedEnumTest, ATextThatOutgrowsTheBufferIsCut) {
  const std::string name(1000, 'n');
  const std::vector<const char *> names(8, name.c_str());
  const std::string flags(names.size(), '1');
  const std::string wanted = name + "," + name + "," + name + "," + name + ",";
  const std::string text = ZELOSchedMultiSelectToText(flags.c_str(), names.data(), names.size());
  EXPECT_EQ(text.size(), kResultCapacity - 1);
  EXPECT_EQ(text, (wanted + name).substr(0, kResultCapacity - 1));
}

// ---- names to on/off characters

TEST_F(SchedEnumTest, NamesAreFoundIgnoringCaseAndInAnyOrder) {
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("sat,MON", kDays, kDayCount), "0100001");
}

TEST_F(SchedEnumTest, UnknownNamesAreIgnored) {
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("Sunday,Tue,x", kDays, kDayCount), "0010000");
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("x", kDays, kDayCount), "0000000");
}

TEST_F(SchedEnumTest, ANameGivenTwiceDoesNoHarm) {
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("Fri,fri,FRI", kDays, kDayCount), "0000010");
}

TEST_F(SchedEnumTest, BlanksBelongToAName) {
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("Sun, Mon", kDays, kDayCount), "1000000");
}

TEST_F(SchedEnumTest, OnlyTheFirstNamesCount) {
  EXPECT_STREQ(ZELOSchedMultiSelectFromText("Sun,Sat", kDays, 3), "100");
}

TEST_F(SchedEnumTest, ATextWithoutItemsGivesNull) {
  EXPECT_EQ(ZELOSchedMultiSelectFromText("", kDays, kDayCount), nullptr);
  EXPECT_EQ(ZELOSchedMultiSelectFromText(",,", kDays, kDayCount), nullptr);
  expectSilence();
}

TEST_F(SchedEnumTest, FromTextNeedsTextNamesAndACountButSaysNothing) {
  EXPECT_EQ(ZELOSchedMultiSelectFromText(nullptr, kDays, kDayCount), nullptr);
  EXPECT_EQ(ZELOSchedMultiSelectFromText("Sun", nullptr, kDayCount), nullptr);
  EXPECT_EQ(ZELOSchedMultiSelectFromText("Sun", kDays, 0), nullptr);
  expectSilence();
}

TEST_F(SchedEnumTest, WithoutAListThereAreNoFlags) {
  failCall("QLIBCSzListAlloc", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedMultiSelectFromText("Sun", kDays, kDayCount), nullptr);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedEnumTest, ATextThatCannotBeSplitGivesNull) {
  failCall("QLIBCStrSep", {.code = 0x0200});
  EXPECT_EQ(ZELOSchedMultiSelectFromText("Sun", kDays, kDayCount), nullptr);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedEnumTest, LaterFlagsReplaceEarlierOnes) {
  const char *first = ZELOSchedMultiSelectFromText("Sun,Mon,Tue", kDays, kDayCount);
  const char *second = ZELOSchedMultiSelectFromText("Mon", kDays, 2);
  EXPECT_EQ(first, second);
  EXPECT_STREQ(second, "01");
}

TEST_F(SchedEnumTest, TheLargestCountFillsTheBuffer) {
  const std::vector<const char *> names(kResultCapacity - 1, "on");
  const std::string wanted(names.size(), '1');
  EXPECT_EQ(ZELOSchedMultiSelectFromText("ON", names.data(), names.size()), wanted);
}

// The count must stay below the capacity; a caller who ignores that gets what fits.
TEST_F(SchedEnumTest, ACountBeyondTheBufferIsCut) {
  const std::vector<const char *> names(kResultCapacity + 100, "on");
  const std::string wanted(kResultCapacity - 1, '1');
  EXPECT_EQ(ZELOSchedMultiSelectFromText("on", names.data(), names.size()), wanted);
}

}  // namespace
}  // namespace support
