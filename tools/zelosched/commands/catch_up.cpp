// zelosched catch-up
#include <unistd.h>

#include <cstdio>
#include <ctime>

#include "commands/command.h"
#include "commands/options.h"
#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "runs/start_run.h"
#include "store/change_lock.h"
#include "terminal/failure.h"
#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr Option kOptions[] = {{"within", Option::kValue}, {"dry-run"}};
constexpr char kUsualSpan[] = "12h";

struct Unit {
  char letter;
  int64_t seconds;
};
constexpr Unit kUnits[] = {{'m', 60}, {'h', int64_t{60} * 60}, {'d', int64_t{24} * 60 * 60}};

// "90m", "12h", "2d".
int64_t parseSpan(const std::string &text) {
  for (const Unit &unit : kUnits) {
    if (text.empty() || text.back() != unit.letter) continue;
    const std::optional<int64_t> count = parseNumber(text.substr(0, text.size() - 1));
    if (count && *count > 0 && *count <= kMissedRemembered / unit.seconds) {
      return *count * unit.seconds;
    }
  }
  throw UsageError("'--within' takes a time from 1m to 8d, such as 90m, 12h or 2d, not '" +
                   printable(text) + "'");
}

// Runs the task, unless it is only to be listed.
void catchUp(const MissedTask &missed, bool isDryRun) {
  if (!isDryRun) {
    RunRequest request;
    request.trigger = Trigger::kCatchUp;
    request.due = missed.due;
    request.isDisabledSkipped = true;
    const StartedRun run(*missed.task, request);
    // The run may have to wait for its turn, unrecorded so far.
    acknowledge(KeptDatabase(KeptDatabase::kChange), missed.task->ID, Acknowledged::kMissed);
  }
  std::printf("%s was due at %s: %s\n", titleOf(*missed.task).c_str(),
              minuteText(localMinute(missed.due)).c_str(),
              isDryRun ? "would be started" : "started");
}

int catchUpAll(const std::string &span, bool isDryRun) {
  const time_t since = time(nullptr) - parseSpan(span);
  if (geteuid() == 0) sweepRuns();  // what other programs have run was not missed
  const TaskList list;
  std::vector<MissedTask> all = missedTasks(KeptDatabase(KeptDatabase::kRead), list, since);
  std::erase_if(all, [](const MissedTask &missed) { return missed.times == 0; });
  if (all.empty()) std::printf("no run was missed within %s\n", span.c_str());
  int status = kDone;
  for (const MissedTask &missed : all) {
    try {
      catchUp(missed, isDryRun);
    } catch (const Failure &failure) {
      status = complain(failure.what());
    }
  }
  return status;
}

int runCatchUp(int argc, char **argv) {
  const Arguments arguments(argc, argv, kOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const std::string span = arguments.value("within", kUsualSpan);
  if (arguments.has("dry-run")) return catchUpAll(span, true);
  // Of two at once, the second finds nothing left to do.
  const ChangeLock lock;
  return catchUpAll(span, false);
}

}  // namespace

const Command kCatchUpCommand = {
    "catch-up", "[--within TIME] [--dry-run]", "run the tasks that were missed",
    "Runs once, now, each enabled task that was due and did not run, since the machine was\n"
    "off or cron was not running. What was due while the machine was off by its power times\n"
    "is left out. All are started at once, and wait for others as always.\n"
    "\n"
    "  --within TIME                  only those due so short a time ago, such as 90m, 12h or\n"
    "                                 2d; 12h, and 8d at most\n"
    "  --dry-run                      list them, and run nothing\n",
    runCatchUp};
