#include "check/health.h"

#include <algorithm>
#include <functional>

#include "check/copies_check.h"
#include "check/notice_findings.h"
#include "check/run_findings.h"
#include "check/system_check.h"
#include "check/task_findings.h"
#include "terminal/failure.h"

namespace {

class Examination {
 public:
  template <class Check>
  void make(Check check) {
    try {
      const Findings found = check();
      findings_.insert(findings_.end(), found.begin(), found.end());
    } catch (const Failure &failure) {
      addOnce({Severity::kWarning, "check", failure.what()});
    }
  }

  Findings worstFirst() {
    std::stable_sort(findings_.begin(), findings_.end(),
                     [](const Finding &a, const Finding &b) { return a.severity > b.severity; });
    return std::move(findings_);
  }

 private:
  // Several checks fail for one reason, such as a store that cannot be read.
  void addOnce(const Finding &finding) {
    const bool isSaid = std::any_of(findings_.begin(), findings_.end(),
                                    [&](const Finding &said) { return said.text == finding.text; });
    if (!isSaid) findings_.push_back(finding);
  }

  Findings findings_;
};

}  // namespace

Findings examineHealth() {
  Examination examination;
  for (const auto check :
       {checkCron, checkProgram, checkCopies, checkLastGoodCopy, checkCrontabLength, checkTmp,
        checkSharedNames, checkTurns, checkNotices, checkSettings}) {
    examination.make(check);
  }
  examination.make([&] {
    const TaskList list;
    for (const auto check :
         {checkTasksAreReadable, checkCrontab, checkTaskFields, checkPower, checkRuns}) {
      examination.make([&] { return check(list); });
    }
    return Findings();
  });
  return examination.worstFirst();
}
