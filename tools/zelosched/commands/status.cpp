// zelosched status
#include <json/json.h>
#include <unistd.h>

#include <cstdio>
#include <ctime>

#include "check/health.h"
#include "check/run_findings.h"
#include "commands/command.h"
#include "commands/options.h"
#include "json/json_out.h"
#include "json/run_json.h"
#include "runs/missed.h"
#include "store/task_list.h"
#include "terminal/failure.h"
#include "terminal/terminal.h"
#include "terminal/text.h"

namespace {

constexpr Option kStatusOptions[] = {{"quiet", Option::kNone, 'q'}, {"json"}, {"acknowledge"}};

int exitStatusOf(Severity worst) {
  switch (worst) {
    case Severity::kOk:
      return kDone;
    case Severity::kUnknown:
      return kHealthUnknown;
    case Severity::kWarning:
      return kFailed;
    case Severity::kCritical:
      return kHealthCritical;
  }
  return kHealthCritical;
}

const char *colourOf(Severity severity) {
  switch (severity) {
    case Severity::kCritical:
      return "\033[1;31m";
    case Severity::kWarning:
      return "\033[31m";
    default:
      return "";
  }
}

void print(const Findings &findings, bool isQuiet) {
  const bool colour = showsColour();
  for (const Finding &finding : findings) {
    if (isQuiet && finding.severity == Severity::kOk) continue;
    const char *const start = colour ? colourOf(finding.severity) : "";
    std::printf("%s%-8s%s  %s\n", start, nameOf(finding.severity), *start != '\0' ? "\033[0m" : "",
                printable(sentenceOf(finding)).c_str());
  }
}

Json::Value jsonOf(const Finding &finding) {
  Json::Value object;
  object["severity"] = nameOf(finding.severity);
  object["kind"] = finding.kind;
  object["text"] = jsonText(finding.text);
  object["remedy"] = jsonTextOrNull(finding.remedy);
  object["task"] = finding.task != 0 ? Json::Value(Json::Int64(finding.task)) : Json::Value();
  object["task_name"] = jsonTextOrNull(finding.taskName);
  object["run"] = finding.run ? jsonOf(*finding.run) : Json::Value();
  object["due"] = finding.due ? jsonTime(*finding.due) : Json::Value();
  object["machine"] = jsonTextOrNull(finding.machine);
  return object;
}

void printAsJson(const Findings &findings) {
  Json::Value whole = topObject();
  whole["now"] = jsonTime(time(nullptr));
  whole["state"] = nameOf(worstOf(findings));
  whole["findings"] = Json::Value(Json::arrayValue);
  for (const Finding &finding : findings) whole["findings"].append(jsonOf(finding));
  printTop(whole);
}

// Of one task, or of all.
void acknowledgeWarnings(const Findings &findings, std::optional<int64_t> task, bool isQuiet) {
  acknowledge(KeptDatabase(KeptDatabase::kChange), task, Acknowledged::kAll);
  size_t count = 0;
  for (const Finding &finding : findings) {
    if (isQuiet || finding.severity != Severity::kWarning || !isAboutPastRun(finding)) continue;
    if (task && finding.task != *task) continue;
    std::printf("acknowledged: %s\n", printable(finding.text).c_str());
    ++count;
  }
  if (count == 0 && !isQuiet) std::puts("there is nothing to acknowledge");
}

int acknowledgeAll(const Arguments &arguments) {
  if (arguments.has("json")) throw UsageError("'--acknowledge' does not take '--json'");
  if (geteuid() != 0) throw Failure("acknowledging takes root's rights");
  // This also records tasks that the history does not know yet.
  const Findings findings = checkRuns(TaskList(TaskList::Unreadable::kIsLeftOut));
  const bool isQuiet = arguments.has("quiet");
  if (arguments.operands().empty()) {
    acknowledgeWarnings(findings, std::nullopt, isQuiet);
    return kDone;
  }
  for (const int64_t id : parseIds(arguments.operands())) {
    acknowledgeWarnings(findings, loadTask(id)->ID, isQuiet);
  }
  return kDone;
}

int runStatus(int argc, char **argv) {
  const Arguments arguments(argc, argv, kStatusOptions);
  arguments.requireNoCommand();
  if (arguments.has("acknowledge")) return acknowledgeAll(arguments);
  arguments.requireNoOperands();
  const Findings findings = examineHealth();
  if (arguments.has("json")) {
    printAsJson(findings);
  } else {
    print(findings, arguments.has("quiet"));
  }
  return exitStatusOf(worstOf(findings));
}

}  // namespace

const Command kStatusCommand = {
    "status", "[--quiet] [--json | --acknowledge [TASK...]]", "say whether all is well",
    "Prints a line for each check, the worst first: whether cron is running, whether the\n"
    "program that it starts is there and root's, whether the copies of the tasks agree,\n"
    "whether /tmp is root's and sticky and no other user is in the way of runs there, whether\n"
    "a process keeps changes waiting, whether each task can be read, whether the crontab is in\n"
    "step with them and short enough for cron, whether an enabled task has a fault, whether\n"
    "power times can take effect, whose last run failed or gave up, which tasks were due and\n"
    "did not run, which are running, and unusually long, whether somebody is told of failed\n"
    "runs, and whether /etc/zelosched.conf can be read.\n"
    "\n"
    "  -q, --quiet                    only what is not well\n"
    "  --json                         as JSON: see zelosched-json(5)\n"
    "  --acknowledge                  warn no more of the runs so far of these tasks, or of\n"
    "                                 all, and say of which\n"
    "\n"
    "Exit status: 0 all is well, 1 something is wrong, 3 this user may not see all of it,\n"
    "4 tasks do not run at all.\n",
    runStatus};
