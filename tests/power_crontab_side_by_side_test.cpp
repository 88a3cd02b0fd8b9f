// Two backends write the same crontab, each its own lines: after any edit of either, every line is
// the one that its task asks for, and nobody else's line has changed.
//
// The crontab is left behind for tests/power_crontab_cron_test.sh, which gives it to a real daemon.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <map>
#include <random>

#include "captured_log.h"
#include "failing_calls.h"
#include "fake_clock.h"
#include "power.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelosched.h"

namespace support {
namespace {

using Lines = std::vector<std::string>;

constexpr char kCheck[] = "/usr/zelo/bin/zelo_poweroff_feasible_check";
constexpr char kProgram[] = "/tmp/zeloschedtask";
constexpr mode_t kMode = 0640;

std::string joined(const std::vector<int> &numbers) {
  std::string text;
  for (const int number : numbers) text += (text.empty() ? "" : ",") + std::to_string(number);
  return text;
}

class SideBySideTest : public SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    haveClock();
    std::filesystem::permissions(kCrontab, std::filesystem::perms(kMode));
  }

  unsigned below(unsigned limit) { return static_cast<unsigned>(random_() % limit); }
  bool maybe() { return below(3) > 0; }

  static std::string week(unsigned weekdays) {
    std::string text(7, '0');
    for (size_t i = 0; i < text.size(); ++i) {
      if ((weekdays >> i & 1U) != 0) text[i] = '1';
    }
    return text;
  }

  // ---- ordinary tasks: by id, their line, or none for a disabled one

  void fillOrdinary(ZELO_SCHED_TASK *task) {
    const unsigned weekdays = 1 + below(127);
    task->State = maybe() ? ZELO_SCHED_STATE_ENABLED : ZELO_SCHED_STATE_DISABLED;
    task->Type = maybe() ? ZELO_SCHED_TYPE_WEEKLY : ZELO_SCHED_TYPE_DAILY;
    setText(task->Week, week(weekdays));
    task->RunHour = below(24);
    task->RunMin = below(60);
  }

  void remember(const ZELO_SCHED_TASK &task) {
    std::vector<int> days;
    for (int i = 0; i < 7; ++i) {
      if (task.Week[i] != '0') days.push_back(i);
    }
    ordinary_[task.ID] = task.State != ZELO_SCHED_STATE_ENABLED
                             ? ""
                             : std::to_string(task.RunMin) + "\t" + std::to_string(task.RunHour) +
                                   "\t*\t*\t" +
                                   (task.Type == ZELO_SCHED_TYPE_DAILY ? "*" : joined(days)) +
                                   "\troot\t" + kProgram + " --run id=" + std::to_string(task.ID);
  }

  void editOrdinary() {
    const unsigned choice = ordinary_.empty() ? 0 : below(4);
    if (choice <= 1) {
      const Task task = makeTask("", "/bin/true " + std::string(kCheck));
      fillOrdinary(task.get());
      ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
      remember(*task);
      return;
    }
    const auto victim =
        std::next(ordinary_.begin(), below(static_cast<unsigned>(ordinary_.size())));
    if (choice == 2) {
      const Task task = loadTask(victim->first);
      fillOrdinary(task.get());
      ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
      remember(*task);
    } else {
      ASSERT_EQ(ZELOSchedTaskRemove(victim->first), 0);
      ordinary_.erase(victim);
    }
  }

  // ---- power tasks: the two lists

  static long idOf(int list, const Entry &entry) {
    return (list == kOff ? 80000000 : 60000000) + entry.enabled * 10000000L +
           entry.weekdays * 10000L + entry.hour * 100L + entry.minute;
  }

  Entry newEntry() {
    return {static_cast<unsigned char>(maybe()), static_cast<unsigned char>(below(128)),
            static_cast<unsigned char>(below(24)), static_cast<unsigned char>(below(60))};
  }

  static void fillPower(ZELO_SCHED_TASK *task, const Entry &entry) {
    task->State = entry.enabled == 1 ? ZELO_SCHED_STATE_ENABLED : ZELO_SCHED_STATE_DISABLED;
    setText(task->Week, week(entry.weekdays));
    task->RunHour = entry.hour;
    task->RunMin = entry.minute;
  }

  void editPower() {
    const int list = below(4) == 0 ? kOn : kOff;
    Entries &entries = power_[list];
    const unsigned choice = entries.empty() ? 0 : below(4);
    const Entry entry = newEntry();
    if (choice <= 1) {
      const Task task = makeTask("", "");
      task->Backend = ZELO_SCHED_BACKEND_AUTOPOWER;
      setText(task->AppArgs, list == kOff ? "poweroff" : "poweron");
      fillPower(task.get(), entry);
      ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
      if (std::find(entries.begin(), entries.end(), entry) == entries.end()) {
        entries.push_back(entry);
      }
      return;
    }
    const Entry chosen = entries[below(static_cast<unsigned>(entries.size()))];
    const auto victim = std::find(entries.begin(), entries.end(), chosen);
    if (choice == 2) {
      const Task task = loadTask(idOf(list, chosen));
      fillPower(task.get(), entry);
      ASSERT_EQ(ZELOSchedTaskSave(task.get()), 0);
      *victim = entry;
    } else {
      ASSERT_EQ(ZELOSchedTaskRemove(idOf(list, chosen)), 0);
      entries.erase(victim);
    }
  }

  // ---- what the crontab must hold

  Lines ordinaryLines() const {
    Lines lines;
    for (const auto &[id, line] : ordinary_) {
      if (!line.empty()) lines.push_back(line);
    }
    std::sort(lines.begin(), lines.end());
    return lines;
  }

  // In the order of the list.
  Lines powerLines() const {
    Lines lines;
    for (const Entry &entry : power_.at(kOff)) {
      std::vector<int> days;
      for (int i = 0; i < 7; ++i) {
        if ((entry.weekdays >> i & 1) != 0) days.push_back(i);
      }
      if (entry.enabled == 0 || days.empty()) continue;
      lines.push_back(std::to_string(entry.minute) + "\t" + std::to_string(entry.hour) +
                      "\t*\t*\t" + (days.size() == 7 ? "*" : joined(days)) + "\troot\t" + kCheck);
    }
    return lines;
  }

  void checkCrontab() const {
    Lines ordinary;
    Lines power;
    std::string others;
    for (const std::string &line : linesOf(readFile(kCrontab))) {
      if (line.find(kProgram) != std::string::npos) {
        ordinary.push_back(line);
      } else if (line.find(kCheck) != std::string::npos) {
        power.push_back(line);
      } else {
        others += line + "\n";
      }
    }
    std::sort(ordinary.begin(), ordinary.end());
    EXPECT_EQ(ordinary, ordinaryLines());
    EXPECT_EQ(power, powerLines());
    EXPECT_EQ(others, kPlainCrontab);
    EXPECT_EQ(powerList(kOn), power_.at(kOn));
    EXPECT_EQ(powerList(kOff), power_.at(kOff));
    struct stat status = {};
    ASSERT_EQ(stat(kCrontab, &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, kMode);
  }

  std::mt19937 random_{200};
  std::map<long, std::string> ordinary_;
  std::map<int, Entries> power_{{kOn, {}}, {kOff, {}}};
};

TEST_F(SideBySideTest, TheLinesOfBothBackendsOutliveTwoHundredEditsOfEither) {
  constexpr int kEdits = 200;
  for (int i = 0; i < kEdits; ++i) {
    SCOPED_TRACE(testing::Message() << "edit " << i);
    editOrdinary();
    ASSERT_NO_FATAL_FAILURE(checkCrontab());
    editPower();
    ASSERT_NO_FATAL_FAILURE(checkCrontab());
    if (HasFailure()) return;
  }
  EXPECT_GT(ordinaryLines().size(), 5U);
  EXPECT_GT(powerLines().size(), 5U);
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
}  // namespace support
