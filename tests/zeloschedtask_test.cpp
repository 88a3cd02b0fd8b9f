// The program that cron starts.
#include <gtest/gtest.h>

#include <cstdint>
#include <ctime>

#include "failing_calls.h"
#include "run_program.h"
#include "sandbox_fixture.h"
#include "status_db.h"
#include "tasks.h"

namespace support {
namespace {

constexpr char kProgram[] = ZELO_BIN_DIR "/zeloschedtask";
constexpr int kUsageStatus = 2;

class ZeloschedtaskTest : public SandboxTest {
 protected:
  static Outcome runTask(const std::string &argument) {
    return runProgram({kProgram, "--run", argument});
  }

  // Daily, and due in every minute in which the test may run: the program has the real clock.
  static Task dueTask(const std::string &command) {
    const time_t now = time(nullptr);
    tm broken{};
    localtime_r(&now, &broken);
    Task task = makeTask("due", command);
    task->RunHour = static_cast<uint32_t>(broken.tm_hour);
    task->RunMin = static_cast<uint32_t>(broken.tm_min);
    task->CanRunTaskSameTime = 1;
    return task;
  }

  // Saves the task with the current minute, and tries again when the minute passed meanwhile.
  template <typename Change>
  static Outcome runDueTask(const std::string &command, Change change) {
    constexpr time_t kSecondsPerMinute = 60;
    for (;;) {
      const time_t before = time(nullptr) / kSecondsPerMinute;
      Task task = dueTask(command);
      change(task);
      const long id = saveTask(task);
      const Outcome outcome = runTask("id=" + std::to_string(id));
      waitForChildRuns();
      if (time(nullptr) / kSecondsPerMinute == before) return outcome;
      cleanWorld();
    }
  }
};

TEST_F(ZeloschedtaskTest, ADueTaskIsRunAndRecorded) {
  const Outcome outcome = runDueTask("echo ran > /tmp/zeloschedtask_ran", [](Task &) {});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.out + outcome.err, "");
  EXPECT_EQ(readFile("/tmp/zeloschedtask_ran"), "ran\n");
  const std::vector<StatusRow> rows = statusRows();
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0].taskId, 1);
  EXPECT_EQ(rows[0].statusCode, ZELO_SCHED_STATUS_FINISHED);
}

TEST_F(ZeloschedtaskTest, ADisabledTaskIsSilentlyNotRun) {
  const Outcome outcome =
      runDueTask("true", [](Task &task) { task->State = ZELO_SCHED_STATE_DISABLED; });
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.out + outcome.err, "");
  EXPECT_TRUE(statusRows().empty());
}

TEST_F(ZeloschedtaskTest, ATaskThatStartsLaterIsSilentlyNotRun) {
  const Outcome outcome = runDueTask("true", [](Task &task) { task->StartYear = 9999; });
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.out + outcome.err, "");
  EXPECT_TRUE(statusRows().empty());
}

TEST_F(ZeloschedtaskTest, AnUnknownTaskIsReportedOnOneLineWithTheErrorRecord) {
  for (const std::string &id : {std::string("7"), std::string("-5"), std::to_string(INT32_MAX)}) {
    const Outcome outcome = runTask("id=" + id);
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.out, "");
    const std::string start = "zeloschedtask: cannot run task " + id + ": 0x";
    EXPECT_EQ(outcome.err.substr(0, start.size()), start);
    EXPECT_EQ(linesOf(outcome.err).size(), 1U);
    EXPECT_TRUE(outcome.err.find(".cpp:") != std::string::npos) << outcome.err;
  }
}

TEST_F(ZeloschedtaskTest, ARunIsMadeUpForThatWasDueAfter2038) {
  const std::string id = "id=" + std::to_string(saveTask(makeTask("late", "echo ran > /tmp/late")));
  const auto runDueAt = [&](const std::string &due) {
    return runProgram({kProgram, "--run", id, "--now", "--trigger=catch-up", "--due=" + due});
  };
  const Outcome outcome = runDueAt("4294967280");
  waitForChildRuns();
  EXPECT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_EQ(readFile("/tmp/late"), "ran\n");
  EXPECT_EQ(runDueAt("9223372036854775808").status, kUsageStatus);
}

TEST_F(ZeloschedtaskTest, HelpAndVersionGoToStandardOutput) {
  const Outcome help = runProgram({kProgram, "--help"});
  EXPECT_EQ(help.status, 0);
  EXPECT_EQ(help.out.rfind("usage: zeloschedtask --run id=ID\n", 0), 0U);
  EXPECT_EQ(help.err, "");
  const Outcome version = runProgram({kProgram, "--version"});
  EXPECT_EQ(version.status, 0);
  EXPECT_EQ(version.out, "zeloschedtask 4.0.0\n");
  EXPECT_EQ(version.err, "");
}

TEST_F(ZeloschedtaskTest, AnythingElseIsAUsageError) {
  const std::vector<std::vector<std::string>> wrong = {
      {},
      {""},
      {"--run"},
      {"--run", ""},
      {"--run", "7"},
      {"--run", "id="},
      {"--run", "id=-"},
      {"--run", "id=x"},
      {"--run", "id=7x"},
      {"--run", "id=7 "},
      {"--run", " id=7"},
      {"--run", "id= 7"},
      {"--run", "id=+7"},
      {"--run", "id=--7"},
      {"--run", "id=0x7"},
      {"--run", "id=7.0"},
      {"--run", "ID=7"},
      {"--run", "id=2147483648"},
      {"--run", "id=-2147483649"},
      {"--run", "id=4294967297"},
      {"--run", "id=9223372036854775808"},
      {"--run", "id=-9223372036854775809"},
      {"--run", "id=99999999999999999999999999"},
      {"--run", "id=7", "id=8"},
      {"--run", "id=7", "--help"},
      {"--run id=7"},
      {"--run=id=7"},
      {"--help", "--version"},
      {"--unknown"},
      {"id=7", "--run"},
  };
  for (const std::vector<std::string> &arguments : wrong) {
    std::vector<std::string> command = {kProgram};
    command.insert(command.end(), arguments.begin(), arguments.end());
    const Outcome outcome = runProgram(command);
    EXPECT_EQ(outcome.status, kUsageStatus) << testing::PrintToString(arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err.rfind("usage: zeloschedtask --run id=ID\n", 0), 0U);
  }
}

}  // namespace
}  // namespace support
