// Which applications come with the appliance's scheduler.
#include <gtest/gtest.h>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace {

class TaskIsBuildInAppTest : public support::SandboxTest {
 protected:
  static int isBuildIn(const std::string &app) {
    ZELO_SCHED_TASK task = {};
    support::setText(task.App, app);
    return ZELOSchedTaskIsBuildInApp(&task);
  }
};

TEST_F(TaskIsBuildInAppTest, TheFourApplicationsOfTheSchedulerAre) {
  for (const char *app : {"ZELO.TOV.TaskScheduler.Script", "ZELO.TOV.TaskScheduler.Recycle",
                          "ZELO.TOV.TaskScheduler.Beep", "ZELO.TOV.TaskScheduler.Service"}) {
    EXPECT_EQ(isBuildIn(app), 1) << app;
  }
}

TEST_F(TaskIsBuildInAppTest, ThePowerScheduleIsNot) {
  EXPECT_EQ(isBuildIn("ZELO.TOV.TaskScheduler.AutoPower"), 0);
}

TEST_F(TaskIsBuildInAppTest, TheNameMustBeExactlyTheSame) {
  for (const char *app : {"", "Beep", "zelo.tov.taskscheduler.beep", "ZELO.TOV.TaskScheduler.Bee",
                          "ZELO.TOV.TaskScheduler.Beeper", " ZELO.TOV.TaskScheduler.Beep",
                          "ZELO.TOV.TaskScheduler"}) {
    EXPECT_EQ(isBuildIn(app), 0) << app;
  }
}

TEST_F(TaskIsBuildInAppTest, NoOtherFieldCounts) {
  ZELO_SCHED_TASK task = {};
  support::setText(task.AppName, "ZELO.TOV.TaskScheduler.Beep");
  support::setText(task.Name, "ZELO.TOV.TaskScheduler.Beep");
  EXPECT_EQ(ZELOSchedTaskIsBuildInApp(&task), 0);
}

TEST_F(TaskIsBuildInAppTest, NoTaskIsNotAndIsNoFailure) {
  EXPECT_EQ(ZELOSchedTaskIsBuildInApp(nullptr), 0);
  EXPECT_EQ(support::logged(), std::vector<std::string>{});
  EXPECT_EQ(support::errorRecord(), (support::ErrorRecord{0, ""}));
}

}  // namespace
