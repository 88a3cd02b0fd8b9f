// The short forms of lists: schedules, runs, and cells that are wrapped.
#include <gtest/gtest.h>

#include "runs/history.h"
#include "runs/latest_runs.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "terminal/schedule_text.h"
#include "terminal/table.h"
#include "terminal/text.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

TEST(ZeloschedWrapTest, ATextGoesOnBelowAtItsBlanks) {
  EXPECT_EQ(wrapped("mon-fri 08:00 every 2h", 22), Lines({"mon-fri 08:00 every 2h"}));
  EXPECT_EQ(wrapped("mon-fri 08:00 every 2h", 21), Lines({"mon-fri 08:00 every", "2h"}));
  EXPECT_EQ(wrapped("mon-fri 08:00 every 2h", 13), Lines({"mon-fri 08:00", "every 2h"}));
  EXPECT_EQ(wrapped("mon-fri 08:00 every 2h", 8), Lines({"mon-fri", "08:00", "every 2h"}));
  EXPECT_EQ(wrapped("", 8), Lines({""}));
}

TEST(ZeloschedWrapTest, AWordThatIsTooLongIsDividedAndNothingIsLost) {
  EXPECT_EQ(wrapped("abcdefghij", 4), Lines({"abcd", "efgh", "ij"}));
  EXPECT_EQ(wrapped("ab cdefghij", 4), Lines({"ab", "cdef", "ghij"}));
  EXPECT_EQ(wrapped("漢字漢字", 5), Lines({"漢字", "漢字"}));
  EXPECT_EQ(wrapped("漢字", 1), Lines({"漢", "字"}));
}

TEST(ZeloschedWrapTest, ARowTakesAsManyLinesAsItsLongestCell) {
  Table table({{"ID", Column::kRight}, {"NAME", Column::kLeft, true, true}, {"RUN"}});
  table.add({{"1"}, {"Nightly backup"}, {"bad", Emphasis::kBad}});
  table.add({{"2"}, {"Mirror"}, {"-"}});
  EXPECT_EQ(table.text(17, true),
            "ID  NAME      RUN\n"
            " 1  Nightly   \033[31mbad\033[0m\n"
            "    backup\n"
            " 2  Mirror    -\n");
}

class ZeloschedBriefTest : public SandboxTest {
 protected:
  Task task_ = makeTask("t", "true");

  std::string weekly(const std::string &days) {
    setWeekly(task_.get(), days + " 08:00");
    return scheduleInBrief(*task_);
  }
};

TEST_F(ZeloschedBriefTest, ASchedule) {
  setOnce(task_.get(), "2026-12-24 18:30");
  EXPECT_EQ(scheduleInBrief(*task_), "2026-12-24 18:30");
  setDaily(task_.get(), "02:30");
  EXPECT_EQ(scheduleInBrief(*task_), "daily 02:30");
  setMonthly(task_.get(), "15 08:30");
  EXPECT_EQ(scheduleInBrief(*task_), "monthly 15 08:30");
  setYearly(task_.get(), "02-29 08:30");
  EXPECT_EQ(scheduleInBrief(*task_), "yearly 02-29 08:30");
}

TEST_F(ZeloschedBriefTest, DaysOfTheWeek) {
  EXPECT_EQ(weekly("mon-fri"), "mon-fri 08:00");
  EXPECT_EQ(weekly("sat,sun"), "sat,sun 08:00");
  EXPECT_EQ(weekly("mon,wed,thu,fri,sun"), "mon,wed-fri,sun 08:00");
  EXPECT_EQ(weekly("all"), "mon-sun 08:00");
  EXPECT_EQ(weekly("none"), "no day 08:00");
  EXPECT_EQ(weekly("fri-mon"), "mon,fri-sun 08:00");
}

TEST_F(ZeloschedBriefTest, ARepetition) {
  setWeekly(task_.get(), "mon-fri 08:00");
  setEvery(task_.get(), "2h");
  EXPECT_EQ(scheduleInBrief(*task_), "mon-fri 08:00 every 2h");
  setUntil(task_.get(), "18");
  EXPECT_EQ(scheduleInBrief(*task_), "mon-fri 08:00 every 2h until 18");
}

RunRecord ended(Outcome outcome, long end) {
  RunRecord run;
  run.state = RunState::kEnded;
  run.outcome = outcome;
  run.end = end;
  return run;
}

TEST(ZeloschedRunInBriefTest, OutcomesWithTheirAges) {
  constexpr long kNow = 1000000;
  RunRecord failed = ended(Outcome::kFailed, kNow - 3 * 3600 - 3599);
  failed.exitCode = 7;
  EXPECT_EQ(runInBrief(failed, kNow), "failed 7, 3 h ago");
  RunRecord killed = ended(Outcome::kKilled, kNow - 59);
  killed.signal = 9;
  EXPECT_EQ(runInBrief(killed, kNow), "killed KILL, 59 s ago");
  killed.signal = 200;
  EXPECT_EQ(runInBrief(killed, kNow), "killed 200, 59 s ago");
  EXPECT_EQ(runInBrief(ended(Outcome::kFinished, kNow - 60), kNow), "finished, 1 min ago");
  EXPECT_EQ(runInBrief(ended(Outcome::kTimeLimit, kNow - 86400), kNow), "time limit, 1 d ago");
  EXPECT_EQ(runInBrief(ended(Outcome::kGaveUp, kNow), kNow), "gave up, 0 s ago");
  EXPECT_EQ(runInBrief(ended(Outcome::kNotStarted, kNow + 50), kNow), "not started, 0 s ago");
  EXPECT_EQ(runInBrief(ended(Outcome::kLost, kNow - 5), kNow), "lost, 5 s ago");
}

TEST(ZeloschedRunInBriefTest, ARunThatGoesOn) {
  RunRecord run;
  run.queued = 100;
  EXPECT_EQ(runInBrief(run, 160), "waiting for 1 min");
  run.state = RunState::kRunning;
  run.start = 200;
  EXPECT_EQ(runInBrief(run, 200 + 17 * 60), "running for 17 min");
  EXPECT_FALSE(isBad(run));
}

TEST(ZeloschedRunInBriefTest, WhatEndedOtherwiseThanWellIsBad) {
  EXPECT_FALSE(isBad(ended(Outcome::kFinished, 0)));
  for (const Outcome outcome : {Outcome::kFailed, Outcome::kKilled, Outcome::kNotStarted,
                                Outcome::kTimeLimit, Outcome::kGaveUp, Outcome::kLost}) {
    EXPECT_TRUE(isBad(ended(outcome, 0)));
  }
}

}  // namespace
}  // namespace support
