// Random tasks come back from their hash form as they went in, but for the documented changes: line
// feeds in texts become blanks, and a command keeps its first 12287 bytes.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <random>
#include <string>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "text_hash.h"

namespace support {
namespace {

constexpr int kRecords = 3000;
constexpr int kRecordsThroughAFile = 400;
constexpr size_t kLongestSurvivingCommand = 12287;
constexpr char kSectionFile[] = "/tmp/round_trip";

class RandomTasks {
 public:
  explicit RandomTasks(unsigned seed) : random_(seed) {}

  Task next() {
    Task task = makeTask("", "");
    task->ID = number<int32_t>();
    task->Owner = number<uint32_t>();
    fill(task->Name);
    fill(task->Week);
    fill(task->EditDialog);
    fill(task->EditForm);
    fill(task->App);
    fill(task->AppName);
    fill(task->AppArgs);
    fill(task->Action);
    fill(task->Command);
    task->State = static_cast<int32_t>(random_() % 3);
    task->Type = static_cast<int32_t>(random_() % 5);
    for (uint32_t *field : {&task->StartYear, &task->StartMonth, &task->StartDay, &task->RunHour,
                            &task->RunMin, &task->RepeatHour, &task->LastWorkHour}) {
      *field = number<uint32_t>();
    }
    for (int32_t *field : {&task->SimpleEditForm, &task->Listable, &task->CanEditName,
                           &task->CanEditOwner, &task->CanRunAppSameTime, &task->CanRunTaskSameTime,
                           &task->CanRunFromUI, &task->CanDeleteFromUI, &task->CanEditFromUI}) {
      *field = number<int32_t>();
    }
    return task;
  }

 private:
  template <typename Number>
  Number number() {
    constexpr Number kExtremes[] = {std::numeric_limits<Number>::min(),
                                    std::numeric_limits<Number>::max(), 0, 1};
    switch (random_() % 3) {
      case 0:
        return kExtremes[random_() % std::size(kExtremes)];
      case 1:
        return static_cast<Number>(random_() % 100);
      default:
        return static_cast<Number>(random_());
    }
  }

  // Empty, full, or in between; of any bytes, or of those that a section file has a use for.
  template <size_t capacity>
  void fill(char (&field)[capacity]) {
    constexpr char kDelicate[] = "\n\r\t \"\\=[]#;%$'x0\x7f";
    constexpr size_t kUsualLength = 80;
    const size_t longest = random_() % 8 == 0 ? capacity - 1 : std::min(capacity - 1, kUsualLength);
    const size_t length = random_() % 10 == 0 ? longest : random_() % (longest + 1);
    const bool delicate = random_() % 2 == 0;
    for (size_t i = 0; i < length; ++i) {
      field[i] = delicate ? kDelicate[random_() % (sizeof(kDelicate) - 1)]
                          : static_cast<char>(1 + random_() % 255);
    }
    field[length] = '\0';
  }

  std::mt19937 random_;
};

std::string withBlanks(std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  return text;
}

void expectSameTexts(const ZELO_SCHED_TASK &back, const ZELO_SCHED_TASK &task) {
  EXPECT_EQ(back.Name, withBlanks(task.Name));
  EXPECT_EQ(back.Week, withBlanks(task.Week));
  EXPECT_EQ(back.EditDialog, withBlanks(task.EditDialog));
  EXPECT_EQ(back.EditForm, withBlanks(task.EditForm));
  EXPECT_EQ(back.App, withBlanks(task.App));
  EXPECT_EQ(back.AppName, withBlanks(task.AppName));
  EXPECT_EQ(back.AppArgs, withBlanks(task.AppArgs));
  EXPECT_EQ(back.Action, withBlanks(task.Action));
  EXPECT_EQ(back.Command, std::string(task.Command).substr(0, kLongestSurvivingCommand));
}

void expectSameNumbers(const ZELO_SCHED_TASK &back, const ZELO_SCHED_TASK &task) {
#define EXPECT_SAME(field) EXPECT_EQ(back.field, task.field)
  EXPECT_SAME(ID);
  EXPECT_SAME(Owner);
  EXPECT_SAME(State);
  EXPECT_SAME(Type);
  EXPECT_SAME(StartYear);
  EXPECT_SAME(StartMonth);
  EXPECT_SAME(StartDay);
  EXPECT_SAME(RunHour);
  EXPECT_SAME(RunMin);
  EXPECT_SAME(RepeatHour);
  EXPECT_SAME(LastWorkHour);
  EXPECT_SAME(SimpleEditForm);
  EXPECT_SAME(Listable);
  EXPECT_SAME(CanEditName);
  EXPECT_SAME(CanEditOwner);
  EXPECT_SAME(CanRunAppSameTime);
  EXPECT_SAME(CanRunTaskSameTime);
  EXPECT_SAME(CanRunFromUI);
  EXPECT_SAME(CanDeleteFromUI);
  EXPECT_SAME(CanEditFromUI);
#undef EXPECT_SAME
}

// A record full of something else, so that a field that is not written shows.
Task dirtyTask() {
  Task task = makeTask("", "");
  std::memset(static_cast<void *>(task.get()), 'Z', sizeof(ZELO_SCHED_TASK));
  return task;
}

void expectSame(const ZELO_SCHED_TASK &back, const ZELO_SCHED_TASK &task) {
  expectSameTexts(back, task);
  expectSameNumbers(back, task);
  const Task untouched = dirtyTask();
  EXPECT_EQ(back.Backend, untouched->Backend);
  EXPECT_EQ(back.next, untouched->next);
  EXPECT_EQ(
      std::memcmp(back.NextTriggerTime, untouched->NextTriggerTime, sizeof(back.NextTriggerTime)),
      0);
}

class HashRoundTripPropertyTest : public SandboxTest {};

TEST_F(HashRoundTripPropertyTest, ATaskComesBackFromItsHashForm) {
  RandomTasks tasks(20130507);
  TextHash hash;
  for (int i = 0; i < kRecords && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    const Task task = tasks.next();
    const Task back = dirtyTask();
    ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), task.get()), 0);
    ASSERT_EQ(ZELOSchedInitTaskFromHash(back.get(), hash.get()), 0);
    expectSame(*back, *task);
  }
  EXPECT_EQ(logged(), std::vector<std::string>{});
}

TEST_F(HashRoundTripPropertyTest, NoValueOfAHashFormHoldsALineFeed) {
  RandomTasks tasks(20130508);
  TextHash hash;
  for (int i = 0; i < kRecords && !HasFailure(); ++i) {
    ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), tasks.next().get()), 0);
    for (const auto &[key, value] : hash.entries()) {
      EXPECT_EQ(value.find('\n'), std::string::npos) << key << " of " << i;
    }
  }
}

// Once the line feeds are gone, nothing changes any more.
TEST_F(HashRoundTripPropertyTest, ASecondRoundTripChangesNothing) {
  RandomTasks tasks(20130509);
  TextHash once;
  TextHash twice;
  for (int i = 0; i < kRecords && !HasFailure(); ++i) {
    const Task task = tasks.next();
    task->Command[kLongestSurvivingCommand] = '\0';
    const Task back = dirtyTask();
    ASSERT_EQ(ZELOSchedInitHashFromTask(once.handle(), task.get()), 0);
    ASSERT_EQ(ZELOSchedInitTaskFromHash(back.get(), once.get()), 0);
    ASSERT_EQ(ZELOSchedInitHashFromTask(twice.handle(), back.get()), 0);
    EXPECT_EQ(twice.entries(), once.entries()) << i;
  }
}

TEST_F(HashRoundTripPropertyTest, ATaskComesBackFromASectionFile) {
  RandomTasks tasks(20130510);
  for (int i = 0; i < kRecordsThroughAFile && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    writeFile(kSectionFile, "");
    const Task task = tasks.next();
    TextHash written;
    ASSERT_EQ(ZELOSchedInitHashFromTask(written.handle(), task.get()), 0);
    ASSERT_EQ(QLIBCFileAddSection(kSectionFile, "id=1", written.get(), 0), 1);
    TextHash read;
    ASSERT_EQ(QLIBCFileGetSection(kSectionFile, "id=1", read.handle()), 1);
    EXPECT_EQ(read.entries(), written.entries());
    const Task back = dirtyTask();
    ASSERT_EQ(ZELOSchedInitTaskFromHash(back.get(), read.get()), 0);
    expectSame(*back, *task);
  }
}

TEST_F(HashRoundTripPropertyTest, TasksOfOneSectionFileAreNotMixedUp) {
  RandomTasks tasks(20130511);
  constexpr int kTasks = 60;
  writeFile(kSectionFile, "");
  std::vector<Task> saved;
  for (int i = 0; i < kTasks; ++i) {
    saved.push_back(tasks.next());
    TextHash hash;
    ASSERT_EQ(ZELOSchedInitHashFromTask(hash.handle(), saved.back().get()), 0);
    const std::string section = "id=" + std::to_string(i);
    ASSERT_EQ(QLIBCFileAddSection(kSectionFile, section.c_str(), hash.get(), 0), 1);
  }
  for (int i = 0; i < kTasks && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    TextHash hash;
    const std::string section = "id=" + std::to_string(i);
    ASSERT_EQ(QLIBCFileGetSection(kSectionFile, section.c_str(), hash.handle()), 1);
    const Task back = dirtyTask();
    ASSERT_EQ(ZELOSchedInitTaskFromHash(back.get(), hash.get()), 0);
    expectSame(*back, *saved[static_cast<size_t>(i)]);
  }
}

}  // namespace
}  // namespace support
