// zelosched restore
#include <sched_shared_names.h>
#include <sched_store_lock.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "commands/command.h"
#include "commands/options.h"
#include "runs/missed.h"
#include "store/change_lock.h"
#include "store/leftovers.h"
#include "store/place_file.h"
#include "store/shared_names.h"
#include "store/store_copy.h"
#include "store/store_files.h"
#include "store/synchronise.h"
#include "store/task_program.h"
#include "terminal/failure.h"

namespace {

constexpr Option kRestoreOptions[] = {{"force"}};

constexpr mode_t kStoreMode = 0644;

constexpr mode_t kProgramMode = 0755;

// ---- putting the tasks back ---------------------------------------------------------------------

Failure refused(const std::string &path, const StoreCopy &copy) {
  return Failure(path + " " + copy.why + ": it is not used");
}

// The copy to fall back on at a later boot. It is written only where it differs, as it may be on
// flash memory, which wears out.
void keepLastGood() {
  const std::string contents = contentsOf(kPersistentCopy);
  if (judgeStore(kLastGoodCopy).isWhole() && contentsOf(kLastGoodCopy) == contents) return;
  placeFile(kLastGoodCopy, contents, kStoreMode);
}

// Atomically, whatever is there, so that no other user can take the name in between.
void replaceName(const SchedSharedName &name) {
  SchedMovedTo movedTo;
  if (!schedReplaceName(name, &movedTo)) {
    throw Failure(std::string("cannot take ") + name.path + ": " + std::strerror(errno));
  }
  if (movedTo[0] != '\0') complain(std::string("what was ") + name.path + " is now " + movedTo);
}

void placeWorkingCopy(const char *source) {
  const std::string contents = contentsOf(source);
  replaceName({kWorkingCopy, kStoreMode, false, contents});
  std::printf("%s was put back from %s\n", kWorkingCopy, source);
}

// The name must not stay free: another user could move a file of root's there.
void takeWorkingName() {
  if (!schedTakeName(kSchedStoreToRestore)) {
    throw Failure(std::string("cannot take ") + kWorkingCopy + ": " + std::strerror(errno) +
                  ": no task can be saved until it is root's");
  }
}

void putLastGoodBack(const StoreCopy &persistent) {
  const StoreCopy lastGood = judgeStore(kLastGoodCopy);
  const bool isMissing = persistent.condition == StoreCopy::kMissing;
  if (isMissing && lastGood.condition == StoreCopy::kMissing) {
    takeWorkingName();
    std::puts("no task was ever saved: there is nothing to put back");
    return;
  }
  const std::string what = isMissing ? std::string(kPersistentCopy) + " is missing"
                                     : refused(kPersistentCopy, persistent).what();
  if (!lastGood.isUsable()) {
    takeWorkingName();
    const std::string why =
        lastGood.condition == StoreCopy::kMissing ? "there is no " : "neither can be used: ";
    throw Failure(what + ", and " + why + kLastGoodCopy +
                  (lastGood.why.empty() ? "" : " " + lastGood.why) + ": no task will run");
  }
  placeWorkingCopy(kLastGoodCopy);
  if (persistent.condition != StoreCopy::kDamaged || !lastGood.isWhole()) {
    throw Failure(what + ". The tasks are those of " + kLastGoodCopy +
                  ": look through them, and save one to write both copies anew");
  }
  // It is written before the persistent copy, so it lacks no change that was reported as saved.
  placeFile(kPersistentCopy, contentsOf(kLastGoodCopy), kStoreMode);
  complain(what + ". The tasks are those of " + kLastGoodCopy + ", and all copies agree again");
}

// Whether the doubtful copy has no fewer tasks than the last good one.
bool isNoLessThanLastGood(const StoreCopy &persistent) {
  const StoreCopy lastGood = judgeStore(kLastGoodCopy);
  return !lastGood.isUsable() || (persistent.isHeaded && persistent.tasks >= lastGood.tasks);
}

void putDoubtfulBack(const StoreCopy &persistent) {
  placeWorkingCopy(kPersistentCopy);
  throw Failure(std::string(kPersistentCopy) + " " + persistent.why +
                ". It was used all the same, since it has no fewer tasks than " + kLastGoodCopy +
                ": look through them, and save one to write both copies anew");
}

// Keeps a usable working copy, which every program reads, and mends the other copies by it.
void keepWorkingCopy(const StoreCopy &working, const StoreCopy &persistent) {
  const char *const what = working.isWhole() ? "is there and whole" : "is there";
  if (persistent.isWhole()) {
    std::printf("%s %s: it stays (--force replaces it)\n", kWorkingCopy, what);
    keepLastGood();
    return;
  }
  std::printf("%s %s: it stays\n", kWorkingCopy, what);
  const std::string why = persistent.why.empty() ? "is missing" : persistent.why;
  // As the next change would: a copy that is cut off has nothing that the working copy lacks.
  const bool isCutOff =
      persistent.condition == StoreCopy::kDamaged || persistent.condition == StoreCopy::kMissing;
  if (working.isWhole() && isCutOff) {
    placeFile(kPersistentCopy, contentsOf(kWorkingCopy), kStoreMode);
    keepLastGood();
    complain(std::string(kPersistentCopy) + " " + why + ": it was written anew from " +
             kWorkingCopy);
    return;
  }
  throw Failure(std::string(kPersistentCopy) + " " + why +
                ": save a task, which writes it anew, or all are lost at the next boot");
}

void replaceWorkingCopy(const StoreCopy &persistent) {
  if (persistent.isWhole()) {
    placeWorkingCopy(kPersistentCopy);
    keepLastGood();
  } else if (persistent.isUsable() && isNoLessThanLastGood(persistent)) {
    putDoubtfulBack(persistent);
  } else {
    putLastGoodBack(persistent);
  }
}

// Such a store was made to reserve the name, before the tasks were put back.
bool onlyHoldsTheName(const StoreCopy &working) {
  return working.condition == StoreCopy::kEmpty || (working.tasks == 0 && !working.isHeaded);
}

void putStoreBack(bool isForced) {
  const StoreLock turn;
  if (!turn.isHeld()) throw failedTo("put the tasks back");
  const StoreCopy working = judgeWorkingStore(kWorkingCopy);
  if (!working.isUsable() && !working.why.empty()) complain(refused(kWorkingCopy, working).what());
  const StoreCopy persistent = judgeStore(kPersistentCopy);
  // Even --force replaces a usable working copy only by a whole persistent copy.
  if (working.isUsable() && !onlyHoldsTheName(working) && !(isForced && persistent.isWhole())) {
    keepWorkingCopy(working, persistent);
  } else {
    replaceWorkingCopy(persistent);
  }
}

// Last, since there may be very many. Under the lock, as a change in progress has such a copy.
void clearScratch() {
  const StoreLock turn;
  if (!turn.isHeld()) throw failedTo("take scratch copies away");
  clearScratchNames();
}

// ---- the program that cron starts ---------------------------------------------------------------

void putProgramBack() {
  const std::string installed = installedTaskProgram();
  const std::string program = contentsOf(installed);
  if (program.empty()) throw Failure(installed + " is cut off: it has no bytes");
  replaceName({kTaskProgram, kProgramMode, false, program});
  std::printf("%s was put back from %s\n", kTaskProgram, installed.c_str());
}

// ---- all together -------------------------------------------------------------------------------

int runRestore(int argc, char **argv) {
  const Arguments arguments(argc, argv, kRestoreOptions);
  arguments.requireNoOperands();
  arguments.requireNoCommand();
  const bool isForced = arguments.has("force");
  const ChangeLock lock;
  // A step that fails does not stop the others.
  const int results[] = {
      attempt(putProgramBack), attempt([&] { putStoreBack(isForced); }),
      takeSharedNames(),       attempt(removeLeftovers),
      attempt(synchronise),    attempt([] { markMachineUp(true); }),
      attempt(clearScratch),
  };
  return *std::max_element(std::begin(results), std::end(results));
}

}  // namespace

const Command kRestoreCommand = {
    "restore", "[--force]", "put the tasks back into /tmp, as at boot",
    "Puts the persistent copy of the tasks and the program that cron starts back into\n"
    "/tmp, makes the lock and the status database there, and writes the crontab. The system\n"
    "does it at boot, before cron and before anybody can log in.\n"
    "\n"
    "A persistent copy that is cut off or cannot be read is not used; the last good one,\n"
    "which each change writes before it, takes its place. So it is with one whose checksum\n"
    "does not fit, unless it has no fewer tasks; the exit status is 1 then. Tasks that are\n"
    "in /tmp, root's and whole, stay: a restore by hand loses nothing.\n"
    "\n"
    "  --force                        replace them by the persistent copy all the same\n",
    runRestore};
