// A task as JSON.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "captured_log.h"
#include "failing_calls.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "tasks.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kUnit[] = "sched_task_convert_to_json_string.cpp:N ";
constexpr size_t kSmallest = 40960;

// A new buffer filled with '#', so that every write shows.
class Buffer {
 public:
  explicit Buffer(size_t size) : bytes_(size + kGuard, '#') {}
  char *data() { return bytes_.data(); }
  size_t size() const { return bytes_.size() - kGuard; }
  bool isUntouched() const { return bytes_ == std::string(bytes_.size(), '#'); }
  bool isKept() const { return bytes_.ends_with(std::string(kGuard, '#')); }

 private:
  static constexpr size_t kGuard = 16;
  std::string bytes_;
};

std::string jsonOf(const Task &task, size_t size = kSmallest) {
  Buffer buffer(size);
  EXPECT_EQ(ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size()), 0);
  EXPECT_TRUE(buffer.isKept());
  return buffer.data();
}

bool contains(const std::string &text, const std::string &part) {
  return text.find(part) != std::string::npos;
}

Task namedTask(const std::string &name) {
  return makeTask(name, "ls");
}

class TaskToJsonTest : public SandboxTest {
 protected:
  static void expectRefused(int result, const Buffer &buffer, const Lines &lines) {
    EXPECT_EQ(result, -1);
    EXPECT_TRUE(buffer.isUntouched());
    EXPECT_EQ(logged(), lines);
    for (const int priority : loggedPriorities()) EXPECT_EQ(priority, 3);
  }
};

TEST_F(TaskToJsonTest, TheObjectHoldsEveryKeyOfTheHashFormWrittenTwice) {
  Task task = makeTask("backup", "/bin/true");
  task->ID = 7;
  task->Owner = 4294967295;
  task->RunHour = 2;
  EXPECT_EQ(jsonOf(task),
            R"({"action":"\"backup\"\n","app":"\"ZELO.TOV.TaskScheduler.Script\"\n",)"
            R"("app args":"\"\"\n","app name":"\"Script\"\n","can delete from ui":"\"1\"\n",)"
            R"("can edit from ui":"\"1\"\n","can edit name":"\"1\"\n","can edit owner":"\"1\"\n",)"
            R"("can run app same time":"\"1\"\n","can run from ui":"\"1\"\n",)"
            R"("can run task same time":"\"0\"\n","cmd":"\"L2Jpbi90cnVl\"\n",)"
            R"("edit dialog":"\"ZELO.TOV.TaskScheduler.EditDialog\"\n","edit form":"\"\"\n",)"
            R"("id":"\"7\"\n","last work hour":"\"0\"\n","listable":"\"1\"\n",)"
            R"("name":"\"backup\"\n","owner":"\"4294967295\"\n","repeat hour":"\"0\"\n",)"
            R"("run hour":"\"2\"\n","run min":"\"0\"\n","simple edit form":"\"0\"\n",)"
            R"("start day":"\"1\"\n","start month":"\"1\"\n","start year":"\"2012\"\n",)"
            R"("state":"\"enabled\"\n","type":"\"daily\"\n","week":"\"1111111\"\n"})"
            "\n");
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskToJsonTest, AKeyThatTheHashFormLeavesOutIsLeftOut) {
  Task task = namedTask("odd");
  task->State = 9;
  const std::string json = jsonOf(task);
  EXPECT_FALSE(contains(json, "\"state\""));
  EXPECT_TRUE(contains(json, "\"type\""));
}

TEST_F(TaskToJsonTest, QuotesAndBackslashesAreEscapedTwice) {
  EXPECT_TRUE(contains(jsonOf(namedTask(R"(a"b\c)")), R"("name":"\"a\\\"b\\\\c\"\n")"));
}

TEST_F(TaskToJsonTest, ControlBytesAreEscapedTwice) {
  EXPECT_TRUE(contains(jsonOf(namedTask("a\tb\x01")), R"("name":"\"a\\tb\\u0001\"\n")"));
}

TEST_F(TaskToJsonTest, CharactersBeyondAsciiAreEscapedAndPairedBeyondTheFirstPlane) {
  EXPECT_TRUE(contains(jsonOf(namedTask("\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80")),
                       R"("name":"\"\\u00e9\\u20ac\\ud83d\\ude00\"\n")"));
}

TEST_F(TaskToJsonTest, EachByteThatIsNotUtf8IsReplacedAndItsNeighboursStay) {
  const struct {
    const char *name;
    const char *json;
  } cases[] = {
      {"caf\xE9 tea", R"(caf\\ufffd tea)"},  // Latin-1
      {"\x80\xBFx", R"(\\ufffd\\ufffdx)"},   // further bytes alone
      {"\x80", R"(\\ufffd)"},
      {"a\x80z", R"(a\\ufffdz)"},
      {"\xC3(", R"(\\ufffd()"},                                            // cut off
      {"\xE2\x82", R"(\\ufffd\\ufffd)"},                                   // cut off at the end
      {"\xC0\xAF\xE0\x80\xAF", R"(\\ufffd\\ufffd\\ufffd\\ufffd\\ufffd)"},  // overlong
      {"\xED\xA0\x80", R"(\\ufffd\\ufffd\\ufffd)"},                        // a surrogate
      {"\xF4\x90\x80\x80", R"(\\ufffd\\ufffd\\ufffd\\ufffd)"},             // beyond Unicode
      {"\xF5\xFF", R"(\\ufffd\\ufffd)"},
      {"\xC3\"\xE9\\", R"(\\ufffd\\\"\\ufffd\\\\)"},  // right before what JSON needs
      {"\xC3\xC3\xA9", R"(\\ufffd\\u00e9)"},
      // The edges of UTF-8 come through.
      {"\x7F\xC2\x80\xDF\xBF", "\x7F\\\\u0080\\\\u07ff"},
      {"\xE0\xA0\x80\xED\x9F\xBF\xEE\x80\x80\xEF\xBF\xBF", R"(\\u0800\\ud7ff\\ue000\\uffff)"},
      {"\xF0\x90\x80\x80\xF4\x8F\xBF\xBF", R"(\\ud800\\udc00\\udbff\\udfff)"},
  };
  for (const auto &row : cases) {
    SCOPED_TRACE(row.json);
    EXPECT_TRUE(contains(jsonOf(namedTask(row.name)),
                         std::string(R"("name":"\")") + row.json + R"(\"\n")"));
  }
}

TEST_F(TaskToJsonTest, ACommandKeepsItsLineFeedsAndEveryByte) {
  const Task task = makeTask("bytes", "a\n\xFF");
  EXPECT_TRUE(contains(jsonOf(task), R"("cmd":"\"YQr/\"\n")"));
}

TEST_F(TaskToJsonTest, ATextLongerThanTheBufferIsCutWithoutAnError) {
  Task task = namedTask("long");
  setText(task->AppArgs, std::string(sizeof(task->AppArgs), '\x01'));
  const std::string whole = jsonOf(task, ZELO_SCHED_JSON_SIZE_ANY);
  ASSERT_GT(whole.size(), kSmallest);
  EXPECT_TRUE(whole.ends_with("}\n"));
  EXPECT_EQ(jsonOf(task), whole.substr(0, kSmallest - 1));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskToJsonTest, TheLongestTaskFitsIntoTheBufferForAny) {
  Task task = makeTask("", std::string(sizeof(ZELO_SCHED_TASK::Command), '\xFF'));
  setText(task->Name, std::string(sizeof(task->Name), '\x01'));
  setText(task->Week, std::string(sizeof(task->Week), '\x01'));
  setText(task->EditDialog, std::string(sizeof(task->EditDialog), '\x01'));
  setText(task->EditForm, std::string(sizeof(task->EditForm), '\x01'));
  setText(task->App, std::string(sizeof(task->App), '\x01'));
  setText(task->AppName, std::string(sizeof(task->AppName), '\x01'));
  setText(task->AppArgs, std::string(sizeof(task->AppArgs), '\x01'));
  setText(task->Action, std::string(sizeof(task->Action), '\x01'));
  EXPECT_TRUE(jsonOf(task, ZELO_SCHED_JSON_SIZE_ANY).ends_with("}\n"));
}

TEST_F(TaskToJsonTest, ANullTaskOrBufferIsRefusedWithoutACode) {
  Buffer buffer(kSmallest);
  expectRefused(ZELOSchedTaskConvertToJson(nullptr, buffer.data(), buffer.size()), buffer,
                Lines{std::string(kUnit) + "Bad parameter"});
  clearLog();
  const Task task = namedTask("a");
  expectRefused(ZELOSchedTaskConvertToJson(task.get(), nullptr, kSmallest), buffer,
                Lines{std::string(kUnit) + "Bad parameter"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskToJsonTest, ASizeOf40959IsRefusedAnd40960Accepted) {
  const Task task = namedTask("a");
  Buffer buffer(kSmallest);
  expectRefused(ZELOSchedTaskConvertToJson(task.get(), buffer.data(), 40959), buffer,
                Lines{std::string(kUnit) + "Bad parameter"});
  EXPECT_EQ(ZELOSchedTaskConvertToJson(task.get(), buffer.data(), 40960), 0);
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskToJsonTest, AShortageOfMemoryForHashOrListIsReported) {
  const Task task = namedTask("a");
  for (const char *call : {"QLIBCSzHashAlloc", "QLIBCSzListAlloc"}) {
    SCOPED_TRACE(call);
    clearLog();
    failCall(call);
    Buffer buffer(kSmallest);
    expectRefused(ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size()), buffer,
                  Lines{std::string(kUnit) + "Out of memory"});
    EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
  }
}

TEST_F(TaskToJsonTest, AShortageOfMemoryForTheTextIsReported) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "allocations do not fail in this build";
  Task task = namedTask("long");
  setText(task->AppArgs, std::string(sizeof(task->AppArgs), '\x01'));
  constexpr size_t kMoreThanTheHashTakes = 40000;
  Buffer buffer(kSmallest);
  int result = 0;
  {
    FailingAllocation scope("malloc", {.minSize = kMoreThanTheHashTakes});
    result = ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size());
  }
  expectRefused(result, buffer, Lines{std::string(kUnit) + "Out of memory"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskToJsonTest, TheHashIsAskedForWithRoomFor512Keys) {
  const Task task = namedTask("a");
  failCallFor("QLIBCSzHashAlloc", "512");
  Buffer buffer(kSmallest);
  const int result = ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size());
  expectRefused(result, buffer, Lines{std::string(kUnit) + "Out of memory"});
}

TEST_F(TaskToJsonTest, AFailureToMakeTheHashFormIsReportedAfterItsOwnLine) {
  const Task task = namedTask("a");
  failCall("SzBase64EncodeFull", {.code = 0x0D00});
  Buffer buffer(kSmallest);
  expectRefused(
      ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size()), buffer,
      Lines{"sched_task_convert.cpp:N Base64 encoding failed. [ls] [0x0D00 injected.cpp:N]",
            std::string(kUnit) + "Task to hash failed"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, kInjectedFile}));
}

TEST_F(TaskToJsonTest, AFailureToListTheKeysIsReported) {
  const Task task = namedTask("a");
  failCall("QLIBCSzHashEnumKey", {.code = 0x0200});
  Buffer buffer(kSmallest);
  expectRefused(ZELOSchedTaskConvertToJson(task.get(), buffer.data(), buffer.size()), buffer,
                Lines{std::string(kUnit) + "enum hash key failed"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
}

TEST_F(TaskToJsonTest, AStoredTaskIsConvertedByItsId) {
  const Task task = namedTask("stored");
  const long id = saveTask(task);
  Buffer buffer(kSmallest);
  ASSERT_EQ(ZELOSchedTaskConvertToJsonById(id, buffer.data(), buffer.size()), 0);
  EXPECT_EQ(std::string(buffer.data()), jsonOf(task));
  EXPECT_TRUE(contains(buffer.data(), R"("id":"\"1\"\n")"));
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(TaskToJsonTest, APowerTaskIsConvertedLikeAnyOther) {
  haveClock();
  setPowerList(kOn, {{1, 127, 5, 7}});
  Buffer buffer(kSmallest);
  EXPECT_EQ(ZELOSchedTaskConvertToJsonById(71270507, buffer.data(), buffer.size()), 0);
  EXPECT_TRUE(contains(buffer.data(), R"("app args":"\"poweron\"\n")")) << buffer.data();
  EXPECT_TRUE(contains(buffer.data(), R"("id":"\"71270507\"\n")")) << buffer.data();
}

TEST_F(TaskToJsonTest, ByIdANullBufferANegativeIdAndASmallSizeAreRefused) {
  saveTask(namedTask("stored"));
  Buffer buffer(kSmallest);
  const int results[] = {ZELOSchedTaskConvertToJsonById(1, nullptr, kSmallest),
                         ZELOSchedTaskConvertToJsonById(-1, buffer.data(), kSmallest),
                         ZELOSchedTaskConvertToJsonById(1, buffer.data(), 40959)};
  for (const int result : results) EXPECT_EQ(result, -1);
  EXPECT_EQ(logged(), Lines(3, std::string(kUnit) + "Bad parameter"));
  EXPECT_TRUE(buffer.isUntouched());
  EXPECT_EQ(errorRecord(), (ErrorRecord{0, ""}));
}

TEST_F(TaskToJsonTest, ByIdZeroIsAcceptedAndAnIdThatIsNotStoredIsReported) {
  for (const long id : {0L, 7L}) {
    SCOPED_TRACE(id);
    clearLog();
    Buffer buffer(kSmallest);
    EXPECT_EQ(ZELOSchedTaskConvertToJsonById(id, buffer.data(), buffer.size()), -1);
    ASSERT_FALSE(logged().empty());
    EXPECT_EQ(logged().back(),
              std::string(kUnit) + "cannot get scheduler task, id=" + std::to_string(id));
    EXPECT_TRUE(buffer.isUntouched());
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x2000, "sched_task_get.cpp"}));
  }
}

TEST_F(TaskToJsonTest, AnIdOfMoreThan32BitsIsAnother) {
  if (sizeof(long) == sizeof(int32_t)) GTEST_SKIP() << "no id has more than 32 bits here";
  saveTask(namedTask("stored"));
  Buffer buffer(kSmallest);
  EXPECT_EQ(ZELOSchedTaskConvertToJsonById(static_cast<long>((1LL << 32) + 1), buffer.data(),
                                           buffer.size()),
            -1);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(), std::string(kUnit) + "cannot get scheduler task, id=4294967297");
  EXPECT_TRUE(buffer.isUntouched());
}

TEST_F(TaskToJsonTest, ByIdAFailedAllocationIsReported) {
  if (!kAllocationsCanFail) GTEST_SKIP() << "allocations do not fail in this build";
  Buffer buffer(kSmallest);
  int result = 0;
  {
    FailingAllocation scope("calloc", {.minSize = sizeof(ZELO_SCHED_TASK)});
    result = ZELOSchedTaskConvertToJsonById(1, buffer.data(), buffer.size());
  }
  EXPECT_EQ(result, -1);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged().back(), std::string(kUnit) + "ZELOSchedTaskAlloc failed");
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, "sched_task_alloc.cpp"}));
}

TEST_F(TaskToJsonTest, ByIdAFailedConversionIsReportedWithTheId) {
  const long id = saveTask(namedTask("stored"));
  failCall("QLIBCSzHashEnumKey", {.code = 0x0200});
  Buffer buffer(kSmallest);
  expectRefused(ZELOSchedTaskConvertToJsonById(id, buffer.data(), buffer.size()), buffer,
                Lines{std::string(kUnit) + "enum hash key failed",
                      std::string(kUnit) + "scheduler task to json failed, task=1"});
  EXPECT_EQ(errorRecord(), (ErrorRecord{0x0200, kInjectedFile}));
}

}  // namespace
}  // namespace support
