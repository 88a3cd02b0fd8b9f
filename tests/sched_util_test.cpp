// The clock, dates and times as texts, and the seed of the random waits.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "zelosched.h"

namespace support {
namespace {

class SchedUtilTest : public SandboxTest {};

using Lines = std::vector<std::string>;

constexpr uint32_t kUntouched = 777;
constexpr ZELO_SCHED_DATE kUntouchedDate = {kUntouched, kUntouched, kUntouched,
                                            kUntouched, kUntouched, kUntouched};

std::vector<uint32_t> fieldsOf(const ZELO_SCHED_DATE &date) {
  return {date.year, date.month, date.day, date.weekday, date.hour, date.minute};
}

TEST_F(SchedUtilTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  ZELO_SCHED_DATE date = kUntouchedDate;
  expectRefused(
      "sched_util.cpp",
      {{"((void *)0) != pDate", [] { return ZELOSchedDateGet(nullptr); }},
       {"((void *)0) != pDate1", [] { return ZELOSchedDateComp(nullptr, &kUntouchedDate); }},
       {"NULL != pDate2", [] { return ZELOSchedDateComp(&kUntouchedDate, nullptr); }},
       {"((void *)0) != pDate1", [] { return ZELOSchedDateComp(nullptr, nullptr); }},
       {"((void *)0) != szDateOrg", [&] { return ZELOSchedDateParse(nullptr, &date); }},
       {"NULL != pDate", [] { return ZELOSchedDateParse("bad", nullptr); }},
       {"((void *)0) != szDateOrg", [] { return ZELOSchedDateParse(nullptr, nullptr); }},
       {"((void *)0) != szTimeOrg", [&] { return ZELOSchedTimeParse(nullptr, &date); }},
       {"NULL != pDate", [] { return ZELOSchedTimeParse("bad", nullptr); }},
       {"((void *)0) != szTimeOrg", [] { return ZELOSchedTimeParse(nullptr, nullptr); }}});
  EXPECT_EQ(fieldsOf(date), fieldsOf(kUntouchedDate));
}

// ---- the clock

TEST_F(SchedUtilTest, TheDateIsThatOfTheClock) {
  setClock("2013-05-07 08:30:59");
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateGet(&date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2013, 5, 7, 2, 8, 30}));
}

TEST_F(SchedUtilTest, TheDateIsLocal) {
  setClock(time_t{1388534399});  // the last second of 2013 in UTC
  setZone("EAST-1");
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateGet(&date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2014, 1, 1, 3, 0, 59}));
  setZone("WEST5");
  EXPECT_EQ(ZELOSchedDateGet(&date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2013, 12, 31, 2, 18, 59}));
}

TEST_F(SchedUtilTest, TheDateIsSummerTimeInSummer) {
  setZone("CET-1CEST,M3.5.0,M10.5.0/3");
  setClock(time_t{1367908200});
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateGet(&date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2013, 5, 7, 2, 8, 30}));
}

TEST_F(SchedUtilTest, WeekdaysCountFromSunday) {
  for (uint32_t day = 5; day <= 11; ++day) {  // 5 May 2013 was a Sunday
    setClock("2013-05-" + std::to_string(day) + " 12:00");
    ZELO_SCHED_DATE date = kUntouchedDate;
    EXPECT_EQ(ZELOSchedDateGet(&date), 0);
    EXPECT_EQ(date.weekday, day - 5);
  }
}

TEST_F(SchedUtilTest, AClockThatCannotBeConvertedIsReported) {
  failCall("localtime", {.error = EOVERFLOW});
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateGet(&date), -1);
  EXPECT_EQ(fieldsOf(date), fieldsOf(kUntouchedDate));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2A00, "sched_util.cpp"}));
  EXPECT_EQ(logged(), Lines{"sched_util.cpp:N localtime failed. Value too large for defined data "
                            "type"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

// ---- comparing

TEST_F(SchedUtilTest, HoursOfTheSameDayDoNotMatter) {
  const ZELO_SCHED_DATE morning = {2013, 5, 7, 2, 8, 0};
  const ZELO_SCHED_DATE night = {2013, 5, 7, 2, 23, 0};
  EXPECT_EQ(ZELOSchedDateComp(&morning, &night), 0);
  EXPECT_EQ(ZELOSchedDateComp(&night, &morning), 0);
}

TEST_F(SchedUtilTest, TheWeekdayDoesNotMatter) {
  const ZELO_SCHED_DATE date1 = {2013, 5, 7, 0, 0, 0};
  const ZELO_SCHED_DATE date2 = {2013, 5, 7, 6, 0, 0};
  EXPECT_EQ(ZELOSchedDateComp(&date1, &date2), 0);
}

TEST_F(SchedUtilTest, TheYearDecidesThenTheMonthThenTheDay) {
  const struct {
    ZELO_SCHED_DATE earlier;
    ZELO_SCHED_DATE later;
  } pairs[] = {
      {{2012, 12, 31, 0, 23, 59}, {2013, 1, 1, 0, 0, 0}},
      {{2013, 4, 30, 0, 23, 59}, {2013, 5, 1, 0, 0, 0}},
      {{2013, 5, 6, 6, 23, 59}, {2013, 5, 7, 0, 0, 0}},
      {{0, UINT32_MAX, UINT32_MAX, 0, 0, 0}, {1, 0, 0, 0, 0, 0}},
      {{2013, 1, 1, 0, 0, 0}, {UINT32_MAX, 0, 0, 0, 0, 0}},
      {{2013, 2, UINT32_MAX - 1, 0, 0, 0}, {2013, 2, UINT32_MAX, 0, 0, 0}},
  };
  for (const auto &pair : pairs) {
    SCOPED_TRACE(testing::PrintToString(fieldsOf(pair.earlier)));
    EXPECT_EQ(ZELOSchedDateComp(&pair.earlier, &pair.later), -1);
    EXPECT_EQ(ZELOSchedDateComp(&pair.later, &pair.earlier), 1);
  }
  EXPECT_EQ(errorRecord().code, 0);
}

// ---- texts of dates

struct ParsedDate {
  const char *text;
  uint32_t year, month, day;
};

void PrintTo(const ParsedDate &date, std::ostream *out) {
  *out << date.text;
}

class DateTextTest : public SandboxTest, public testing::WithParamInterface<ParsedDate> {};

TEST_P(DateTextTest, IsReadAndFillsNothingElse) {
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateParse(GetParam().text, &date), 0);
  EXPECT_EQ(fieldsOf(date),
            (std::vector<uint32_t>{GetParam().year, GetParam().month, GetParam().day, kUntouched,
                                   kUntouched, kUntouched}));
  EXPECT_EQ(logged(), Lines{});
}

INSTANTIATE_TEST_SUITE_P(
    SchedUtil, DateTextTest,
    testing::Values(ParsedDate{"2013/5/7", 2013, 5, 7}, ParsedDate{"2013/05/07", 2013, 5, 7},
                    ParsedDate{"2013/12/31", 2013, 12, 31}, ParsedDate{"2013/5/17", 2013, 5, 17},
                    ParsedDate{"2013/2/30", 2013, 2, 30}, ParsedDate{"2013/13/1", 2013, 13, 1},
                    ParsedDate{"2013/99/0", 2013, 99, 0}, ParsedDate{"2013/12/", 2013, 12, 0},
                    ParsedDate{"2013/1/123", 2013, 1, 123}, ParsedDate{"0000/0/00", 0, 0, 0},
                    ParsedDate{"2013/1/08", 2013, 1, 8}, ParsedDate{"2013/1/2/3", 2013, 1, 2}));

class BadDateTextTest : public SandboxTest, public testing::WithParamInterface<const char *> {};

TEST_P(BadDateTextTest, IsRefused) {
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateParse(GetParam(), &date), -1);
  EXPECT_EQ(fieldsOf(date), fieldsOf(kUntouchedDate));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x4000, "sched_util.cpp"}));
  EXPECT_EQ(logged(), Lines{std::string("sched_util.cpp:N Bad date format: [") + GetParam() + "]"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

INSTANTIATE_TEST_SUITE_P(SchedUtil, BadDateTextTest,
                         testing::Values("", "13/5/7", "2013/1/", "2013-05-07", "2013/123/1",
                                         "2013/05/070", "20130507", "201/05/07", "20133/5/7",
                                         "/2013/5/7", "2013//5/7", "2013/0507", "2013/5 /7",
                                         "2013/+5/7", "2013/5/7a", "2013/05/0a", " 2013/5/7",
                                         "2013/5/7\n", "2013/\xB2/11", "2013//////"));

TEST_F(SchedUtilTest, ATextOfAnyLengthIsShownInFull) {
  const std::string text(100000, '1');
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedDateParse(text.c_str(), &date), -1);
  EXPECT_EQ(ZELOSchedTimeParse(text.c_str(), &date), -1);
  EXPECT_EQ(logged(), (Lines{"sched_util.cpp:N Bad date format: [" + text + "]",
                             "sched_util.cpp:N Bad time format: [" + text + "]"}));
}

TEST_F(SchedUtilTest, ThirtyFebruaryIsReadAsItStandsAndNormalisesIntoMarch) {
  ZELO_SCHED_DATE date = {};
  ASSERT_EQ(ZELOSchedDateParse("2013/2/30", &date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2013, 2, 30, 0, 0, 0}));
  ASSERT_EQ(ZELOSchedDateNormalize(&date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{2013, 3, 2, 6, 0, 0}));
}

// ---- texts of times

struct ParsedTime {
  const char *text;
  uint32_t hour, minute;
};

void PrintTo(const ParsedTime &time, std::ostream *out) {
  *out << time.text;
}

class TimeTextTest : public SandboxTest, public testing::WithParamInterface<ParsedTime> {};

TEST_P(TimeTextTest, IsReadAndFillsNothingElse) {
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedTimeParse(GetParam().text, &date), 0);
  EXPECT_EQ(fieldsOf(date), (std::vector<uint32_t>{kUntouched, kUntouched, kUntouched, kUntouched,
                                                   GetParam().hour, GetParam().minute}));
  EXPECT_EQ(logged(), Lines{});
}

INSTANTIATE_TEST_SUITE_P(SchedUtil, TimeTextTest,
                         testing::Values(ParsedTime{"8:30", 8, 30}, ParsedTime{"08:30", 8, 30},
                                         ParsedTime{"8:5", 8, 5}, ParsedTime{"12:", 12, 0},
                                         ParsedTime{"1:234", 1, 234}, ParsedTime{"99:99", 99, 99},
                                         ParsedTime{"0:0", 0, 0}, ParsedTime{"23:59", 23, 59},
                                         ParsedTime{"09:08", 9, 8}));

class BadTimeTextTest : public SandboxTest, public testing::WithParamInterface<const char *> {};

TEST_P(BadTimeTextTest, IsRefused) {
  ZELO_SCHED_DATE date = kUntouchedDate;
  EXPECT_EQ(ZELOSchedTimeParse(GetParam(), &date), -1);
  EXPECT_EQ(fieldsOf(date), fieldsOf(kUntouchedDate));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x4000, "sched_util.cpp"}));
  EXPECT_EQ(logged(), Lines{std::string("sched_util.cpp:N Bad time format: [") + GetParam() + "]"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

INSTANTIATE_TEST_SUITE_P(SchedUtil, BadTimeTextTest,
                         testing::Values("", "8:", "830", "123:4", "12:345", ":30", ":300", "8.30",
                                         "8:3a", "-8:30", " 8:30", "8:30 ", "8/30", "08300"));

// ---- the seed

// rand() is seeded once in a process, so each test of it runs in a process of its own.
template <typename Check>
bool holdsInANewProcess(Check check) {
  if (fork() == 0) _exit(check() ? 0 : 1);
  int status = -1;
  wait(&status);
  return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

TEST_F(SchedUtilTest, TheSeedIsTheTimePlusTheProcessId) {
  setClock(time_t{1367908200});
  EXPECT_TRUE(holdsInANewProcess([] {
    ZELOSchedRandInit();
    return callCount("srand") == 1 && lastSeed() == 1367908200U + static_cast<unsigned>(getpid());
  }));
}

TEST_F(SchedUtilTest, ASecondCallInAProcessDoesNotSeedAgain) {
  setClock(time_t{1000000});
  EXPECT_TRUE(holdsInANewProcess([] {
    ZELOSchedRandInit();
    setClock(time_t{2000000});
    ZELOSchedRandInit();
    ZELOSchedRandInit();
    return callCount("srand") == 1 && lastSeed() == 1000000U + static_cast<unsigned>(getpid());
  }));
}

// Otherwise runs started together by one caller would wait for the same times.
TEST_F(SchedUtilTest, AForkedProcessSeedsForItself) {
  setClock(time_t{1000000});
  EXPECT_TRUE(holdsInANewProcess([] {
    ZELOSchedRandInit();
    return holdsInANewProcess([] {
      ZELOSchedRandInit();
      return callCount("srand") == 2 && lastSeed() == 1000000U + static_cast<unsigned>(getpid());
    });
  }));
}

}  // namespace
}  // namespace support
