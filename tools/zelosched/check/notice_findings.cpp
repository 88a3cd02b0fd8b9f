#include "check/notice_findings.h"

#include <unistd.h>

#include "runs/notices.h"

namespace {

// Why the program does not notify anybody; empty when no fault is known.
std::string faultOf(const NoticeProgram &program) {
  if (!program.fault.empty()) return program.fault;
  if (program.path == kMailProgram && !hasMailer()) {
    return std::string("has no ") + kMailer + ": nobody is mailed: install a mail transfer agent";
  }
  const std::string last = lastFaultOf(program);
  return last.empty() ? "" : last + " when it was last told of a run";
}

}  // namespace

Findings checkNotices() {
  if (geteuid() != 0) {
    return {{Severity::kUnknown, "notice",
             "whether somebody is told of failed runs, only root may see"}};
  }
  Findings findings;
  std::string told;
  for (const NoticeProgram &program : noticePrograms()) {
    const std::string fault = faultOf(program);
    if (!fault.empty()) {
      findings.push_back({Severity::kWarning, "notice", program.path + " " + fault});
    } else {
      told += (told.empty() ? "" : ", ") + program.path.substr(program.path.rfind('/') + 1);
    }
  }
  if (!findings.empty()) return findings;
  if (told.empty()) {
    return {{Severity::kOk, "notice", "nobody is told of failed runs",
             "'zelosched mail on' has them mailed"}};
  }
  return {{Severity::kOk, "notice", "of failed runs is told: " + told}};
}
