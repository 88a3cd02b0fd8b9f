// A task to and from its hash form.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "refused_arguments.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "text_hash.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr const char *kRequiredKeys[] = {"id",       "run hour", "run min", "name",  "app",
                                         "app name", "action",   "cmd",     "state", "type"};

// In the order in which they are set and read.
constexpr const char *kKeys[] = {"id",
                                 "can edit owner",
                                 "can edit name",
                                 "listable",
                                 "can run from ui",
                                 "can delete from ui",
                                 "can edit from ui",
                                 "can run app same time",
                                 "can run task same time",
                                 "simple edit form",
                                 "owner",
                                 "start year",
                                 "start month",
                                 "start day",
                                 "run hour",
                                 "run min",
                                 "repeat hour",
                                 "last work hour",
                                 "name",
                                 "edit form",
                                 "edit dialog",
                                 "app",
                                 "app name",
                                 "app args",
                                 "action",
                                 "week",
                                 "cmd",
                                 "state",
                                 "type"};

struct UnsignedRow {
  const char *key;
  int row;
  uint32_t ZELO_SCHED_TASK::*field;
};

constexpr UnsignedRow kUnsignedRows[] = {
    {"owner", 11, &ZELO_SCHED_TASK::Owner},
    {"start year", 12, &ZELO_SCHED_TASK::StartYear},
    {"start month", 13, &ZELO_SCHED_TASK::StartMonth},
    {"start day", 14, &ZELO_SCHED_TASK::StartDay},
    {"run hour", 15, &ZELO_SCHED_TASK::RunHour},
    {"run min", 16, &ZELO_SCHED_TASK::RunMin},
    {"repeat hour", 17, &ZELO_SCHED_TASK::RepeatHour},
    {"last work hour", 18, &ZELO_SCHED_TASK::LastWorkHour},
};

struct SignedRow {
  const char *key;
  int32_t ZELO_SCHED_TASK::*field;
  int32_t defaultValue;
};

constexpr SignedRow kFlagRows[] = {
    {"can edit owner", &ZELO_SCHED_TASK::CanEditOwner, 1},
    {"can edit name", &ZELO_SCHED_TASK::CanEditName, 1},
    {"listable", &ZELO_SCHED_TASK::Listable, 1},
    {"can run from ui", &ZELO_SCHED_TASK::CanRunFromUI, 1},
    {"can delete from ui", &ZELO_SCHED_TASK::CanDeleteFromUI, 1},
    {"can edit from ui", &ZELO_SCHED_TASK::CanEditFromUI, 1},
    {"can run app same time", &ZELO_SCHED_TASK::CanRunAppSameTime, 1},
    {"can run task same time", &ZELO_SCHED_TASK::CanRunTaskSameTime, 0},
    {"simple edit form", &ZELO_SCHED_TASK::SimpleEditForm, 0},
};

const Entries kDefaultsWithLs = {{"id", "-1"},
                                 {"can edit owner", "1"},
                                 {"can edit name", "1"},
                                 {"listable", "1"},
                                 {"can run from ui", "1"},
                                 {"can delete from ui", "1"},
                                 {"can edit from ui", "1"},
                                 {"can run app same time", "1"},
                                 {"can run task same time", "0"},
                                 {"simple edit form", "0"},
                                 {"owner", "0"},
                                 {"start year", "2012"},
                                 {"start month", "1"},
                                 {"start day", "1"},
                                 {"run hour", "0"},
                                 {"run min", "0"},
                                 {"repeat hour", "0"},
                                 {"last work hour", "0"},
                                 {"name", ""},
                                 {"edit form", ""},
                                 {"edit dialog", "ZELO.TOV.TaskScheduler.EditDialog"},
                                 {"app", ""},
                                 {"app name", ""},
                                 {"app args", ""},
                                 {"action", ""},
                                 {"week", "1111111"},
                                 {"cmd", "bHM="},
                                 {"state", "enabled"},
                                 {"type", "daily"}};

// Called whenever the error record is set.
void (*onErrorSet)() = nullptr;

class SchedTaskConvertTest : public SandboxTest {
 protected:
  void TearDown() override {
    onErrorSet = nullptr;
    SandboxTest::TearDown();
  }

  static Task plainTask(const std::string &command) {
    Task task = makeTask("", command);
    task->App[0] = task->AppName[0] = task->Action[0] = '\0';
    return task;
  }

  static Entries entriesOf(const Task &task) {
    TextHash hash;
    EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), 0);
    return hash.entries();
  }

  static int read(const Entries &entries, const Task &task) {
    return ZELOSchedInitTaskFromHash(task.get(), TextHash(entries).get());
  }

  static Entries with(const std::string &key, const std::string &value) {
    Entries entries = kDefaultsWithLs;
    entries[key] = value;
    return entries;
  }

  static Entries without(const std::string &key) {
    Entries entries = kDefaultsWithLs;
    entries.erase(key);
    return entries;
  }
};

void expectLine(const std::string &line) {
  EXPECT_EQ(logged(), Lines{"sched_task_convert.cpp:N " + line});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

const std::string kInjectedTail = "[0x1234 injected.cpp:N]";
const ErrorRecord kInjectedError = {0x1234, kInjectedFile};

// ---- task to hash

TEST_F(SchedTaskConvertTest, ANewDailyTaskHasTheDocumentedHashForm) {
  EXPECT_EQ(entriesOf(plainTask("ls")), kDefaultsWithLs);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedTaskConvertTest, TheBackendAndTheNextTriggerTimeStayOut) {
  Task task = plainTask("ls");
  task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
  setText(task->NextTriggerTime, "2013-05-07 08:30");
  EXPECT_EQ(entriesOf(task), kDefaultsWithLs);
}

TEST_F(SchedTaskConvertTest, EveryFieldIsWrittenUnderItsKey) {
  Task task = plainTask("ls");
  Entries wanted = kDefaultsWithLs;
  task->ID = INT32_MIN;
  wanted["id"] = "-2147483648";
  int32_t flag = 10;
  for (const SignedRow &row : kFlagRows) {
    task.get()->*row.field = -flag;
    wanted[row.key] = std::to_string(-flag++);
  }
  uint32_t number = UINT32_MAX;
  for (const UnsignedRow &row : kUnsignedRows) {
    task.get()->*row.field = number;
    wanted[row.key] = std::to_string(number--);
  }
  setText(task->Name, wanted["name"] = "the name");
  setText(task->EditForm, wanted["edit form"] = "the form");
  setText(task->EditDialog, wanted["edit dialog"] = "the dialog");
  setText(task->App, wanted["app"] = "the app");
  setText(task->AppName, wanted["app name"] = "the app's name");
  setText(task->AppArgs, wanted["app args"] = "the arguments");
  setText(task->Action, wanted["action"] = "the action");
  setText(task->Week, wanted["week"] = "0100001");
  task->State = ZELO_SCHED_STATE_DISABLED;
  wanted["state"] = "disabled";
  task->Type = ZELO_SCHED_TYPE_YEARLY;
  wanted["type"] = "yearly";
  EXPECT_EQ(entriesOf(task), wanted);
}

TEST_F(SchedTaskConvertTest, StatesAndTypesAreWrittenByName) {
  constexpr const char *kStates[] = {"disabled", "enabled", "NotExisted"};
  for (int32_t state = 0; state < 3; ++state) {
    Task task = plainTask("ls");
    task->State = state;
    EXPECT_EQ(entriesOf(task), with("state", kStates[state]));
  }
  constexpr const char *kTypes[] = {"once", "daily", "weekly", "monthly", "yearly"};
  for (int32_t type = 0; type < 5; ++type) {
    Task task = plainTask("ls");
    task->Type = type;
    EXPECT_EQ(entriesOf(task), with("type", kTypes[type]));
  }
}

TEST_F(SchedTaskConvertTest, AValueWithoutANameIsLeftOut) {
  Task task = plainTask("ls");
  task->State = 5;
  EXPECT_EQ(entriesOf(task), without("state"));
  task->State = ZELO_SCHED_STATE_ENABLED;
  task->Type = -1;
  EXPECT_EQ(entriesOf(task), without("type"));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedTaskConvertTest, TheHashIsEmptiedFirst) {
  TextHash hash(Entries{{"left over", "x"}, {"backend", "7"}, {"state", "x"}});
  Task task = plainTask("ls");
  task->State = 5;
  ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), 0);
  EXPECT_EQ(hash.entries(), without("state"));
}

TEST_F(SchedTaskConvertTest, ALineFeedInATextBecomesABlank) {
  Task task = plainTask("ls");
  setText(task->Name, "a\nb");
  setText(task->EditForm, "\n");
  setText(task->EditDialog, "\n\nx\n");
  setText(task->App, "a\n");
  setText(task->AppName, "\na");
  setText(task->AppArgs, std::string(8191, '\n'));
  setText(task->Action, "a\r\nb\tc");
  setText(task->Week, "1\n11111");
  Entries wanted = kDefaultsWithLs;
  wanted["name"] = "a b";
  wanted["edit form"] = " ";
  wanted["edit dialog"] = "  x ";
  wanted["app"] = "a ";
  wanted["app name"] = " a";
  wanted["app args"] = std::string(8191, ' ');
  wanted["action"] = "a\r b\tc";
  wanted["week"] = "1 11111";
  EXPECT_EQ(entriesOf(task), wanted);
}

TEST_F(SchedTaskConvertTest, TheTaskItselfKeepsItsLineFeeds) {
  Task task = plainTask("a\nb");
  setText(task->Name, "a\nb");
  entriesOf(task);
  EXPECT_STREQ(task->Name, "a\nb");
  EXPECT_STREQ(task->Command, "a\nb");
}

TEST_F(SchedTaskConvertTest, TheCommandIsEncodedBeforeLineFeedsAreReplaced) {
  EXPECT_EQ(entriesOf(plainTask("a\nb")), with("cmd", "YQpi"));
}

TEST_F(SchedTaskConvertTest, AnEmptyCommandIsAnEmptyValue) {
  EXPECT_EQ(entriesOf(plainTask("")), with("cmd", ""));
}

TEST_F(SchedTaskConvertTest, TheLongestCommandIsEncodedWhole) {
  const std::string encoded = entriesOf(plainTask(std::string(16383, 'a')))["cmd"];
  EXPECT_EQ(encoded.size(), 16383U / 3 * 4);
  EXPECT_EQ(encoded.find('\n'), std::string::npos);
}

TEST_F(SchedTaskConvertTest, AnArgumentThatIsMissingIsRefusedInTheOrderOfTheChecks) {
  const Task task = plainTask("ls");
  PSZHASH none = nullptr;
  TextHash hash(Entries{{"kept", "x"}});
  const TextHash whole(kDefaultsWithLs);
  expectRefused(
      "sched_task_convert.cpp",
      {{"((void *)0) != ppHash", [&] { return ZELOSchedInitHashFromTask(nullptr, task.get()); }},
       {"((void *)0) != *ppHash", [&] { return ZELOSchedInitHashFromTask(&none, task.get()); }},
       {"NULL != pTask", [&] { return ZELOSchedInitHashFromTask(hash.handle(), nullptr); }},
       {"((void *)0) != ppHash", [] { return ZELOSchedInitHashFromTask(nullptr, nullptr); }},
       {"((void *)0) != *ppHash", [&] { return ZELOSchedInitHashFromTask(&none, nullptr); }},
       {"((void *)0) != pHash", [&] { return ZELOSchedInitTaskFromHash(task.get(), nullptr); }},
       {"NULL != pTask", [&] { return ZELOSchedInitTaskFromHash(nullptr, whole.get()); }},
       {"((void *)0) != pHash", [] { return ZELOSchedInitTaskFromHash(nullptr, nullptr); }}});
  EXPECT_EQ(hash.entries(), (Entries{{"kept", "x"}}));
}

TEST_F(SchedTaskConvertTest, AKeyThatCannotBeSetEndsTheWritingAfterTheKeysBeforeIt) {
  const Task task = plainTask("ls");
  Entries before;
  for (const char *key : kKeys) {
    SCOPED_TRACE(key);
    const std::string value = std::string(key) == "cmd" ? "ls" : kDefaultsWithLs.at(key);
    resetFailingCalls();
    clearLog();
    failCallFor("QLIBCSzHashSetValue", key, {.code = 0x1234});
    TextHash hash;
    EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), -1);
    expectLine("Set hash value failed. key:[" + std::string(key) + "], val:[" + value + "]. " +
               kInjectedTail);
    EXPECT_EQ(errorRecord(), kInjectedError);
    EXPECT_EQ(hash.entries(), before);
    before[key] = value;
  }
}

TEST_F(SchedTaskConvertTest, ACommandThatCannotBeReadBackEndsTheWriting) {
  failCallFor("QLIBCSzHashGetValue", "cmd");
  TextHash hash;
  EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), plainTask("ls").get()), -1);
  expectLine("Failed to get cmd in hash");
}

TEST_F(SchedTaskConvertTest, ACommandThatCannotBeEncodedIsShownPlain) {
  failCall("SzBase64EncodeFull", {.code = 0x1234});
  TextHash hash;
  EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), plainTask("ls -l").get()), -1);
  expectLine("Base64 encoding failed. [ls -l] " + kInjectedTail);
  EXPECT_EQ(errorRecord(), kInjectedError);
}

TEST_F(SchedTaskConvertTest, AnEncodedCommandThatCannotBeSetIsShownEncoded) {
  failCallFor("QLIBCSzHashSetValue", "cmd", {.from = 2, .code = 0x1234});
  TextHash hash;
  EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), plainTask("ls").get()), -1);
  expectLine("set hash failed. key:[cmd], val:[bHM=] " + kInjectedTail);
  EXPECT_EQ(errorRecord(), kInjectedError);
}

// A line feed in a value would split its line in the store.
TEST_F(SchedTaskConvertTest, ALineFeedThatCannotBeReplacedIsAFailure) {
  failCallFor("QLIBCSzHashSetValue", "name", {.from = 2, .code = 0x1234});
  Task task = plainTask("ls");
  setText(task->Name, "a\nb");
  TextHash hash;
  EXPECT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), -1);
  expectLine("Set hash value failed. key:[name], val:[a b]. " + kInjectedTail);
}

PSZHASH *watchedHandle = nullptr;

TEST_F(SchedTaskConvertTest, AHandleThatIsGoneBeforeTheLineFeedPassIsReportedButNoFailure) {
  TextHash hash;
  PSZHASH handle = hash.get();
  watchedHandle = &handle;
  failCallFor("QLIBCSzHashSetValue", "cmd", {.from = 2, .result = 0, .code = 0x1234});
  onErrorSet = [] { *watchedHandle = nullptr; };
  EXPECT_EQ(ZELOSchedInitHashFromTask(&handle, plainTask("ls").get()), 0);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, "sched_task_convert.cpp"}));
  EXPECT_EQ(logged(), Lines{"sched_task_convert.cpp:N Invaild Argument (NULL != *ppHash)=[0]\n"});
  EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
}

// ---- hash to task

TEST_F(SchedTaskConvertTest, EveryFieldIsReadFromItsKey) {
  Entries entries = kDefaultsWithLs;
  entries["id"] = "-2147483648";
  int32_t flag = 10;
  for (const SignedRow &row : kFlagRows) entries[row.key] = std::to_string(-flag++);
  uint32_t number = UINT32_MAX;
  for (const UnsignedRow &row : kUnsignedRows) entries[row.key] = std::to_string(number--);
  entries["name"] = "the name";
  entries["edit form"] = "the form";
  entries["edit dialog"] = "the dialog";
  entries["app"] = "the app";
  entries["app name"] = "the app's name";
  entries["app args"] = "the arguments";
  entries["action"] = "the action";
  entries["week"] = "0100001";
  entries["state"] = "disabled";
  entries["type"] = "yearly";

  const Task task = plainTask("other");
  ASSERT_EQ(read(entries, task), 0);
  EXPECT_EQ(task->ID, INT32_MIN);
  flag = 10;
  for (const SignedRow &row : kFlagRows) EXPECT_EQ(task.get()->*row.field, -flag++) << row.key;
  number = UINT32_MAX;
  for (const UnsignedRow &row : kUnsignedRows) {
    EXPECT_EQ(task.get()->*row.field, number--) << row.key;
  }
  EXPECT_STREQ(task->Name, "the name");
  EXPECT_STREQ(task->EditForm, "the form");
  EXPECT_STREQ(task->EditDialog, "the dialog");
  EXPECT_STREQ(task->App, "the app");
  EXPECT_STREQ(task->AppName, "the app's name");
  EXPECT_STREQ(task->AppArgs, "the arguments");
  EXPECT_STREQ(task->Action, "the action");
  EXPECT_STREQ(task->Week, "0100001");
  EXPECT_STREQ(task->Command, "ls");
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_DISABLED);
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_YEARLY);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedTaskConvertTest, WhatTheHashDoesNotHoldIsLeftAlone) {
  const Task next = plainTask("");
  const Task task = plainTask("");
  task->next = next.get();
  task->Backend = 77;
  setText(task->NextTriggerTime, "never");
  Entries entries = kDefaultsWithLs;
  entries["backend"] = "5";
  entries["next trigger time"] = "soon";
  ASSERT_EQ(read(entries, task), 0);
  EXPECT_EQ(task->next, next.get());
  EXPECT_EQ(task->Backend, 77);
  EXPECT_STREQ(task->NextTriggerTime, "never");
}

TEST_F(SchedTaskConvertTest, AbsentOptionalKeysTakeTheirDefaults) {
  Entries entries;
  for (const char *key : kRequiredKeys) entries[key] = kDefaultsWithLs.at(key);
  const Task task = plainTask("");
  for (const SignedRow &row : kFlagRows) task.get()->*row.field = 9;
  for (const UnsignedRow &row : kUnsignedRows) task.get()->*row.field = 99;
  for (char *text : {task->EditForm, task->EditDialog, task->AppArgs, task->Week}) text[0] = 'x';
  ASSERT_EQ(read(entries, task), 0);
  for (const SignedRow &row : kFlagRows) {
    EXPECT_EQ(task.get()->*row.field, row.defaultValue) << row.key;
  }
  EXPECT_EQ(task->Owner, 0U);
  EXPECT_EQ(task->StartYear, 2012U);
  EXPECT_EQ(task->StartMonth, 1U);
  EXPECT_EQ(task->StartDay, 1U);
  EXPECT_EQ(task->RepeatHour, 0U);
  EXPECT_EQ(task->LastWorkHour, 0U);
  EXPECT_STREQ(task->EditForm, "");
  EXPECT_STREQ(task->EditDialog, "ZELO.TOV.TaskScheduler.EditDialog");
  EXPECT_STREQ(task->AppArgs, "");
  EXPECT_STREQ(task->Week, "1111111");
}

TEST_F(SchedTaskConvertTest, AHashWithoutAWeekMeansEveryDay) {
  const Task task = plainTask("");
  setText(task->Week, "0000000");
  ASSERT_EQ(read(without("week"), task), 0);
  EXPECT_STREQ(task->Week, "1111111");
}

TEST_F(SchedTaskConvertTest, AHashWithoutARequiredKeyFails) {
  for (const char *key : kRequiredKeys) {
    SCOPED_TRACE(key);
    clearLog();
    EXPECT_EQ(read(without(key), plainTask("")), -1);
    expectLine("Get hash value failed. key:[" + std::string(key) + "]. [0x0000 :N]");
  }
}

TEST_F(SchedTaskConvertTest, TheErrorThatThePlatformLeftIsPassedUp) {
  failCallFor("QLIBCSzHashGetValue", "run min", {.code = 0x1234});
  EXPECT_EQ(read(kDefaultsWithLs, plainTask("")), -1);
  expectLine("Get hash value failed. key:[run min]. " + kInjectedTail);
  EXPECT_EQ(errorRecord(), kInjectedError);
}

TEST_F(SchedTaskConvertTest, AFailureLeavesTheRowsBeforeItWritten) {
  Entries entries = without("name");
  entries["id"] = "7";
  entries["last work hour"] = "19";
  entries["edit form"] = "form";
  const Task task = plainTask("ls");
  EXPECT_EQ(read(entries, task), -1);
  EXPECT_EQ(task->ID, 7);
  EXPECT_EQ(task->LastWorkHour, 19U);
  EXPECT_STREQ(task->EditForm, "");
  EXPECT_STREQ(task->Command, "ls");
}

TEST_F(SchedTaskConvertTest, AnUnsignedNumberWithTrailingCharactersFailsTheRead) {
  for (const UnsignedRow &row : kUnsignedRows) {
    SCOPED_TRACE(row.key);
    clearLog();
    const Task task = plainTask("");
    EXPECT_EQ(read(with(row.key, "5x"), task), -1);
    EXPECT_EQ(task.get()->*row.field, 5U);
    expectLine("parm_table[" + std::to_string(row.row) + "].fnFromHashStr failed.");
    EXPECT_EQ(errorRecord().code, 0x4000);
  }
}

TEST_F(SchedTaskConvertTest, OfANumberThatDoesNotFitTheLowest32BitsAreKept) {
  const Task task = plainTask("");
  EXPECT_EQ(read(with("id", "4294967297"), task), 0);
  EXPECT_EQ(task->ID, 1);
  for (const UnsignedRow &row : kUnsignedRows) {
    EXPECT_EQ(read(with(row.key, "4294967297"), task), 0) << row.key;
    EXPECT_EQ(task.get()->*row.field, 1U) << row.key;
  }
}

TEST_F(SchedTaskConvertTest, ASignedNumberMayHaveTrailingCharacters) {
  const Task task = plainTask("");
  EXPECT_EQ(read(with("id", "12abc"), task), 0);
  EXPECT_EQ(task->ID, 12);
  for (const SignedRow &row : kFlagRows) {
    EXPECT_EQ(read(with(row.key, "5x"), task), 0) << row.key;
    EXPECT_EQ(task.get()->*row.field, 5) << row.key;
  }
}

TEST_F(SchedTaskConvertTest, StatesAreReadByName) {
  constexpr const char *kStates[] = {"disabled", "enabled", "NotExisted"};
  for (int32_t state = 0; state < 3; ++state) {
    const Task task = plainTask("");
    task->State = 9;
    EXPECT_EQ(read(with("state", kStates[state]), task), 0);
    EXPECT_EQ(task->State, state);
  }
}

TEST_F(SchedTaskConvertTest, AnUnknownStateOrTypeLeavesTheField) {
  for (const char *name : {"on", "", "Enabled", "1", "DAILY"}) {
    const Task task = plainTask("");
    task->State = 9;
    task->Type = 8;
    EXPECT_EQ(read(with("state", name), task), 0);
    EXPECT_EQ(task->State, 9) << name;
    task->Type = 8;
    EXPECT_EQ(read(with("type", name), task), 0);
    EXPECT_EQ(task->Type, 8) << name;
  }
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(SchedTaskConvertTest, LongTextsAreCut) {
  struct TextRow {
    const char *key;
    size_t capacity;
    const char *(*of)(const ZELO_SCHED_TASK &);
  };
  const TextRow rows[] = {
      {"name", 4096, [](const ZELO_SCHED_TASK &task) -> const char * { return task.Name; }},
      {"edit form", 1024,
       [](const ZELO_SCHED_TASK &task) -> const char * { return task.EditForm; }},
      {"edit dialog", 1024,
       [](const ZELO_SCHED_TASK &task) -> const char * { return task.EditDialog; }},
      {"app", 1024, [](const ZELO_SCHED_TASK &task) -> const char * { return task.App; }},
      {"app name", 1024, [](const ZELO_SCHED_TASK &task) -> const char * { return task.AppName; }},
      {"app args", 8192, [](const ZELO_SCHED_TASK &task) -> const char * { return task.AppArgs; }},
      {"action", 1024, [](const ZELO_SCHED_TASK &task) -> const char * { return task.Action; }},
      {"week", 8, [](const ZELO_SCHED_TASK &task) -> const char * { return task.Week; }},
  };
  for (const TextRow &row : rows) {
    const Task task = plainTask("");
    ASSERT_EQ(read(with(row.key, std::string(40000, 'x')), task), 0) << row.key;
    EXPECT_EQ(row.of(*task), std::string(row.capacity - 1, 'x')) << row.key;
    EXPECT_STREQ(task->Command, "ls") << row.key;
  }
}

TEST_F(SchedTaskConvertTest, ALineFeedInACommandComesBack) {
  const Task task = plainTask("");
  ASSERT_EQ(read(entriesOf(plainTask("a\nb\n")), task), 0);
  EXPECT_STREQ(task->Command, "a\nb\n");
}

TEST_F(SchedTaskConvertTest, ALineFeedInANameComesBackAsABlank) {
  Task source = plainTask("");
  setText(source->Name, "a\nb");
  const Task task = plainTask("");
  ASSERT_EQ(read(entriesOf(source), task), 0);
  EXPECT_STREQ(task->Name, "a b");
}

TEST_F(SchedTaskConvertTest, AnEmptyCommandComesBackEmpty) {
  const Task task = plainTask("something longer");
  ASSERT_EQ(read(entriesOf(plainTask("")), task), 0);
  EXPECT_STREQ(task->Command, "");
}

TEST_F(SchedTaskConvertTest, AShortCommandReplacesALongOne) {
  const Task task = plainTask(std::string(16383, 'x'));
  ASSERT_EQ(read(kDefaultsWithLs, task), 0);
  EXPECT_STREQ(task->Command, "ls");
}

// 16383 encoded characters hold 12287 bytes and an incomplete group.
TEST_F(SchedTaskConvertTest, AnEncodedCommandThatIsTooLongIsCutBeforeItIsDecoded) {
  constexpr size_t kLongestSurvivor = 12287;
  for (const size_t length : {kLongestSurvivor, kLongestSurvivor + 1, size_t{16383}}) {
    std::string command;
    while (command.size() < length) command += std::to_string(command.size()) + " ";
    command.resize(length);
    const Task task = plainTask("");
    ASSERT_EQ(read(entriesOf(plainTask(command)), task), 0) << length;
    EXPECT_EQ(task->Command, command.substr(0, kLongestSurvivor)) << length;
  }
}

TEST_F(SchedTaskConvertTest, ACommandThatIsNoBase64IsShownAsItWasRead) {
  EXPECT_EQ(read(with("cmd", "ls !"), plainTask("")), -1);
  expectLine("Base64 decoding failed. [ls !] [0x0D00 base64.cpp:N]");
}

TEST_F(SchedTaskConvertTest, ACommandThatCannotBeDecodedFailsTheRead) {
  failCall("ZELOEncodingBase64Decode", {.code = 0x1234});
  EXPECT_EQ(read(kDefaultsWithLs, plainTask("")), -1);
  expectLine("Base64 decoding failed. [bHM=] " + kInjectedTail);
  EXPECT_EQ(errorRecord(), kInjectedError);
}

}  // namespace

void errorWasSet() {
  if (onErrorSet != nullptr) onErrorSet();
}

}  // namespace support

extern "C" void QLIBCErrSetEx(int code, const char *szFile, int line) {
  static const auto real =
      reinterpret_cast<decltype(&QLIBCErrSetEx)>(dlsym(RTLD_NEXT, "QLIBCErrSetEx"));
  real(code, szFile, line);
  support::errorWasSet();
}
