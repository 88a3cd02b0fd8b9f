// The task record and the field table: rows, order, defaults, conversions and orderings.
#include "sched_parm_table.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "text_hash.h"

namespace support {
namespace {

class SchedParmTableTest : public SandboxTest {};

using Lines = std::vector<std::string>;

enum class Kind { kSigned, kUnsigned, kText, kState, kType };

struct ExpectedRow {
  const char *key;
  bool inHash;
  bool required;
  const char *defaultText;
  Kind kind;
  size_t offset;
  size_t capacity;
};

#define NUMBER(field) offsetof(ZELO_SCHED_TASK, field), 0
#define TEXT(field, capacity) offsetof(ZELO_SCHED_TASK, field), capacity

const ExpectedRow kExpectedRows[] = {
    {"id", true, true, "-1", Kind::kSigned, NUMBER(ID)},
    {"backend", false, false, "-1", Kind::kSigned, NUMBER(Backend)},
    {"can edit owner", true, false, "1", Kind::kSigned, NUMBER(CanEditOwner)},
    {"can edit name", true, false, "1", Kind::kSigned, NUMBER(CanEditName)},
    {"listable", true, false, "1", Kind::kSigned, NUMBER(Listable)},
    {"can run from ui", true, false, "1", Kind::kSigned, NUMBER(CanRunFromUI)},
    {"can delete from ui", true, false, "1", Kind::kSigned, NUMBER(CanDeleteFromUI)},
    {"can edit from ui", true, false, "1", Kind::kSigned, NUMBER(CanEditFromUI)},
    {"can run app same time", true, false, "1", Kind::kSigned, NUMBER(CanRunAppSameTime)},
    {"can run task same time", true, false, "0", Kind::kSigned, NUMBER(CanRunTaskSameTime)},
    {"simple edit form", true, false, "0", Kind::kSigned, NUMBER(SimpleEditForm)},
    {"owner", true, false, "0", Kind::kUnsigned, NUMBER(Owner)},
    {"start year", true, false, "2012", Kind::kUnsigned, NUMBER(StartYear)},
    {"start month", true, false, "1", Kind::kUnsigned, NUMBER(StartMonth)},
    {"start day", true, false, "1", Kind::kUnsigned, NUMBER(StartDay)},
    {"run hour", true, true, "0", Kind::kUnsigned, NUMBER(RunHour)},
    {"run min", true, true, "0", Kind::kUnsigned, NUMBER(RunMin)},
    {"repeat hour", true, false, "0", Kind::kUnsigned, NUMBER(RepeatHour)},
    {"last work hour", true, false, "0", Kind::kUnsigned, NUMBER(LastWorkHour)},
    {"name", true, true, "", Kind::kText, TEXT(Name, 4096)},
    {"edit form", true, false, "", Kind::kText, TEXT(EditForm, 1024)},
    {"edit dialog", true, false, "ZELO.TOV.TaskScheduler.EditDialog", Kind::kText,
     TEXT(EditDialog, 1024)},
    {"app", true, true, "", Kind::kText, TEXT(App, 1024)},
    {"app name", true, true, "", Kind::kText, TEXT(AppName, 1024)},
    {"app args", true, false, "", Kind::kText, TEXT(AppArgs, 8192)},
    {"action", true, true, "", Kind::kText, TEXT(Action, 1024)},
    {"week", true, false, "1111111", Kind::kText, TEXT(Week, 8)},
    {"cmd", true, true, "", Kind::kText, TEXT(Command, 16384)},
    {"next trigger time", false, false, "", Kind::kText, TEXT(NextTriggerTime, 1024)},
    {"state", true, true, "enabled", Kind::kState, NUMBER(State)},
    {"type", true, true, "daily", Kind::kType, NUMBER(Type)},
};
constexpr size_t kRowCount = std::size(kExpectedRows);

const SchedParm &rowOf(const std::string &key) {
  const SchedParm *row = parm_table;
  while (row->szKey != nullptr && row->szKey != key) ++row;
  return *row;
}

std::string textOf(const SchedParm &row, const void *field) {
  char text[64] = "";
  EXPECT_EQ(row.ToHashStr(field, text, sizeof(text)), 0);
  return text;
}

TEST_F(SchedParmTableTest, RowsStandInTheOrderThatSortFieldNumbersRelyOn) {
  for (size_t i = 0; i < kRowCount; ++i) {
    ASSERT_NE(parm_table[i].szKey, nullptr) << "row " << i;
    EXPECT_STREQ(parm_table[i].szKey, kExpectedRows[i].key) << "row " << i;
  }
}

TEST_F(SchedParmTableTest, ARowWithoutAKeyEndsTheTable) {
  EXPECT_EQ(kRowCount, 31U);
  EXPECT_EQ(parm_table[kRowCount].szKey, nullptr);
}

TEST_F(SchedParmTableTest, OnlyTheBackendAndTheNextTriggerTimeStayOutOfTheHash) {
  for (size_t i = 0; i < kRowCount; ++i) {
    EXPECT_EQ(parm_table[i].inHash, kExpectedRows[i].inHash) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, TenKeysAreRequired) {
  for (size_t i = 0; i < kRowCount; ++i) {
    EXPECT_EQ(parm_table[i].required, kExpectedRows[i].required) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, EveryRowHasItsDefault) {
  for (size_t i = 0; i < kRowCount; ++i) {
    EXPECT_STREQ(parm_table[i].szDefault, kExpectedRows[i].defaultText) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, EveryRowLeadsToItsField) {
  const Task task = makeTask("", "");
  const auto *start = reinterpret_cast<const char *>(task.get());
  const ZELO_SCHED_TASK *constTask = task.get();
  for (size_t i = 0; i < kRowCount; ++i) {
    EXPECT_EQ(parm_table[i].fieldOf(task.get()), start + kExpectedRows[i].offset)
        << kExpectedRows[i].key;
    EXPECT_EQ(parm_table[i].fieldOf(constTask), start + kExpectedRows[i].offset)
        << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, TextRowsHaveTheCapacityOfTheirFieldAndOthersNone) {
  for (size_t i = 0; i < kRowCount; ++i) {
    EXPECT_EQ(parm_table[i].capacity, kExpectedRows[i].capacity) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, OnlyNumbersHaveConversions) {
  for (size_t i = 0; i < kRowCount; ++i) {
    const Kind kind = kExpectedRows[i].kind;
    const bool isNumber = kind == Kind::kSigned || kind == Kind::kUnsigned;
    EXPECT_EQ(parm_table[i].ToHashStr != nullptr, isNumber) << kExpectedRows[i].key;
    EXPECT_EQ(parm_table[i].fnFromHashStr != nullptr, isNumber) << kExpectedRows[i].key;
    EXPECT_NE(parm_table[i].compare, nullptr) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, OnlyStateAndTypeHaveAnEnumeration) {
  for (size_t i = 0; i < kRowCount; ++i) {
    const Kind kind = kExpectedRows[i].kind;
    const ZELO_SCHED_ENUM *wanted =
        kind == Kind::kState ? kStateEnum : (kind == Kind::kType ? kTypeEnum : nullptr);
    EXPECT_EQ(parm_table[i].enumList, wanted) << kExpectedRows[i].key;
  }
}

struct ExpectedName {
  int32_t value;
  const char *name;
};

void expectList(const ZELO_SCHED_ENUM *list, const std::vector<ExpectedName> &wanted) {
  for (const ExpectedName &entry : wanted) {
    ASSERT_NE(list->szName, nullptr) << entry.name;
    EXPECT_EQ(list->value, entry.value);
    EXPECT_STREQ(list->szName, entry.name);
    ++list;
  }
  EXPECT_EQ(list->szName, nullptr);
  EXPECT_EQ(list->value, -1);
}

TEST_F(SchedParmTableTest, TheStateListIsCompleteAndInOrder) {
  expectList(kStateEnum, {{0, "disabled"}, {1, "enabled"}, {2, "NotExisted"}});
}

TEST_F(SchedParmTableTest, TheTypeListIsCompleteAndInOrder) {
  expectList(kTypeEnum, {{0, "once"}, {1, "daily"}, {2, "weekly"}, {3, "monthly"}, {4, "yearly"}});
}

// The record is shared with programs that were compiled long ago.
TEST_F(SchedParmTableTest, TheRecordKeepsTheOrderAndTheSizesOfItsFields) {
  struct Field {
    const char *name;
    size_t offset;
    size_t size;
  };
#define FIELD_OF_RECORD(name) \
  { #name, offsetof(ZELO_SCHED_TASK, name), sizeof(ZELO_SCHED_TASK::name) }
  const Field fields[] = {
      FIELD_OF_RECORD(next),
      FIELD_OF_RECORD(Backend),
      FIELD_OF_RECORD(ID),
      FIELD_OF_RECORD(Owner),
      FIELD_OF_RECORD(Name),
      FIELD_OF_RECORD(NextTriggerTime),
      FIELD_OF_RECORD(State),
      FIELD_OF_RECORD(Type),
      FIELD_OF_RECORD(Week),
      FIELD_OF_RECORD(StartYear),
      FIELD_OF_RECORD(StartMonth),
      FIELD_OF_RECORD(StartDay),
      FIELD_OF_RECORD(RunHour),
      FIELD_OF_RECORD(RunMin),
      FIELD_OF_RECORD(RepeatHour),
      FIELD_OF_RECORD(LastWorkHour),
      FIELD_OF_RECORD(EditDialog),
      FIELD_OF_RECORD(EditForm),
      FIELD_OF_RECORD(SimpleEditForm),
      FIELD_OF_RECORD(Listable),
      FIELD_OF_RECORD(CanEditName),
      FIELD_OF_RECORD(CanEditOwner),
      FIELD_OF_RECORD(CanRunAppSameTime),
      FIELD_OF_RECORD(CanRunTaskSameTime),
      FIELD_OF_RECORD(CanRunFromUI),
      FIELD_OF_RECORD(CanDeleteFromUI),
      FIELD_OF_RECORD(CanEditFromUI),
      FIELD_OF_RECORD(App),
      FIELD_OF_RECORD(AppName),
      FIELD_OF_RECORD(AppArgs),
      FIELD_OF_RECORD(Action),
      FIELD_OF_RECORD(Command),
  };
  const size_t sizes[] = {
      sizeof(void *), 4,    4, 4, 4096, 1024, 4, 4, 8, 4, 4, 4,    4,    4,    4,    4,
      1024,           1024, 4, 4, 4,    4,    4, 4, 4, 4, 4, 1024, 1024, 8192, 1024, 16384};
  ASSERT_EQ(std::size(fields), 32U);
  ASSERT_EQ(std::size(sizes), std::size(fields));
  size_t end = 0;
  for (size_t i = 0; i < std::size(fields); ++i) {
    EXPECT_EQ(fields[i].offset, end) << fields[i].name;
    EXPECT_EQ(fields[i].size, sizes[i]) << fields[i].name;
    end = fields[i].offset + fields[i].size;
  }
}

// ---- conversions of signed numbers

struct Conversion {
  const char *text;
  int32_t value;
};

TEST_F(SchedParmTableTest, ASignedNumberIsWrittenAsSignedDecimal) {
  for (const Conversion &wanted :
       {Conversion{"0", 0}, {"-1", -1}, {"2147483647", INT32_MAX}, {"-2147483648", INT32_MIN}}) {
    EXPECT_EQ(textOf(rowOf("id"), &wanted.value), wanted.text);
  }
}

TEST_F(SchedParmTableTest, ASignedNumberIsReadWithBlanksAndSignInFront) {
  for (const Conversion &wanted : {Conversion{"12", 12},
                                   {"-7", -7},
                                   {"+7", 7},
                                   {"  \t-8", -8},
                                   {"010", 10},
                                   {"-2147483648", INT32_MIN},
                                   {"2147483647", INT32_MAX}}) {
    int32_t field = 99;
    EXPECT_EQ(rowOf("id").fnFromHashStr(&field, wanted.text), 0) << wanted.text;
    EXPECT_EQ(field, wanted.value) << wanted.text;
  }
}

TEST_F(SchedParmTableTest, WhatFollowsASignedNumberIsIgnored) {
  for (const Conversion &wanted : {Conversion{"12abc", 12}, {"3 4", 3}, {"0x10", 0}, {"1.5", 1}}) {
    int32_t field = 99;
    EXPECT_EQ(rowOf("listable").fnFromHashStr(&field, wanted.text), 0) << wanted.text;
    EXPECT_EQ(field, wanted.value) << wanted.text;
  }
  EXPECT_EQ(errorRecord().code, 0);
}

TEST_F(SchedParmTableTest, ATextWithoutDigitsIsSignedZero) {
  for (const char *text : {"", "abc", "-", " "}) {
    int32_t field = 99;
    EXPECT_EQ(rowOf("id").fnFromHashStr(&field, text), 0) << text;
    EXPECT_EQ(field, 0) << text;
  }
}

// ---- conversions of unsigned numbers

TEST_F(SchedParmTableTest, AnUnsignedNumberIsWrittenAsUnsignedDecimal) {
  for (const auto &[text, value] :
       {std::pair<const char *, uint32_t>{"0", 0}, {"23", 23}, {"4294967295", UINT32_MAX}}) {
    EXPECT_EQ(textOf(rowOf("owner"), &value), text);
  }
}

TEST_F(SchedParmTableTest, AnUnsignedNumberIsRead) {
  for (const auto &[text, value] : {std::pair<const char *, uint32_t>{"0", 0},
                                    {"08", 8},
                                    {"  17", 17},
                                    {"4294967295", UINT32_MAX}}) {
    uint32_t field = 99;
    EXPECT_EQ(rowOf("run hour").fnFromHashStr(&field, text), 0) << text;
    EXPECT_EQ(field, value) << text;
  }
}

TEST_F(SchedParmTableTest, WhatFollowsAnUnsignedNumberFailsAfterTheNumberWasStored) {
  for (const auto &[text, value] :
       {std::pair<const char *, uint32_t>{"12abc", 12}, {"5x", 5}, {"3 ", 3}, {"x", 0}}) {
    QLIBCErrSetEx(0, "", 0);
    uint32_t field = 99;
    EXPECT_LT(rowOf("run hour").fnFromHashStr(&field, text), 0) << text;
    EXPECT_EQ(field, value) << text;
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x4000, "sched_parm_table.cpp"})) << text;
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedParmTableTest, AnEmptyTextIsUnsignedZero) {
  uint32_t field = 99;
  EXPECT_EQ(rowOf("run hour").fnFromHashStr(&field, ""), 0);
  EXPECT_EQ(field, 0U);
  EXPECT_EQ(errorRecord().code, 0);
}

// Short texts are read another way than long ones.
TEST_F(SchedParmTableTest, NumbersOfEveryLengthAreReadAsTheCLibraryReadsThem) {
  const std::string digits = "98765432109876543210";
  for (const char *front : {"", "0", "00000000", "-", "+", " ", "-0"}) {
    for (size_t count = 1; count <= digits.size(); ++count) {
      const std::string text = front + digits.substr(digits.size() - count);
      SCOPED_TRACE(text);
      int32_t field = 99;
      EXPECT_EQ(rowOf("id").fnFromHashStr(&field, text.c_str()), 0);
      EXPECT_EQ(field, static_cast<int32_t>(strtoll(text.c_str(), nullptr, 10)));
      uint32_t unsignedField = 99;
      EXPECT_EQ(rowOf("owner").fnFromHashStr(&unsignedField, text.c_str()), 0);
      EXPECT_EQ(unsignedField, static_cast<uint32_t>(strtoull(text.c_str(), nullptr, 10)));
    }
  }
}

TEST_F(SchedParmTableTest, ANumberThatDoesNotFitItsBufferIsCut) {
  const int32_t field = -12345;
  char text[] = "xxxx";
  EXPECT_EQ(rowOf("id").ToHashStr(&field, text, 3), 0);
  EXPECT_STREQ(text, "-1");
  EXPECT_EQ(text[3], 'x');
  EXPECT_EQ(rowOf("id").ToHashStr(&field, text, 0), 0);
  EXPECT_STREQ(text, "-1");
  EXPECT_EQ(rowOf("id").ToHashStr(&field, text, 1), 0);
  EXPECT_STREQ(text, "");
}

// ---- null arguments of the conversions

const Lines kNoField = {
    "sched_parm_table.cpp:N Invaild Argument (((void *)0) != private_data)=[0]\n"};
const Lines kNoText = {"sched_parm_table.cpp:N Invaild Argument (NULL != str)=[0]\n"};

void expectRefusal(int result, const Lines &lines) {
  EXPECT_LT(result, 0);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_parm_table.cpp"}));
  EXPECT_EQ(logged(), lines);
  EXPECT_EQ(loggedPriorities(), std::vector<int>(lines.size(), 3));
  QLIBCErrSetEx(0, "", 0);
  clearLog();
}

TEST_F(SchedParmTableTest, AConversionNeedsAField) {
  char text[8] = "";
  for (const char *key : {"id", "owner"}) {
    SCOPED_TRACE(key);
    expectRefusal(rowOf(key).ToHashStr(nullptr, text, sizeof(text)), kNoField);
    expectRefusal(rowOf(key).fnFromHashStr(nullptr, "1"), kNoField);
  }
}

TEST_F(SchedParmTableTest, AConversionNeedsAText) {
  int32_t field = 5;
  for (const char *key : {"id", "owner"}) {
    SCOPED_TRACE(key);
    expectRefusal(rowOf(key).ToHashStr(&field, nullptr, 8), kNoText);
    expectRefusal(rowOf(key).fnFromHashStr(&field, nullptr), kNoText);
  }
  EXPECT_EQ(field, 5);
}

TEST_F(SchedParmTableTest, AConversionLooksAtTheFieldFirst) {
  for (const char *key : {"id", "owner"}) {
    SCOPED_TRACE(key);
    expectRefusal(rowOf(key).ToHashStr(nullptr, nullptr, 8), kNoField);
    expectRefusal(rowOf(key).fnFromHashStr(nullptr, nullptr), kNoField);
  }
}

// ---- orderings

TEST_F(SchedParmTableTest, NumbersAreOrderedByTheirPlaceInMemory) {
  const int32_t fields[] = {9, 1};
  for (size_t i = 0; i < kRowCount; ++i) {
    if (kExpectedRows[i].kind == Kind::kText) continue;
    const auto compare = parm_table[i].compare;
    EXPECT_EQ(compare(&fields[0], &fields[1]), -1) << kExpectedRows[i].key;
    EXPECT_EQ(compare(&fields[1], &fields[0]), 1) << kExpectedRows[i].key;
    EXPECT_EQ(compare(&fields[0], &fields[0]), 0) << kExpectedRows[i].key;
  }
}

TEST_F(SchedParmTableTest, TextsAreOrderedByteByByte) {
  for (size_t i = 0; i < kRowCount; ++i) {
    if (kExpectedRows[i].kind != Kind::kText) continue;
    const auto compare = parm_table[i].compare;
    EXPECT_LT(compare("B", "a"), 0) << kExpectedRows[i].key;
    EXPECT_GT(compare("b", "a"), 0) << kExpectedRows[i].key;
    EXPECT_GT(compare("\xC3\xA4", "z"), 0) << kExpectedRows[i].key;
    EXPECT_LT(compare("a", "aa"), 0) << kExpectedRows[i].key;
    EXPECT_EQ(compare("a", std::string("a").c_str()), 0) << kExpectedRows[i].key;
  }
}

// ---- the table of the shipped library, seen from outside

TEST_F(SchedParmTableTest, TheShippedLibraryWritesJustTheKeysOfTheTable) {
  TextHash hash;
  ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), makeTask("a", "b").get()), 0);
  Entries wanted = hash.entries();
  size_t inHash = 0;
  for (const ExpectedRow &row : kExpectedRows) {
    inHash += row.inHash ? 1 : 0;
    EXPECT_EQ(wanted.count(row.key), row.inHash ? 1U : 0U) << row.key;
  }
  EXPECT_EQ(wanted.size(), inHash);
}

TEST_F(SchedParmTableTest, TheShippedLibraryCutsALongArgumentText) {
  TextHash hash;
  ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), makeTask("a", "b").get()), 0);
  Entries entries = hash.entries();
  entries["app args"] = std::string(9000, 'x');
  Task task = makeTask("", "");
  ASSERT_EQ(ZELOSchedInitTaskFromHash(task.get(), TextHash(entries).get()), 0);
  EXPECT_EQ(std::string(task->AppArgs), std::string(8191, 'x'));
  EXPECT_STREQ(task->Action, "a");
}

TEST_F(SchedParmTableTest, TrailingCharactersFailARunHourButNotAnId) {
  TextHash hash;
  ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), makeTask("a", "b").get()), 0);
  Entries entries = hash.entries();
  entries["id"] = "12abc";
  Task task = makeTask("", "");
  EXPECT_EQ(ZELOSchedInitTaskFromHash(task.get(), TextHash(entries).get()), 0);
  EXPECT_EQ(task->ID, 12);
  EXPECT_EQ(errorRecord().code, 0);
  entries["run hour"] = "12abc";
  EXPECT_EQ(ZELOSchedInitTaskFromHash(task.get(), TextHash(entries).get()), -1);
  EXPECT_EQ(task->RunHour, 12U);
  EXPECT_EQ(errorRecord().code, 0x4000);
}

TEST_F(SchedParmTableTest, AStateWithoutANameIsLeftOutOfTheHash) {
  Task task = makeTask("a", "b");
  task->State = 5;
  TextHash hash;
  ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), 0);
  EXPECT_EQ(hash.entries().count("state"), 0U);
  EXPECT_EQ(hash.entries()["type"], "daily");
}

TEST_F(SchedParmTableTest, WeekdaysStartWithSunday) {
  Task task = makeTask("a", "b");
  setText(task->Week, "1010101");
  constexpr const char *kDays[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
  EXPECT_STREQ(ZELOSchedMultiSelectToText(task->Week, kDays, std::size(kDays)), "Sun,Tue,Thu,Sat");
}

}  // namespace
}  // namespace support
