// A task saved from JSON, which may come from anyone.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_backends.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "schedule_cases.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;
using Members = std::vector<std::pair<std::string, std::string>>;

constexpr char kUnit[] = "sched_task_save_from_json_string.cpp:N ";

std::string quoted(const std::string &text) {
  std::string result = "\"";
  for (const char c : text) {
    if (c == '"' || c == '\\') {
      result += '\\';
      result += c;
    } else if (static_cast<unsigned char>(c) < ' ') {
      char escape[8];
      std::snprintf(escape, sizeof(escape), "\\u%04x", static_cast<unsigned>(c));
      result += escape;
    } else {
      result += c;
    }
  }
  return result + '"';
}

std::string objectOf(const Members &rawMembers) {
  std::string text;
  for (const auto &[key, value] : rawMembers) {
    text += (text.empty() ? "{" : ",") + quoted(key) + ":" + value;
  }
  return text.empty() ? "{}" : text + "}";
}

// Every key that must be there; "cmd" is ls.
const Members kRequired = {{"id", "-1"},     {"run hour", "1"}, {"run min", "2"},
                           {"name", "n"},    {"app", "a"},      {"app name", "b"},
                           {"action", "c"},  {"cmd", "bHM="},   {"state", "enabled"},
                           {"type", "daily"}};

// kRequired with members replaced or added, all written twice as a browser gives them back.
std::string taskText(const Members &changes = {}, const std::string &without = "") {
  Members members;
  for (const auto &[key, value] : kRequired) {
    if (key != without) members.emplace_back(key, quoted(quoted(value)));
  }
  for (const auto &[key, value] : changes) {
    const std::string twice = quoted(quoted(value));
    bool found = false;
    for (auto &member : members) {
      if (member.first == key) {
        member.second = twice;
        found = true;
      }
    }
    if (!found) members.emplace_back(key, twice);
  }
  return objectOf(members);
}

// taskText() with one more member, whose value is given as it stands in the text.
std::string textWithRawMember(const std::string &key, const std::string &value) {
  std::string text = taskText({}, key);
  text.pop_back();
  return text + "," + quoted(key) + ":" + value + "}";
}

std::string jsonOf(long id) {
  std::string buffer(ZELO_SCHED_JSON_SIZE_ANY, '\0');
  EXPECT_EQ(ZELOSchedTaskConvertToJsonById(id, buffer.data(), buffer.size()), 0);
  return buffer.c_str();
}

int storedTasks() {
  ZELO_SCHED_TASK *list = nullptr;
  const int count = ZELOSchedTaskListGet(&list, nullptr);
  ZELOSchedTaskListFree(&list);
  return count;
}

class TaskFromJsonTest : public SandboxTest {
 protected:
  static int save(const std::string &text, int create = 0) {
    return ZELOSchedTaskSaveFromJson(text.c_str(), create);
  }

  // Refused with that last line, and nothing saved.
  static void expectRefused(const std::string &text, const std::string &lastLine) {
    clearLog();
    EXPECT_EQ(save(text), -1);
    ASSERT_FALSE(logged().empty());
    EXPECT_TRUE(logged().back() == kUnit + lastLine) << logged().back().substr(0, 200);
    for (const int priority : loggedPriorities()) EXPECT_EQ(priority, 3);
    EXPECT_FALSE(hasStoredTasks());
    EXPECT_FALSE(fileExists(kPersistentStore));
    EXPECT_EQ(crontabLines(), Lines{});
  }
  static void expectNotJson(const std::string &text) {
    SCOPED_TRACE(text.substr(0, 100));
    expectRefused(text, "parse json failed, szJson=" + text);
    EXPECT_EQ(logged().size(), 1U);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  }
  static void expectMemberRefused(const std::string &value) {
    SCOPED_TRACE(value.substr(0, 100));
    expectRefused(textWithRawMember("name", value), "save appargs failed");
    EXPECT_EQ(logged().size(), 1U);
  }
};

TEST_F(TaskFromJsonTest, ANullOrEmptyTextIsRefusedWithoutACode) {
  expectRefused("", "Bad parameter");
  EXPECT_EQ(ZELOSchedTaskSaveFromJson(nullptr, 1), -1);
  EXPECT_EQ(logged(), Lines(2, std::string(kUnit) + "Bad parameter"));
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskFromJsonTest, ANewTaskIsCreatedAndItsIdGiven) {
  const long id = save(taskText());
  ASSERT_EQ(id, 1);
  const Task task = loadTask(id);
  EXPECT_STREQ(task->Name, "n");
  EXPECT_STREQ(task->App, "a");
  EXPECT_STREQ(task->AppName, "b");
  EXPECT_STREQ(task->Action, "c");
  EXPECT_STREQ(task->Command, "ls");
  EXPECT_EQ(task->RunHour, 1U);
  EXPECT_EQ(task->RunMin, 2U);
  EXPECT_EQ(task->State, ZELO_SCHED_STATE_ENABLED);
  EXPECT_EQ(task->Type, ZELO_SCHED_TYPE_DAILY);
  EXPECT_EQ(task->StartYear, 2012U);
  EXPECT_STREQ(task->Week, "1111111");
  EXPECT_EQ(crontabLines().size(), 1U);
}

TEST_F(TaskFromJsonTest, LookingForTheStoredTaskOfANewOneLeavesALineAndACode) {
  ASSERT_EQ(save(taskText()), 1);
  EXPECT_EQ(logged(), Lines{"sched_task_get.cpp:N No get_by_id backend is found for task [-1] "});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  clearLog();
  ASSERT_EQ(save(taskText(), 1), 2);
  EXPECT_EQ(logged(), Lines{}) << "with the create flag none is looked for";
}

TEST_F(TaskFromJsonTest, ATrailingLineFeedOfAValueIsAllowed) {
  ASSERT_EQ(save(textWithRawMember("name", R"("\"n\"\n")")), 1);
  EXPECT_STREQ(loadTask(1)->Name, "n");
}

TEST_F(TaskFromJsonTest, WhatWasWrittenOverwritesThatSameTask) {
  Task task = makeTask("same", "echo \xFF\n");
  setText(task->AppArgs, "{\"quoted\": \"\\\\ \xC3\xA9\xF0\x9F\x98\x80 \t\"}");
  const long id = saveTask(task);
  saveTask(makeTask("other", "ls"));
  const std::string before = readFile(kStore);
  EXPECT_EQ(save(jsonOf(id)), id);
  EXPECT_EQ(readFile(kStore), before);
  EXPECT_EQ(storedTasks(), 2);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskFromJsonTest, WithTheSameNameAndAppAChangeIsSavedOverTheTask) {
  ASSERT_EQ(save(taskText()), 1);
  clearLog();
  EXPECT_EQ(save(taskText({{"id", "1"}, {"run hour", "5"}})), 1);
  EXPECT_EQ(storedTasks(), 1);
  EXPECT_EQ(loadTask(1)->RunHour, 5U);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskFromJsonTest, AnotherNameOrAppCreatesANewTask) {
  ASSERT_EQ(save(taskText()), 1);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"name", "N"}})), 2);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"app", "A"}})), 3);
  EXPECT_STREQ(loadTask(1)->Name, "n");
  EXPECT_STREQ(loadTask(1)->App, "a");
}

TEST_F(TaskFromJsonTest, NameAndAppAreComparedToTheirEnds) {
  ASSERT_EQ(save(taskText({{"name", "a long name"}, {"app", "a long app"}})), 1);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"name", "a long name 2"}, {"app", "a long app"}})), 2);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"name", "a long name"}, {"app", "a long ap"}})), 3);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"name", "a long nam"}, {"app", "a long app"}})), 4);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"name", "a long name"}, {"app", "a long app 2"}})), 5);
}

TEST_F(TaskFromJsonTest, AnIdThatIsNotStoredIsCreated) {
  EXPECT_EQ(save(taskText({{"id", "77"}})), 1);
  EXPECT_EQ(storedTasks(), 1);
}

TEST_F(TaskFromJsonTest, WithTheCreateFlagEvenAnExactCopyIsCreatedAnew) {
  ASSERT_EQ(save(taskText()), 1);
  int id = 1;
  for (const int create : {1, -1, 2}) {
    EXPECT_EQ(save(jsonOf(1), create), ++id);
  }
  EXPECT_EQ(storedTasks(), 4);
}

TEST_F(TaskFromJsonTest, ATaskOfAnotherBackendIsOverwrittenThere) {
  FakeBackends fakes(2);
  fakes[1].get_by_id = 1;
  ZELO_SCHED_TASK stored = {};
  ASSERT_EQ(ZELOSchedTaskGetByID(7, &stored), 0);
  EXPECT_EQ(save(taskText({{"id", "7"}, {"name", stored.Name}, {"app", stored.App}})), 7);
  EXPECT_EQ(fakes.calls().back(), "edit 1 id 7");
}

// A listed power task has another name than one that is read by its id; this one is read by its id.
TEST_F(TaskFromJsonTest, APowerTaskIsOverwrittenInItsPlaceOrBecomesAnOrdinaryTask) {
  haveClock();
  setPowerList(kOn, {{1, 127, 5, 7}, {1, 127, 6, 8}});
  constexpr long kFirst = 71270507;
  const std::string text = jsonOf(kFirst);
  EXPECT_NE(text.find(R"("app args":"\"poweron\"\n")"), std::string::npos) << text;
  const std::string enabled = R"("state":"\"enabled\"\n")";
  std::string changed = text;
  ASSERT_NE(text.find(enabled), std::string::npos) << text;
  changed.replace(text.find(enabled), enabled.size(), R"("state":"\"disabled\"\n")");
  EXPECT_EQ(save(changed), kFirst);
  EXPECT_EQ(powerList(kOn), (Entries{{0, 127, 5, 7}, {1, 127, 6, 8}}));
  EXPECT_FALSE(hasStoredTasks());
  EXPECT_EQ(save(text, 1), 1);
  EXPECT_EQ(loadTask(1)->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
  EXPECT_STREQ(loadTask(1)->Command, "");
  EXPECT_EQ(powerList(kOn).size(), 2U);
}

// Fields that a backend does not fill must not be taken for stored values.
TEST_F(TaskFromJsonTest, TheStoredTaskIsReadIntoAZeroFilledRecord) {
  const FakeBackends fakes(1);
  static bool wasZeroFilled;
  wasZeroFilled = false;
  SchedBackends[0].get_by_id = [](long, ZELO_SCHED_TASK *stored) {
    const auto *bytes = reinterpret_cast<const char *>(stored);
    wasZeroFilled =
        std::all_of(bytes, bytes + sizeof(*stored), [](char byte) { return byte == 0; });
    return 0;
  };
  EXPECT_EQ(save(taskText({{"id", "5"}})), 5);
  EXPECT_TRUE(wasZeroFilled);
}

TEST_F(TaskFromJsonTest, AnEmptyObjectSavesNothingAndGivesTheIdOfANewRecord) {
  EXPECT_EQ(save("{}"), -1);
  EXPECT_EQ(save(" { } \n", 1), -1);
  EXPECT_EQ(logged(), Lines{});
  EXPECT_FALSE(hasStoredTasks());
  const FakeBackends fakes(1);  // whose new records have the id 0
  EXPECT_EQ(save("{}"), 0);
}

TEST_F(TaskFromJsonTest, AMemberThatIsNoKeyOfATaskIsPassedOver) {
  EXPECT_EQ(save(taskText({{"colour", "red"}, {"", "nothing"}, {"next trigger time", "x"}})), 1);
  EXPECT_EQ(save(taskText({{"backend", "99999999999"}})), 2);
  EXPECT_EQ(loadTask(2)->Backend, ZELO_SCHED_BACKEND_SCHEDULE);
}

// As the header warns: the text alone decides, and a text that is no number counts as 0.
TEST_F(TaskFromJsonTest, AnOwnerThatIsMissingOrSaysNothingIsRoot) {
  int id = 0;
  for (const char *owner : {"", " 0", "-0", "0"}) {
    SCOPED_TRACE(owner);
    ASSERT_EQ(save(taskText({{"owner", owner}})), ++id);
    EXPECT_EQ(loadTask(id)->Owner, 0U);
  }
  ASSERT_EQ(save(taskText()), ++id);
  EXPECT_EQ(loadTask(id)->Owner, 0U);
  ASSERT_EQ(save(textWithRawMember("owner", R"("\"1000\"","owner":"\"0\"")")), ++id);
  EXPECT_EQ(loadTask(id)->Owner, 0U);
}

TEST_F(TaskFromJsonTest, OfMembersGivenTwiceTheLastCounts) {
  ASSERT_EQ(save(textWithRawMember("name", R"("\"first\"","name":"\"last\"")")), 1);
  EXPECT_STREQ(loadTask(1)->Name, "last");
}

TEST_F(TaskFromJsonTest, AnArrayOrAnObjectIsRefusedAlsoWhereItsMemberIsGivenAgain) {
  for (const char *first : {R"({"x":[1]})", "[]", "/**/ {}", "{\"name\":\"\\\"n\\\"\"}"}) {
    expectMemberRefused(first + std::string(R"(,"name":"\"last\"")"));
  }
}

TEST_F(TaskFromJsonTest, AnotherBadMemberThatIsGivenAgainCountsAsTheLast) {
  int id = 0;
  for (const char *first : {"1", "null", "-1.5e3", "\"\""}) {
    EXPECT_EQ(save(textWithRawMember("name", first + std::string(R"(,"name":"\"last\"")"))), ++id);
  }
}

TEST_F(TaskFromJsonTest, WhatLooksLikeAMemberWithinAStringOrACommentIsNone) {
  ASSERT_EQ(save(textWithRawMember("name", R"("\":1,[{\\","name": /*":[*/ //":[
                                              "\"last\"")")),
            1);
  EXPECT_STREQ(loadTask(1)->Name, "last");
}

TEST_F(TaskFromJsonTest, ALineOfACommentEndsWithACarriageReturnToo) {
  ASSERT_EQ(save(textWithRawMember("name", "//\"[\r\"\\\"last\\\"\"")), 1);
  EXPECT_STREQ(loadTask(1)->Name, "last");
  EXPECT_EQ(save("//\n{\"id\": \"a\\\"\", \"b\": \"\\\"({\n\"//*\r{\"id\": \"\\\"n\n\re\"}"), -1);
}

TEST_F(TaskFromJsonTest, TextThatIsNotJsonIsQuotedInTheLog) {
  for (const char *text : {"x", "{", "{\"name\"", "{\"name\":", R"({"name":"\"n\"")", "}", "\"",
                           "{'name':1}", "{\"a\":\"\\q\"}", "{\"a\":\"\\u12\"}", "\xFF\xFE", "%s%n",
                           "// only a comment", "/* only a comment", "/"}) {
    expectNotJson(text);
  }
}

TEST_F(TaskFromJsonTest, AnythingButBlanksAndCommentsAfterTheEndIsRefused) {
  for (const char *tail :
       {"x", "{}", "]", ",", "/", "/x", "/*", "/* *", "/**/ x", "// \n x", "\x01"}) {
    expectNotJson(taskText() + tail);
  }
  int id = 0;
  for (const char *tail : {" \r\n\t", "// x", "//", "/**/", "/* x */ // \n /***/ \n"}) {
    SCOPED_TRACE(tail);
    EXPECT_EQ(save(taskText() + tail), ++id);
  }
}

TEST_F(TaskFromJsonTest, ARootThatIsNoObjectIsRefused) {
  for (const char *text : {"null", "true", "1", "-1.5e3", "\"text\"", "[]", "[1,{}]",
                           R"(["{\"name\":1}"])", "1e999999"}) {
    expectNotJson(text);
  }
}

TEST_F(TaskFromJsonTest, AMemberThatIsNoStringIsRefused) {
  for (const char *value :
       {"null", "true", "1", "1.5", "{}", "[]", R"(["\"n\""])", R"({"name":"\"n\""})", "-0"}) {
    expectMemberRefused(value);
  }
}

TEST_F(TaskFromJsonTest, AStringThatHoldsNoJsonStringIsRefused) {
  for (const char *inner : {"", " ", "n", "1", "null", "true", "{}", "[]", "[\"n\"]", "\"n", "n\"",
                            "\"\\q\"", "\"n\" x", "\"n\"\"m\"", "\"n\",", "'n'"}) {
    expectMemberRefused(quoted(inner));
  }
}

TEST_F(TaskFromJsonTest, ABadMemberAfterGoodOnesSavesNothingOverTheStoredTask) {
  ASSERT_EQ(save(taskText()), 1);
  const std::string before = readFile(kStore);
  std::string text = taskText({{"id", "1"}, {"run hour", "9"}});
  text.pop_back();
  EXPECT_EQ(save(text + ",\"zzz\":1}"), -1);
  EXPECT_EQ(logged().back(), std::string(kUnit) + "save appargs failed");
  EXPECT_EQ(readFile(kStore), before);
}

TEST_F(TaskFromJsonTest, DeepNestingIsRefused) {
  constexpr size_t kDepth = 200000;
  expectNotJson(std::string(kDepth, '['));
  expectNotJson(std::string(kDepth, '[') + std::string(kDepth, ']'));
  std::string objects;
  for (size_t i = 0; i < kDepth; ++i) objects += "{\"a\":";
  expectNotJson(objects);
  expectMemberRefused(quoted(std::string(kDepth, '[')));
  expectNotJson(textWithRawMember("name", std::string(kDepth, '[')));
}

TEST_F(TaskFromJsonTest, HalfOfASurrogatePairIsRefusedWithinAValue) {
  for (const char *inner : {R"("\ud83d")", R"("\udc00")", R"("a\ud83d\u0041")",
                            R"("\ud83d\ud83d\ude00")", R"("\ud83dx\ude00")", R"("\\\udc00")",
                            R"("\ud83d\n")", R"("\uDFFF\uD800")", R"("\ud83d\ude0")"}) {
    expectMemberRefused(quoted(inner));
  }
}

TEST_F(TaskFromJsonTest, HalfOfASurrogatePairIsRefusedInTheTextItself) {
  for (const char *value : {R"("\"\ud83d\"")", R"("\"\udc00\"")", R"("\"\ud83d\u0041\"")"}) {
    expectNotJson(textWithRawMember("name", value));
  }
  expectNotJson(R"({"\udc00":"\"n\""})");
}

TEST_F(TaskFromJsonTest, AWholeSurrogatePairIsOneCharacter) {
  ASSERT_EQ(save(textWithRawMember("name", quoted(R"("\ud83d\ude00\\ud83d")"))), 1);
  EXPECT_STREQ(loadTask(1)->Name, "\xF0\x9F\x98\x80\\ud83d");
}

TEST_F(TaskFromJsonTest, AZeroByteIsRefusedRatherThanCut) {
  expectMemberRefused(quoted(R"("n\u0000m")"));
  expectMemberRefused(quoted(R"("\u0000")"));
  expectMemberRefused(R"("\"n\u0000m\"")");
  expectMemberRefused(R"("\"n\"\u0000")");
  expectMemberRefused(R"("\u0000\"n\"")");
  expectMemberRefused(R"("\"n\"","a\u0000b":"\"x\"")");
}

// 4294967296 would be uid 0 in a field of 32 bits.
TEST_F(TaskFromJsonTest, ANumberThatDoesNotFitItsFieldIsRefusedRatherThanCut) {
  const std::pair<const char *, const char *> kTooLarge[] = {
      {"owner", "4294967296"},    {"owner", "-1"},
      {"owner", "-4294967296"},   {"owner", "99999999999999999999"},
      {"run hour", "4294967296"}, {"id", "4294967297"},
      {"id", "2147483648"},       {"id", "-2147483649"},
      {"listable", "4294967296"},
  };
  for (const auto &[key, value] : kTooLarge) {
    SCOPED_TRACE(std::string(key) + " " + value);
    expectRefused(taskText({{key, value}}), "save appargs failed");
  }
  EXPECT_EQ(save(taskText({{"owner", "4294967295"}, {"id", "2147483647"}})), 1);
  EXPECT_EQ(loadTask(1)->Owner, 4294967295U);
}

// The conversion stops at the missing id, so only the check of the fields has seen these values.
TEST_F(TaskFromJsonTest, WhetherFieldsFitIsAskedWithoutATraceInTheErrorRecord) {
  for (const auto &[key, value] : Members{
           {"run hour", "5x"}, {"run hour", "x5"}, {"run hour", "1234567890x"}, {"cmd", "!!"}}) {
    SCOPED_TRACE(key + " " + value);
    clearLog();
    EXPECT_EQ(save(taskText({{key, value}}, "id")), -1);
    EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
    EXPECT_EQ(logged().front(),
              "sched_task_convert.cpp:N Get hash value failed. key:[id]. [0x0000 :N]");
  }
}

TEST_F(TaskFromJsonTest, ACommandThatWouldBeCutIsRefused) {
  const std::string longest = std::string(16383, 'Q');  // 12,287 bytes
  for (const std::string &encoded : {std::string("ZWNobyBoaQAgLXJm"), std::string("AA=="),
                                     longest + "Q", longest + "=Q", longest + "%"}) {
    SCOPED_TRACE(encoded.substr(0, 20));
    expectRefused(taskText({{"cmd", encoded}}), "save appargs failed");
  }
  EXPECT_EQ(save(taskText({{"cmd", longest + "="}})), 1);
  EXPECT_EQ(std::string(loadTask(1)->Command).size(), 12287U);
}

TEST_F(TaskFromJsonTest, EveryCommandThatIsStoredCanBeSavedBack) {
  for (const size_t size : {1U, 12284U, 12285U, 12286U, 12287U, 12288U, 13000U}) {
    SCOPED_TRACE(size);
    const long id = saveTask(makeTask("long", std::string(size, 'c')));
    const std::string stored = loadTask(id)->Command;
    EXPECT_EQ(stored.size(), std::min(size, size_t{12287}));
    EXPECT_EQ(save(jsonOf(id)), id);
    EXPECT_EQ(std::string(loadTask(id)->Command), stored);
  }
}

TEST_F(TaskFromJsonTest, BytesThatAreNotUtf8AreSavedAsTheyAre) {
  ASSERT_EQ(save(taskText({{"name", "caf\xE9 \xFF\xC3"}})), 1);
  EXPECT_STREQ(loadTask(1)->Name, "caf\xE9 \xFF\xC3");
}

TEST_F(TaskFromJsonTest, ATextCutOffAfterAHundredMegabytesIsRefusedAndQuotedWhole) {
  constexpr size_t kSize = 100'000'000;
  std::string text = "{\"name\":\"";
  text.resize(kSize, 'x');
  expectNotJson(text);
}

// Many small values take many times the memory of their text.
TEST_F(TaskFromJsonTest, ATextThatIsFarLongerThanAnyTaskIsRefused) {
  const std::string good = taskText();
  std::string tooLong = good.substr(0, good.size() - 1) + ",\"x\":[0";
  while (tooLong.size() < (size_t{4} << 20)) tooLong += ",0";
  expectNotJson(tooLong + "]}");
}

TEST_F(TaskFromJsonTest, ManyCommentsAreReadInLittleTime) {
  // If the reader kept comments, this would take minutes and exceed the program's time limit.
  std::string text = taskText();
  text.pop_back();
  for (int i = 0; i < 500'000; ++i) text += "/**/";
  EXPECT_EQ(save(text + "}"), 1);
}

TEST_F(TaskFromJsonTest, AMissingRequiredKeyIsRefused) {
  for (const auto &[key, value] : kRequired) {
    SCOPED_TRACE(key);
    expectRefused(taskText({}, key), "hash to task failed, task id=-1");
    EXPECT_EQ(logged().size(), 2U);
    EXPECT_TRUE(logged()[0].starts_with("sched_task_convert.cpp:N Get hash value failed. key:[" +
                                        key + "]. "));
  }
}

TEST_F(TaskFromJsonTest, TheIdThatWasReadStandsInTheLine) {
  expectRefused(taskText({{"id", "7"}, {"run hour", "5x"}}), "hash to task failed, task id=7");
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x4000, "sched_parm_table.cpp"}));
}

// ---- what cron could not read -----------------------------------------------------------------

// The schedule as members of the JSON object.
Members membersOf(const Schedule &schedule) {
  constexpr const char *kTypes[] = {"once", "daily", "weekly", "monthly", "yearly"};
  const std::string week(schedule.week.substr(0, schedule.week.find('\0')));
  return {{"type", kTypes[schedule.type]},
          {"week", week},
          {"start year", std::to_string(schedule.start.year)},
          {"start month", std::to_string(schedule.start.month)},
          {"start day", std::to_string(schedule.start.day)},
          {"run hour", std::to_string(schedule.hour)},
          {"run min", std::to_string(schedule.minute)},
          {"repeat hour", std::to_string(schedule.repeat)},
          {"last work hour", std::to_string(schedule.last)}};
}

// If cron cannot read one line, it ignores the whole crontab.
std::vector<Members> schedules(bool isReadable) {
  std::vector<Members> all;
  for (const ScheduleCase &each : scheduleCases()) {
    if (each.isReadable == isReadable && isStorable(each.schedule)) {
      all.push_back(membersOf(each.schedule));
    }
  }
  return all;
}

TEST_F(TaskFromJsonTest, AScheduleThatCronCannotReadIsRefused) {
  for (const Members &schedule : schedules(false)) {
    SCOPED_TRACE(objectOf(schedule));
    expectRefused(taskText(schedule), "hash to task failed, task id=-1");
    for (const char *state : {"disabled", "NotExisted"}) {
      SCOPED_TRACE(state);
      Members changes = schedule;
      changes.emplace_back("state", state);  // it may be enabled later without another check
      expectRefused(taskText(changes), "hash to task failed, task id=-1");
    }
    clearLog();
    EXPECT_EQ(save(taskText(schedule), 1), -1);
    EXPECT_EQ(logged(), Lines{std::string(kUnit) + "hash to task failed, task id=-1"});
  }
}

TEST_F(TaskFromJsonTest, AScheduleThatCronCannotReadIsNotSavedOverTheStoredTask) {
  ASSERT_EQ(save(taskText()), 1);
  const std::string before = readFile(kStore);
  for (Members schedule : schedules(false)) {
    SCOPED_TRACE(objectOf(schedule));
    schedule.emplace_back("id", "1");
    EXPECT_EQ(save(taskText(schedule)), -1);
    EXPECT_EQ(logged().back(), std::string(kUnit) + "hash to task failed, task id=1");
    EXPECT_EQ(readFile(kStore), before);
    EXPECT_EQ(crontabLines().size(), 1U);
  }
}

TEST_F(TaskFromJsonTest, WhatCronReadsIsSaved) {
  int id = 0;
  for (const Members &schedule : schedules(true)) {
    SCOPED_TRACE(objectOf(schedule));
    EXPECT_EQ(save(taskText(schedule), 1), ++id);
  }
}

TEST_F(TaskFromJsonTest, AWeekOfOneCharacterTakesNoDaysFromTheTaskBeforeIt) {
  const auto weekly = [](const char *week) {
    return taskText({{"type", "weekly"}, {"week", week}});
  };
  ASSERT_EQ(save(weekly("0000010")), 1);
  ASSERT_EQ(save(weekly("0")), 2);
  const Lines lines = crontabLines();  // in the order of the records in memory
  EXPECT_EQ(std::count(lines.begin(), lines.end(),
                       "2\t1\t*\t*\t1,2,3,4,5,6\troot\t/tmp/zeloschedtask --run id=2"),
            1);
}

// It adds no line to the crontab, and the platform can store it.
TEST_F(TaskFromJsonTest, APowerTimeWithoutADayIsOverwrittenInItsPlaceButIsNoOrdinaryTask) {
  haveClock();
  setPowerList(kOff, {{1, 0, 5, 7}});
  constexpr long kId = 90000507;
  const std::string text = jsonOf(kId);
  EXPECT_EQ(save(text), kId);
  EXPECT_EQ(powerList(kOff), (Entries{{1, 0, 5, 7}}));
  EXPECT_EQ(save(text, 1), -1);
  EXPECT_EQ(logged().back(), std::string(kUnit) + "hash to task failed, task id=90000507");
  EXPECT_FALSE(hasStoredTasks());
}

// ---- a crontab that is too long -----------------------------------------------------------------

// Beyond ten thousand lines cron ignores all of it, and some are left to other programs.
constexpr size_t kMostLines = 9800;

size_t linesOfCrontab() {
  const std::string text = readFile(kCrontab);
  return static_cast<size_t>(std::count(text.begin(), text.end(), '\n'));
}

// Comments count like any other line.
void fillCrontab(size_t lines, const std::string &end = "") {
  std::string text = readFile(kCrontab);
  for (size_t i = linesOfCrontab(); i < lines; ++i) text += "#\n";
  writeFile(kCrontab, text + end);
}

void expectTooLong(const std::string &text, int create, const char *id) {
  SCOPED_TRACE(text);
  const std::string store = hasStoredTasks() ? readFile(kStore) : std::string();
  const std::string crontab = readFile(kCrontab);
  EXPECT_EQ(ZELOSchedTaskSaveFromJson(text.c_str(), create), -1);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(), kUnit + std::string("hash to task failed, task id=") + id);
  EXPECT_EQ(hasStoredTasks() ? readFile(kStore) : std::string(), store);
  EXPECT_TRUE(readFile(kCrontab) == crontab) << linesOfCrontab();
}

TEST_F(TaskFromJsonTest, ALineThatWouldMakeTheCrontabTooLongIsRefused) {
  fillCrontab(kMostLines - 1);
  ASSERT_EQ(save(taskText()), 1);
  ASSERT_EQ(linesOfCrontab(), kMostLines);
  expectTooLong(taskText(), 0, "-1");
  expectTooLong(taskText({{"id", "77"}}), 0, "77");
  expectTooLong(taskText({{"id", "1"}, {"name", "another"}}), 0, "1");
  clearLog();
  expectTooLong(jsonOf(1), 1, "1");
  EXPECT_EQ(logged().size(), 1U) << "no stored task is looked for";
}

TEST_F(TaskFromJsonTest, ALastLineWithoutALineFeedCountsToo) {
  fillCrontab(kMostLines - 1, "# no line feed");
  expectTooLong(taskText(), 1, "-1");
}

TEST_F(TaskFromJsonTest, InACrontabWithoutRoomWhatAddsNoLineIsSaved) {
  ASSERT_EQ(save(taskText()), 1);
  ASSERT_EQ(save(taskText({{"state", "disabled"}}), 1), 2);
  fillCrontab(kMostLines);
  EXPECT_EQ(save(taskText({{"id", "1"}, {"run hour", "5"}})), 1);
  EXPECT_EQ(loadTask(1)->RunHour, 5U);
  EXPECT_EQ(linesOfCrontab(), kMostLines);
  EXPECT_EQ(save(taskText({{"state", "disabled"}}), 1), 3);
  EXPECT_EQ(save(taskText({{"id", "2"}, {"state", "disabled"}, {"run hour", "7"}})), 2);
  EXPECT_EQ(linesOfCrontab(), kMostLines);
  expectTooLong(taskText({{"id", "2"}}), 0, "2");
  EXPECT_EQ(save(taskText({{"id", "1"}, {"state", "disabled"}})), 1);
  EXPECT_EQ(linesOfCrontab(), kMostLines - 1);
  EXPECT_EQ(save(taskText({{"id", "2"}})), 2) << "the line of the other has become free";
  EXPECT_EQ(linesOfCrontab(), kMostLines);
}

TEST_F(TaskFromJsonTest, BesideACrontabWithoutRoomAPowerTimeIsOverwritten) {
  haveClock();
  setPowerList(kOn, {{0, 127, 5, 7}});
  constexpr long kId = 61270507;
  std::string text = jsonOf(kId);
  const std::string disabled = R"("state":"\"disabled\"\n")";
  ASSERT_NE(text.find(disabled), std::string::npos) << text;
  text.replace(text.find(disabled), disabled.size(), R"("state":"\"enabled\"\n")");
  fillCrontab(kMostLines);
  EXPECT_EQ(save(text), kId);
  EXPECT_EQ(powerList(kOn), (Entries{{1, 127, 5, 7}}));
  expectTooLong(text, 1, "61270507");
  expectTooLong(text, 0, "61270507");  // whose id is another one by now
}

TEST_F(TaskFromJsonTest, BesideACrontabThatIsMissingATaskIsSaved) {
  ASSERT_EQ(std::remove(kCrontab), 0);
  EXPECT_EQ(save(taskText()), 1);
}

TEST_F(TaskFromJsonTest, WhatAProgramSavesHasItsLineWhateverTheLengthOfTheCrontab) {
  fillCrontab(kMostLines);
  EXPECT_EQ(saveTask(makeTask("of a program", "ls")), 1);
  EXPECT_EQ(linesOfCrontab(), kMostLines + 1);
}

TEST_F(TaskFromJsonTest, AFailedAllocationOfTheTaskIsReportedWithTheRecord) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "allocations do not fail in this build";
  const std::string text = taskText();
  int result = 0;
  {
    FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)});
    result = save(text);
  }
  EXPECT_EQ(result, -1);
  ASSERT_EQ(logged().size(), 2U);
  EXPECT_EQ(logged()[1], std::string(kUnit) + "alloc task failed.[0x0200 sched_task_alloc.cpp:N]");
}

TEST_F(TaskFromJsonTest, TheTaskIsAllocatedBeforeTheTextIsRead) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "allocations do not fail in this build";
  int result = 0;
  {
    FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)});
    result = save("not JSON");
  }
  EXPECT_EQ(result, -1);
  EXPECT_EQ(logged().back(),
            std::string(kUnit) + "alloc task failed.[0x0200 sched_task_alloc.cpp:N]");
}

TEST_F(TaskFromJsonTest, AFailedAllocationOfTheHashIsReported) {
  ZELOSchedTaskFree(ZELOSchedTaskAlloc());
  const unsigned forTheTask = callCount("QLIBCSzHashAlloc");
  resetFailingCalls();
  for (const std::string &text : {taskText(), std::string("{}")}) {
    resetFailingCalls();
    failCall("QLIBCSzHashAlloc", {.from = forTheTask + 1});
    expectRefused(text, "Out of memory");
    EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  }
  resetFailingCalls();
  failCall("QLIBCSzHashAlloc", {.from = forTheTask + 1, .times = kAlways});
  expectNotJson("not JSON");
}

TEST_F(TaskFromJsonTest, AShortageOfMemoryForTheTextIsReported) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "allocations do not fail in this build";
  constexpr size_t kLong = size_t{1} << 20;
  const std::string text = taskText({{"no field", std::string(kLong, 'x')}});
  int result = 0;
  {
    FailingAllocation scope("malloc", {.minSize = kLong});
    result = save(text);
  }
  EXPECT_EQ(result, -1);
  EXPECT_EQ(logged(), Lines{std::string(kUnit) + "Out of memory"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  EXPECT_FALSE(hasStoredTasks());
}

TEST_F(TaskFromJsonTest, TheHashIsAskedForWithRoomFor512Keys) {
  failCallFor("QLIBCSzHashAlloc", "512");
  expectRefused(taskText({{"id", "5"}}), "Out of memory");
}

TEST_F(TaskFromJsonTest, AValueThatCannotBeSetIsReported) {
  failCallFor("QLIBCSzHashSetValue", "no field", {.code = 0x0200});
  expectRefused(taskText({{"no field", "x"}}), "save appargs failed");
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
}

TEST_F(TaskFromJsonTest, AFailedCreationIsReportedWithTheId) {
  FakeBackends fakes(1);
  fakes[0].create = -7;
  EXPECT_EQ(save(taskText({{"id", "5"}}), 1), -1);
  EXPECT_EQ(logged().back(), std::string(kUnit) + "create task failed, task id=5");
  EXPECT_EQ(fakes.calls().back(), "create 0 id 5");
  EXPECT_EQ(errorRecord(), (ErrorRecord{kFakeError, kFakeFile}));
}

TEST_F(TaskFromJsonTest, ACreationThatAnswersMoreThanZeroGivesTheId) {
  FakeBackends fakes(1);
  fakes[0].create = 3;
  EXPECT_EQ(save(taskText({{"id", "5"}}), 1), 5);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskFromJsonTest, AFailedOverwritingIsReportedWithTheId) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = 1;
  ZELO_SCHED_TASK stored = {};
  ASSERT_EQ(ZELOSchedTaskGetByID(5, &stored), 0);
  const std::string text = taskText({{"id", "5"}, {"name", stored.Name}, {"app", stored.App}});
  for (const int result : {-7, 1}) {
    SCOPED_TRACE(result);
    fakes[0].edit = result;
    EXPECT_EQ(save(text), -1);
    EXPECT_EQ(logged().back(), std::string(kUnit) + "overwrite failed, task=5");
    EXPECT_EQ(errorRecord(), (ErrorRecord{kFakeError, kFakeFile}));
  }
}

TEST_F(TaskFromJsonTest, AnIdThatCannotBeLookedUpIsCreated) {
  FakeBackends fakes(1);
  fakes[0].get_by_id = -1;
  EXPECT_EQ(save(taskText({{"id", "5"}})), 5);
  EXPECT_EQ(fakes.calls().back(), "create 0 id 5");
}

}  // namespace
}  // namespace support
