#include "check/copies_check.h"

#include <sched_shared_names.h>
#include <zelocore.h>

#include <cstdint>

#include "store/place_file.h"
#include "store/store_copy.h"
#include "store/store_files.h"
#include "terminal/failure.h"

namespace {

constexpr char kKind[] = "copies";
constexpr char kPutTasksBack[] = "'zelosched restore' puts the tasks back";
constexpr char kWriteAnew[] = "'zelosched restore' writes it anew";

Findings found(Severity severity, const std::string &text, const std::string &remedy) {
  return {{severity, kKind, text, remedy}};
}

Findings critical(const std::string &text, const std::string &remedy = "") {
  return found(Severity::kCritical, text, remedy);
}

Findings warning(const std::string &text, const std::string &remedy = "") {
  return found(Severity::kWarning, text, remedy);
}

Findings ok(const std::string &text) {
  return {{Severity::kOk, kKind, text}};
}

bool exists(const char *path) {
  return QLIBCFileExist(path) != 0;
}

bool isNothingSaved() {
  const bool isNothing = !exists(kWorkingCopy) || countSections(kWorkingCopy) == 0;
  return isNothing && !exists(kPersistentCopy) && !exists(kLastGoodCopy);
}

}  // namespace

Findings checkLastGoodCopy() {
  if (!exists(kPersistentCopy) || !judgeStore(kPersistentCopy).isWhole()) return {};
  if (!exists(kLastGoodCopy))
    return warning(std::string(kLastGoodCopy) + " is missing", kWriteAnew);
  if (contentsIfReadable(kLastGoodCopy) == contentsIfReadable(kPersistentCopy)) return {};
  return warning(std::string(kLastGoodCopy) + " is not as " + kPersistentCopy + " is", kWriteAnew);
}

Findings checkCopies() {
  const char *why = nullptr;
  if (schedLookAt(kSchedStore, &why) == SchedNameState::kForeign) {
    return critical(std::string(kWorkingCopy) + " " + why, kPutTasksBack);
  }
  if (isNothingSaved()) return ok("no task was ever saved");
  if (!exists(kWorkingCopy)) {
    return critical(std::string(kWorkingCopy) + " is missing", kPutTasksBack);
  }
  if (doTasksWaitForRestore()) {
    return critical(std::string(kWorkingCopy) + " has no tasks, though some are kept",
                    kPutTasksBack);
  }
  if (!countSections(kWorkingCopy)) {
    return critical(std::string(kWorkingCopy) + " cannot be read: " + errorInWords());
  }
  if (!exists(kPersistentCopy)) {
    return warning(std::string(kPersistentCopy) + " is missing", kWriteAnew);
  }
  if (!countSections(kPersistentCopy)) {
    return warning(std::string(kPersistentCopy) + " cannot be read: " + errorInWords());
  }
  if (contentsIfReadable(kPersistentCopy).empty()) {
    return warning(std::string(kPersistentCopy) + " is cut off",
                   std::string(kWriteAnew) + " from " + kWorkingCopy);
  }
  if (contentsIfReadable(kWorkingCopy) == contentsIfReadable(kPersistentCopy)) {
    return ok("the working and the persistent copy of the tasks agree");
  }
  return warning("the working and the persistent copy of the tasks differ",
                 "save a task again, or what was changed last is lost at the next boot");
}
