// zelosched catch-up
#include <unistd.h>

#include <cstdio>
#include <ctime>

#include "commands/command.h"
#include "commands/for_each.h"
#include "commands/options.h"
#include "runs/coming_runs.h"
#include "runs/history_keep.h"
#include "runs/missed.h"
#include "runs/span.h"
#include "runs/start_run.h"
#include "store/change_lock.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

constexpr Option kCatchUpOptions[] = {{"within", Option::kValue}, {"dry-run"}};
constexpr char kUsualSpan[] = "12h";

int64_t secondsOf(const std::string &text) {
  if (const std::optional<int64_t> seconds = parseSpan(text, kMissedRemembered)) return *seconds;
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
    // The run may have to wait for its turn, without a record in the history yet.
    acknowledge(KeptDatabase(KeptDatabase::kChange), missed.task->ID, Acknowledged::kMissed);
  }
  std::printf("%s was due at %s: %s\n", titleOf(*missed.task).c_str(),
              minuteText(localMinute(missed.due)).c_str(),
              isDryRun ? "would be started" : "started");
}

int catchUpAll(const std::string &span, bool isDryRun) {
  const time_t since = time(nullptr) - secondsOf(span);
  if (geteuid() == 0) sweepRuns();  // what other programs have run was not missed
  const TaskList list;
  std::vector<MissedTask> all = missedTasks(KeptDatabase(KeptDatabase::kRead), list, since);
  std::erase_if(all, [](const MissedTask &missed) { return missed.times == 0; });
  if (all.empty()) std::printf("no run was missed within %s\n", span.c_str());
  return forEach(all, [&](const MissedTask &missed) { catchUp(missed, isDryRun); });
}

int runCatchUp(int argc, char **argv) {
  const Arguments arguments(argc, argv, kCatchUpOptions);
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
