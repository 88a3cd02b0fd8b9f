#include "commands/apply_tasks.h"

#include <json/json.h>

#include <algorithm>
#include <cstdio>
#include <optional>

#include "commands/remove_tasks.h"
#include "commands/stop_task.h"
#include "json/json_out.h"
#include "json/task_diff.h"
#include "store/change_lock.h"
#include "store/save.h"
#include "store/store_copy.h"
#include "store/synchronise.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

const char *nameOf(Change change) {
  switch (change) {
    case Change::kCreated:
      return "created";
    case Change::kChanged:
      return "changed";
    case Change::kRemoved:
      return "removed";
    default:
      return "unchanged";
  }
}

const TaskRecord &taskOf(const ApplyStep &step) {
  return step.after != nullptr ? *step.after : *step.before;
}

// The title of a task that has no id yet.
std::string titleOfNew(const TaskRecord &task) {
  return "a task (" + printable(task.Name) + ")";
}

// Prints a line for each step, or one JSON object at the end.
class Report {
 public:
  explicit Report(const ApplyRules &rules) : rules_(rules) {}

  // How many steps were reported.
  size_t count() const { return count_; }

  void add(const ApplyStep &step) {
    ++count_;
    std::vector<MemberDifference> differences;
    if (rules_.showsDifferences && step.change != Change::kUnchanged) {
      differences =
          differencesOf(step.before, step.change == Change::kRemoved ? nullptr : step.after.get());
    }
    if (rules_.isJson) {
      changes_.push_back(jsonOf(step, nameOf(step.change), differences));
    } else {
      print(step, differences);
    }
  }

  void addFailed(const ApplyStep &step) {
    ++count_;
    if (rules_.isJson) changes_.push_back(jsonOf(step, "failed", {}));
  }

  void addCrontab() {
    isCrontabWritten_ = true;
    if (rules_.isJson) return;
    std::printf("/etc/crontab was not in step with the tasks: it %s written again\n",
                rules_.isDryRun ? "would be" : "is");
  }

  void finish() const {
    if (!rules_.isJson && count_ == 0) std::puts("there is no task in it");
    if (!rules_.isJson) return;
    Json::Value top = topObject();
    top["dry_run"] = rules_.isDryRun;
    top["crontab_written"] = isCrontabWritten_;
    top["changes"] = jsonList(changes_);
    printTop(top);
  }

 private:
  void print(const ApplyStep &step, const std::vector<MemberDifference> &differences) const {
    const bool isNew = step.change == Change::kCreated && rules_.isDryRun;
    const std::string title = isNew ? titleOfNew(*step.after) : titleOf(taskOf(step));
    const bool isPlan = rules_.isDryRun && step.change != Change::kUnchanged;
    std::printf("%s %s%s\n", title.c_str(), isPlan ? "would be " : "", nameOf(step.change));
    for (const MemberDifference &difference : differences) {
      std::printf("  %s: %s -> %s\n", difference.member.c_str(),
                  onOneLine(difference.before).c_str(), onOneLine(difference.after).c_str());
    }
  }

  Json::Value jsonOf(const ApplyStep &step, const char *change,
                     const std::vector<MemberDifference> &differences) const {
    const TaskRecord &task = taskOf(step);
    const bool hasId = step.before != nullptr || task.ID > 0;
    Json::Value object(Json::objectValue);
    object["id"] = hasId ? Json::Value(task.ID) : Json::Value();
    object["name"] = jsonText(task.Name);
    object["app"] = jsonTextOrNull(task.App);
    object["change"] = change;
    if (!rules_.showsDifferences) return object;
    Json::Value &list = object["differences"] = Json::Value(Json::arrayValue);
    for (const MemberDifference &difference : differences) {
      Json::Value member(Json::objectValue);
      member["member"] = difference.member;
      member["before"] = difference.before;
      member["after"] = difference.after;
      list.append(member);
    }
    return object;
  }

  const ApplyRules &rules_;
  size_t count_ = 0;
  std::vector<Json::Value> changes_;
  bool isCrontabWritten_ = false;
};

// With --json, standard output has the JSON object and nothing else.
FILE *streamForRuns(const ApplyRules &rules) {
  return rules.isJson ? stderr : stdout;
}

void create(TaskRecord *task) {
  try {
    storeNew(task);
  } catch (const Failure &failure) {
    throw Failure(titleOfNew(*task) + ": " + failure.what());
  }
}

void take(const ApplyStep &step, const ApplyRules &rules, Report *report) {
  switch (step.change) {
    case Change::kCreated:
      create(step.after.get());
      break;
    case Change::kChanged:
      storeChanged(step.after.get());
      break;
    case Change::kRemoved:
      removeAndCancel(
          *step.before, storeRemoved, [&](const TaskRecord &) { report->add(step); },
          streamForRuns(rules));
      return;
    default:
      break;
  }
  report->add(step);
}

// Reports the runs under way of a task that was disabled or removed.
void tellOfEndedTask(const ApplyStep &step, const ApplyRules &rules) {
  const bool isDisabled =
      step.change == Change::kChanged && isEnabled(*step.before) && !isEnabled(*step.after);
  if (isDisabled || step.change == Change::kRemoved) {
    tellOfRunsOf(*step.before, streamForRuns(rules));
  }
}

// Returns the exit status. A step that fails does not stop the others.
int takeAll(const std::vector<ApplyStep> &steps, const ApplyRules &rules, Report *report) {
  int status = kDone;
  for (const ApplyStep &step : steps) {
    const size_t before = report->count();
    const int taken = attempt([&] {
      take(step, rules, report);
      tellOfEndedTask(step, rules);
    });
    if (report->count() == before) report->addFailed(step);
    status = std::max(status, taken);
  }
  return status;
}

bool hasChanges(const std::vector<ApplyStep> &steps) {
  return std::any_of(steps.begin(), steps.end(),
                     [](const ApplyStep &step) { return step.change != Change::kUnchanged; });
}

// An earlier command that was killed may have stored tasks without their crontab lines.
int mendCrontab(Report *report) {
  return attempt([&] {
    if (crontabFault(TaskList()).empty()) return;
    synchronise();
    report->addCrontab();
  });
}

int tellOnly(const std::vector<ApplyStep> &steps, const TaskList &stored, Report *report) {
  for (const ApplyStep &step : steps) report->add(step);
  const bool isInStep = crontabFault(stored).empty();
  const bool mendsCrontab = !hasChanges(steps) && !isInStep;
  if (mendsCrontab) report->addCrontab();
  return hasChanges(steps) || mendsCrontab ? kToDo : kDone;
}

}  // namespace

int applyTasks(const std::string &text, const ApplyRules &rules) {
  JsonFaults faults;
  const std::vector<TaskText> texts = taskTextsOf(text, &faults);
  // Held from the first read to the last change, so that concurrent commands are serialized.
  std::optional<ChangeLock> lock;
  if (!rules.isDryRun) lock.emplace();
  requireTasksAreBack();
  const TaskList stored;
  const std::vector<ApplyStep> steps = planOf(texts, stored, rules, &faults);
  if (!faults.empty()) {
    complainOf(faults);
    throw Failure(rules.undone + ", because of " + counted(faults.size(), "fault"));
  }
  requireFit(steps, stored);
  Report report(rules);
  int status = kDone;
  if (rules.isDryRun) {
    status = tellOnly(steps, stored, &report);
  } else {
    status = takeAll(steps, rules, &report);
    status = std::max(status, mendCrontab(&report));
  }
  report.finish();
  return status;
}
