// The accessors of a task record: each row of the tables below is one accessor, and each shape's
// tests are run for all of its rows.
#include <gtest/gtest.h>

#include <cstring>
#include <limits>
#include <sstream>
#include <string>
#include <vector>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"
#include "zeloschedgetter.h"
#include "zeloschedsetter.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kNoTask[] = "((void *)0) != pTask";
constexpr char kNoTaskLast[] = "NULL != pTask";
constexpr char kNoResult[] = "((void *)0) != pVal";
constexpr char kSetters[] = "zeloschedsetter.h";
constexpr char kGetters[] = "zeloschedgetter.h";
constexpr int32_t kUntouched = 4711;

template <class Accessor>
struct Named {
  const char *name;
  Accessor call;
};

struct TypeSetter : Named<int (*)(ZELO_SCHED_TASK *)> {
  int32_t type;
};
struct FlagSetter : Named<int (*)(ZELO_SCHED_TASK *, int32_t)> {
  int32_t ZELO_SCHED_TASK::*field;
};
template <class Number>
struct NumberSetter : Named<int (*)(ZELO_SCHED_TASK *, Number)> {
  Number ZELO_SCHED_TASK::*field;
};
struct TextSetter : Named<int (*)(ZELO_SCHED_TASK *, const char *)> {
  size_t offset;
  size_t capacity;
};
struct YesNoReader : Named<int (*)(int32_t *, const ZELO_SCHED_TASK *)> {
  int32_t ZELO_SCHED_TASK::*field;
  int32_t yes;
};
template <class Number>
struct NumberGetter : Named<int (*)(Number *, const ZELO_SCHED_TASK *)> {
  Number ZELO_SCHED_TASK::*field;
};
struct TextGetter : Named<int (*)(char *, size_t, const ZELO_SCHED_TASK *)> {
  size_t offset;
  size_t capacity;
};

#define FIELD(name) &ZELO_SCHED_TASK::name
#define TEXT(name) offsetof(ZELO_SCHED_TASK, name), sizeof(ZELO_SCHED_TASK::name)
#define ROW(function, ...) \
  { {#function, function}, __VA_ARGS__ }

constexpr TypeSetter kTypeSetters[] = {
    ROW(ZELOSchedCTaskSetOnce, 0),   ROW(ZELOSchedCTaskSetDaily, 1),
    ROW(ZELOSchedCTaskSetWeekly, 2), ROW(ZELOSchedCTaskSetMonthly, 3),
    ROW(ZELOSchedCTaskSetYearly, 4),
};
constexpr FlagSetter kFlagSetters[] = {
    ROW(ZELOSchedCTaskSetState, FIELD(State)),
    ROW(ZELOSchedCTaskSetListable, FIELD(Listable)),
    ROW(ZELOSchedCTaskSetCanEditName, FIELD(CanEditName)),
    ROW(ZELOSchedCTaskSetCanEditOwner, FIELD(CanEditOwner)),
    ROW(ZELOSchedCTaskSetSimpleEditForm, FIELD(SimpleEditForm)),
    ROW(ZELOSchedCTaskSetCanRunAppSameTime, FIELD(CanRunAppSameTime)),
    ROW(ZELOSchedCTaskSetCanRunTaskSameTime, FIELD(CanRunTaskSameTime)),
    ROW(ZELOSchedCTaskSetCanRunFromUI, FIELD(CanRunFromUI)),
    ROW(ZELOSchedCTaskSetCanDeleteFromUI, FIELD(CanDeleteFromUI)),
    ROW(ZELOSchedCTaskSetCanEditFromUI, FIELD(CanEditFromUI)),
};
constexpr NumberSetter<uint32_t> kUnsignedSetters[] = {
    ROW(ZELOSchedCTaskSetOwner, FIELD(Owner)),
    ROW(ZELOSchedCTaskSetStartYear, FIELD(StartYear)),
    ROW(ZELOSchedCTaskSetStartMonth, FIELD(StartMonth)),
    ROW(ZELOSchedCTaskSetStartDay, FIELD(StartDay)),
    ROW(ZELOSchedCTaskSetRunHour, FIELD(RunHour)),
    ROW(ZELOSchedCTaskSetRunMin, FIELD(RunMin)),
    ROW(ZELOSchedCTaskSetRepeatHour, FIELD(RepeatHour)),
    ROW(ZELOSchedCTaskSetLastWorkHour, FIELD(LastWorkHour)),
};
constexpr NumberSetter<int32_t> kSignedSetters[] = {
    ROW(ZELOSchedCTaskSetID, FIELD(ID)),
    ROW(ZELOSchedCTaskSetBackend, FIELD(Backend)),
};
constexpr TextSetter kTextSetters[] = {
    ROW(ZELOSchedCTaskSetEditDialog, offsetof(ZELO_SCHED_TASK, EditDialog), 1024),
    ROW(ZELOSchedCTaskSetEditForm, offsetof(ZELO_SCHED_TASK, EditForm), 1024),
    ROW(ZELOSchedCTaskSetName, offsetof(ZELO_SCHED_TASK, Name), 4096),
    ROW(ZELOSchedCTaskSetAppArgs, offsetof(ZELO_SCHED_TASK, AppArgs), 8192),
    ROW(ZELOSchedCTaskSetAppName, offsetof(ZELO_SCHED_TASK, AppName), 1024),
    ROW(ZELOSchedCTaskSetApp, offsetof(ZELO_SCHED_TASK, App), 1024),
    ROW(ZELOSchedCTaskSetWeek, offsetof(ZELO_SCHED_TASK, Week), 8),
    ROW(ZELOSchedCTaskSetCommand, offsetof(ZELO_SCHED_TASK, Command), 16384),
    ROW(ZELOSchedCTaskSetAction, offsetof(ZELO_SCHED_TASK, Action), 1024),
};
constexpr YesNoReader kYesNoReaders[] = {
    ROW(ZELOSchedCTaskIsOnce, FIELD(Type), 0),
    ROW(ZELOSchedCTaskIsDaily, FIELD(Type), 1),
    ROW(ZELOSchedCTaskIsWeekly, FIELD(Type), 2),
    ROW(ZELOSchedCTaskIsMonthly, FIELD(Type), 3),
    ROW(ZELOSchedCTaskIsYearly, FIELD(Type), 4),
    ROW(ZELOSchedCTaskIsNew, FIELD(ID), -1),
    ROW(ZELOSchedCTaskIsEnabled, FIELD(State), 1),
    ROW(ZELOSchedCTaskIsListable, FIELD(Listable), 1),
    ROW(ZELOSchedCTaskIsCanEditName, FIELD(CanEditName), 1),
    ROW(ZELOSchedCTaskIsCanEditOwner, FIELD(CanEditOwner), 1),
    ROW(ZELOSchedCTaskIsSimpleEditForm, FIELD(SimpleEditForm), 1),
    ROW(ZELOSchedCTaskIsCanRunAppSameTime, FIELD(CanRunAppSameTime), 1),
    ROW(ZELOSchedCTaskIsCanRunTaskSameTime, FIELD(CanRunTaskSameTime), 1),
    ROW(ZELOSchedCTaskIsCanRunFromUI, FIELD(CanRunFromUI), 1),
    ROW(ZELOSchedCTaskIsCanDeleteFromUI, FIELD(CanDeleteFromUI), 1),
    ROW(ZELOSchedCTaskIsCanEditFromUI, FIELD(CanEditFromUI), 1),
};
constexpr NumberGetter<uint32_t> kUnsignedGetters[] = {
    ROW(ZELOSchedCTaskGetOwner, FIELD(Owner)),
    ROW(ZELOSchedCTaskGetStartYear, FIELD(StartYear)),
    ROW(ZELOSchedCTaskGetStartMonth, FIELD(StartMonth)),
    ROW(ZELOSchedCTaskGetStartDay, FIELD(StartDay)),
    ROW(ZELOSchedCTaskGetRunHour, FIELD(RunHour)),
    ROW(ZELOSchedCTaskGetRunMin, FIELD(RunMin)),
    ROW(ZELOSchedCTaskGetRepeatHour, FIELD(RepeatHour)),
    ROW(ZELOSchedCTaskGetLastWorkHour, FIELD(LastWorkHour)),
};
constexpr NumberGetter<int32_t> kSignedGetters[] = {
    ROW(ZELOSchedCTaskGetID, FIELD(ID)),
    ROW(ZELOSchedCTaskGetBackend, FIELD(Backend)),
};
constexpr TextGetter kTextGetters[] = {
    ROW(ZELOSchedCTaskGetName, TEXT(Name)),
    ROW(ZELOSchedCTaskGetAppArgs, TEXT(AppArgs)),
    ROW(ZELOSchedCTaskGetAppName, TEXT(AppName)),
    ROW(ZELOSchedCTaskGetEditForm, TEXT(EditForm)),
    ROW(ZELOSchedCTaskGetEditDialog, TEXT(EditDialog)),
    ROW(ZELOSchedCTaskGetApp, TEXT(App)),
    ROW(ZELOSchedCTaskGetWeek, TEXT(Week)),
    ROW(ZELOSchedCTaskGetCommand, TEXT(Command)),
    ROW(ZELOSchedCTaskGetAction, TEXT(Action)),
    ROW(ZELOSchedCTaskGetNextTriggerTime, TEXT(NextTriggerTime)),
};

// The number of the line on which a header lists the accessor.
int lineInHeader(const std::string &header, const std::string &name) {
  std::istringstream text(readFile(ZELO_SOURCE_DIR "/libzeloscheduler/include/" + header));
  std::string line;
  for (int number = 1; std::getline(text, line); ++number) {
    if (line.find("(" + name + ",") != std::string::npos) {
      return number;
    }
  }
  return 0;
}

bool sameRecords(const ZELO_SCHED_TASK &left, const ZELO_SCHED_TASK &right) {
  return std::memcmp(&left, &right, sizeof(left)) == 0;
}

class AccessorsTest : public SandboxTest {
 protected:
  // Filled with a byte that no accessor writes, so that every change shows.
  AccessorsTest() { std::memset(static_cast<void *>(&task), 'x', sizeof(task)); }

  char *textAt(size_t offset) { return reinterpret_cast<char *>(&task) + offset; }

  // Each accessor of a shape: one line that names the accessor's own line in the header, and the
  // code.
  template <class Rows, class Call>
  static void expectEachRefused(const std::string &header, const Rows &rows,
                                const std::string &condition, const Call &call) {
    for (const auto &row : rows) {
      SCOPED_TRACE(row.name);
      clearLog();
      QLIBCErrSetEx(0, "", 0);
      EXPECT_EQ(call(row), -1);
      EXPECT_EQ(loggedRaw(), Lines{header + ":" + std::to_string(lineInHeader(header, row.name)) +
                                   " Invaild Argument (" + condition + ")=[0]\n"});
      EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
      EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, header}));
    }
  }

  template <class Number, size_t count>
  void expectNumbersStoredAsTheyAre(const NumberSetter<Number> (&setters)[count]) {
    for (const auto &row : setters) {
      SCOPED_TRACE(row.name);
      for (const Number value :
           {std::numeric_limits<Number>::min(), Number{99}, std::numeric_limits<Number>::max()}) {
        ZELO_SCHED_TASK wanted = task;
        wanted.*row.field = value;
        EXPECT_EQ(row.call(&task, value), 0);
        EXPECT_TRUE(sameRecords(task, wanted)) << value;
      }
    }
  }

  template <class Number, size_t count>
  void expectNumbersReadAsTheyAre(const NumberGetter<Number> (&getters)[count]) {
    for (const auto &row : getters) {
      SCOPED_TRACE(row.name);
      for (const Number value :
           {std::numeric_limits<Number>::min(), Number{99}, std::numeric_limits<Number>::max()}) {
        task.*row.field = value;
        Number read = 0;
        EXPECT_EQ(row.call(&read, &task), 0);
        EXPECT_EQ(read, value);
      }
      task.*row.field = 0;
    }
  }

  ZELO_SCHED_TASK task;
};

TEST_F(AccessorsTest, ATypeSetterStoresItsTypeAndNothingElse) {
  for (const auto &row : kTypeSetters) {
    SCOPED_TRACE(row.name);
    ZELO_SCHED_TASK wanted = task;
    wanted.Type = row.type;
    EXPECT_EQ(row.call(&task), 0);
    EXPECT_TRUE(sameRecords(task, wanted));
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, ASetterOfATypeAFlagOrANumberRefusesNull) {
  const auto callWithOne = [](const auto &row) { return row.call(nullptr, 1); };
  expectEachRefused(kSetters, kTypeSetters, kNoTask,
                    [](const auto &row) { return row.call(nullptr); });
  expectEachRefused(kSetters, kFlagSetters, kNoTask, callWithOne);
  expectEachRefused(kSetters, kUnsignedSetters, kNoTask, callWithOne);
  expectEachRefused(kSetters, kSignedSetters, kNoTask, callWithOne);
}

TEST_F(AccessorsTest, AFlagSetterStoresOneForOneAndZeroForAllElse) {
  for (const auto &row : kFlagSetters) {
    SCOPED_TRACE(row.name);
    for (const int32_t value : {1, 0, 2, -1, std::numeric_limits<int32_t>::min()}) {
      ZELO_SCHED_TASK wanted = task;
      wanted.*row.field = value == 1 ? 1 : 0;
      EXPECT_EQ(row.call(&task, value), 0);
      EXPECT_TRUE(sameRecords(task, wanted)) << value;
    }
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, SetListableWithTwoStoresZero) {
  EXPECT_EQ(ZELOSchedCTaskSetListable(&task, 2), 0);
  EXPECT_EQ(task.Listable, 0);
}

TEST_F(AccessorsTest, SetStateWithTwoMakesTheTaskDisabled) {
  EXPECT_EQ(ZELOSchedCTaskSetState(&task, 2), 0);
  EXPECT_EQ(task.State, ZELO_SCHED_STATE_DISABLED);
}

TEST_F(AccessorsTest, ANumberSetterStoresTheNumberUnchecked) {
  expectNumbersStoredAsTheyAre(kUnsignedSetters);
  expectNumbersStoredAsTheyAre(kSignedSetters);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, SetRunHourTakesNinetyNine) {
  EXPECT_EQ(ZELOSchedCTaskSetRunHour(&task, 99), 0);
  EXPECT_EQ(task.RunHour, 99U);
}

TEST_F(AccessorsTest, ATextSetterStoresTheText) {
  for (const auto &row : kTextSetters) {
    SCOPED_TRACE(row.name);
    for (const char *text : {"", "abc", "1\n\xff%s"}) {
      EXPECT_EQ(row.call(&task, text), 0);
      EXPECT_STREQ(textAt(row.offset), text);
    }
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, ATextSetterCutsToTheCapacityLessOneAndWritesNoFurther) {
  for (const auto &row : kTextSetters) {
    SCOPED_TRACE(row.name);
    ZELO_SCHED_TASK wanted = task;
    auto *field = reinterpret_cast<char *>(&wanted) + row.offset;
    std::memset(field, 'y', row.capacity - 1);
    field[row.capacity - 1] = '\0';
    EXPECT_EQ(row.call(&task, std::string(row.capacity, 'y').c_str()), 0);
    EXPECT_TRUE(sameRecords(task, wanted));
  }
}

TEST_F(AccessorsTest, ATextSetterTakesATextThatJustFits) {
  for (const auto &row : kTextSetters) {
    SCOPED_TRACE(row.name);
    const std::string text(row.capacity - 1, 'y');
    EXPECT_EQ(row.call(&task, text.c_str()), 0);
    EXPECT_EQ(textAt(row.offset), text);
  }
}

TEST_F(AccessorsTest, ATextSetterMayBeGivenAPartOfItsOwnField) {
  for (const auto &row : kTextSetters) {
    SCOPED_TRACE(row.name);
    EXPECT_EQ(row.call(&task, "abcdefg"), 0);
    EXPECT_EQ(row.call(&task, textAt(row.offset) + 2), 0);
    EXPECT_STREQ(textAt(row.offset), "cdefg");
  }
}

TEST_F(AccessorsTest, SetWeekKeepsTheFirstSevenOfEight) {
  EXPECT_EQ(ZELOSchedCTaskSetWeek(&task, "12345678"), 0);
  EXPECT_STREQ(task.Week, "1234567");
}

TEST_F(AccessorsTest, ATextSetterRefusesANullTextFirst) {
  const ZELO_SCHED_TASK before = task;
  for (ZELO_SCHED_TASK *pTask : {static_cast<ZELO_SCHED_TASK *>(nullptr), &task}) {
    expectEachRefused(kSetters, kTextSetters, "((void *)0) != szVal",
                      [&](const auto &row) { return row.call(pTask, nullptr); });
  }
  EXPECT_TRUE(sameRecords(task, before));
}

TEST_F(AccessorsTest, ATextSetterRefusesANullTask) {
  expectEachRefused(kSetters, kTextSetters, kNoTaskLast,
                    [](const auto &row) { return row.call(nullptr, "text"); });
}

TEST_F(AccessorsTest, AYesNoReaderTestsForExactlyItsValue) {
  for (const auto &row : kYesNoReaders) {
    SCOPED_TRACE(row.name);
    for (const int32_t value : {-1, 0, 1, 2, 3, 4, 5, std::numeric_limits<int32_t>::max()}) {
      task.*row.field = value;
      int32_t read = kUntouched;
      EXPECT_EQ(row.call(&read, &task), 0);
      EXPECT_EQ(read, value == row.yes ? 1 : 0) << value;
    }
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, AReaderRefusesANullResultFirst) {
  const auto callWithNothing = [](const auto &row) { return row.call(nullptr, nullptr); };
  expectEachRefused(kGetters, kYesNoReaders, kNoResult, callWithNothing);
  expectEachRefused(kGetters, kUnsignedGetters, kNoResult, callWithNothing);
  expectEachRefused(kGetters, kSignedGetters, kNoResult, callWithNothing);
}

TEST_F(AccessorsTest, AReaderRefusesANullTaskAndLeavesTheResult) {
  const auto callWithoutTask = [this](const auto &row) {
    auto read = task.*row.field;
    read = kUntouched;
    const int result = row.call(&read, nullptr);
    EXPECT_TRUE(read == kUntouched) << read;
    return result;
  };
  expectEachRefused(kGetters, kYesNoReaders, kNoTaskLast, callWithoutTask);
  expectEachRefused(kGetters, kUnsignedGetters, kNoTaskLast, callWithoutTask);
  expectEachRefused(kGetters, kSignedGetters, kNoTaskLast, callWithoutTask);
}

TEST_F(AccessorsTest, ANumberGetterReadsTheNumberAsItIs) {
  expectNumbersReadAsTheyAre(kUnsignedGetters);
  expectNumbersReadAsTheyAre(kSignedGetters);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, ATextGetterReadsAFieldThatIsFull) {
  for (const auto &row : kTextGetters) {
    SCOPED_TRACE(row.name);
    const std::string text(row.capacity - 1, 'y');
    std::memset(textAt(0), 'x', sizeof(task));  // no other field has that text
    std::memcpy(textAt(row.offset), text.c_str(), row.capacity);
    std::vector<char> read(row.capacity + 1, '#');
    EXPECT_EQ(row.call(read.data(), row.capacity, &task), 0);
    EXPECT_EQ(read.data(), text);
    EXPECT_EQ(read.back(), '#');
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(AccessorsTest, ATextGetterCutsToTheBufferLessOneAndWritesNoFurther) {
  for (const auto &row : kTextGetters) {
    SCOPED_TRACE(row.name);
    std::memset(textAt(0), 'x', sizeof(task));
    std::memcpy(textAt(row.offset), "abcdef", sizeof("abcdef"));
    char read[] = "#######";
    EXPECT_EQ(row.call(read, 4, &task), 0);
    EXPECT_STREQ(read, "abc");
    EXPECT_STREQ(read + 4, "###");
  }
}

TEST_F(AccessorsTest, GetCommandIntoOneCharacterGivesAnEmptyText) {
  std::memcpy(task.Command, "ls", sizeof("ls"));
  char read[] = "##";
  EXPECT_EQ(ZELOSchedCTaskGetCommand(read, 1, &task), 0);
  EXPECT_STREQ(read, "");
  EXPECT_EQ(read[1], '#');
}

TEST_F(AccessorsTest, ATextGetterRefusesANullBufferThenASizeOfZeroThenANullTask) {
  char read[] = "#";
  expectEachRefused(kGetters, kTextGetters, "((void *)0) != szBuf",
                    [](const auto &row) { return row.call(nullptr, 0, nullptr); });
  expectEachRefused(kGetters, kTextGetters, "0 < cbBuf",
                    [&](const auto &row) { return row.call(read, 0, nullptr); });
  EXPECT_STREQ(read, "#");
  expectEachRefused(kGetters, kTextGetters, kNoTaskLast,
                    [&](const auto &row) { return row.call(read, sizeof(read), nullptr); });
  EXPECT_STREQ(read, "#");
}

}  // namespace
}  // namespace support
