#include "commands/apply_plan.h"

#include <algorithm>
#include <map>
#include <set>
#include <utility>

#include "json/task_diff.h"
#include "store/save.h"
#include "store/stagger.h"
#include "terminal/failure.h"

namespace {

// Application and name, compared byte by byte: names that differ in case or in Unicode
// normalization are different tasks.
using Key = std::pair<std::string, std::string>;

Key keyOf(const TaskRecord &task) {
  return {task.App, task.Name};
}

using Stored = std::map<Key, std::vector<const TaskRecord *>>;

Stored tasksByKey(const TaskList &list) {
  Stored stored;
  for (const TaskRecord *task : list.tasks()) {
    if (!isPower(*task)) stored[keyOf(*task)].push_back(task);
  }
  return stored;
}

// The fault of several tasks with the same application and name; empty for one task.
std::string rivalry(const std::vector<const TaskRecord *> &tasks) {
  if (tasks.size() < 2) return "";
  return titleOf(*tasks[0]) + " and " + titleOf(*tasks[1]) +
         " have the same application and name: rename or remove one of them";
}

void requireSeen(const TaskRecord &task, bool insists) {
  if (isListed(task) || insists) return;
  throw Failure(titleOf(task) + " is hidden by its application: --force changes it all the same");
}

void requirePermissions(const ApplyStep &step, bool insists) {
  if (step.change != Change::kChanged && step.change != Change::kRemoved) return;
  const TaskRecord &task = *step.before;
  requireSeen(task, insists);
  if (step.change == Change::kRemoved) {
    requirePermission(task, task.CanDeleteFromUI, "removed", insists);
    return;
  }
  requirePermission(task, task.CanEditFromUI, "edited", insists);
  if (step.after->Owner != task.Owner) {
    requirePermission(task, task.CanEditOwner, "given another owner", insists);
  }
}

// Whether the text says all of the repetition: the last hour of a staggered task has been moved.
bool saysRepetition(const TaskText &text) {
  const Json::Value &schedule = text.object["schedule"];
  return schedule.isMember("every_hours") &&
         (schedule["every_hours"].isNull() || schedule.isMember("until_hour"));
}

class Planner {
 public:
  Planner(const TaskList &stored, const ApplyRules &rules, JsonFaults *faults)
      : stored_(tasksByKey(stored)),
        rules_(rules),
        faults_(faults),
        defaults_(newTask(ZELO_SCHED_BACKEND_SCHEDULE)) {
    defaults_->ID = ZELO_SCHED_ID_NEW;
  }

  void take(TaskText text) {
    const size_t before = faults_->size();
    // Checked on the defaults, so that these faults do not depend on the stored task.
    Task fresh = std::make_unique<TaskRecord>(*defaults_);
    fillTask(text, fresh.get(), faults_);
    if (faults_->size() > before) return;
    const Key key = keyOf(*fresh);
    const auto [found, isFirst] = places_.emplace(key, text.place);
    if (!isFirst) {
      faults_->push_back({text.place, "has the application and name of " + found->second});
      return;
    }
    if (rules_.window) {
      stagger(*rules_.window, fresh.get());
      setTimes(*fresh, &text);
    }
    const auto known = stored_.find(key);
    if (known == stored_.end()) {
      add(text.place, {Change::kCreated, nullptr, std::move(fresh)});
    } else {
      takeKnown(text, known->second);
    }
  }

  // Adds the removal of the application's tasks that the file lacks.
  void prune(const std::string &app) {
    for (const auto &[key, tasks] : stored_) {
      if (key.first != app || places_.contains(key)) continue;
      const std::string place = "--app " + app;
      if (const std::string fault = rivalry(tasks); !fault.empty()) {
        faults_->push_back({place, fault});
      } else {
        add(place, {Change::kRemoved, tasks.front(), nullptr});
      }
    }
  }

  std::vector<ApplyStep> steps() {
    // Removals first, as they free ids and crontab lines.
    std::stable_partition(steps_.begin(), steps_.end(),
                          [](const ApplyStep &step) { return step.change == Change::kRemoved; });
    std::stable_partition(steps_.begin(), steps_.end(), [](const ApplyStep &step) {
      return step.before != nullptr && isUnreadable(*step.before);
    });
    return std::move(steps_);
  }

 private:
  void takeKnown(const TaskText &text, const std::vector<const TaskRecord *> &tasks) {
    if (const std::string fault = rivalry(tasks); !fault.empty()) {
      faults_->push_back({text.place, fault});
      return;
    }
    const TaskRecord &before = *tasks.front();
    if (rules_.window && before.RepeatHour != 0 && !saysRepetition(text)) {
      faults_->push_back({text.place + ".schedule",
                          "says nothing of the repetition that " + titleOf(before) +
                              " has: --stagger needs every_hours and until_hour, or null"});
      return;
    }
    const size_t faultsBefore = faults_->size();
    Task after = std::make_unique<TaskRecord>(before);
    after->next = nullptr;
    fillTask(text, after.get(), faults_);
    if (faults_->size() > faultsBefore) return;
    const bool isSame = areAlike(before, *after);
    add(text.place, {isSame ? Change::kUnchanged : Change::kChanged, &before,
                     isSame ? nullptr : std::move(after)});
  }

  void add(const std::string &place, ApplyStep step) {
    try {
      requirePermissions(step, rules_.insists);
      steps_.push_back(std::move(step));
    } catch (const Failure &failure) {
      faults_->push_back({place, failure.what()});
    }
  }

  Stored stored_;
  const ApplyRules &rules_;
  JsonFaults *faults_;
  Task defaults_;                      // made once: the library reads all tasks for it
  std::map<Key, std::string> places_;  // of the texts
  std::vector<ApplyStep> steps_;
};

bool isLeftUnreadable(const TaskRecord &task, const std::vector<ApplyStep> &steps) {
  return isUnreadable(task) && std::none_of(steps.begin(), steps.end(), [&](const ApplyStep &step) {
           return step.before == &task && step.change != Change::kUnchanged;
         });
}

}  // namespace

std::vector<ApplyStep> planOf(const std::vector<TaskText> &texts, const TaskList &stored,
                              const ApplyRules &rules, JsonFaults *faults) {
  Planner planner(stored, rules, faults);
  for (const TaskText &text : texts) planner.take(text);
  for (const std::string &app : std::set<std::string>(rules.pruned.begin(), rules.pruned.end())) {
    planner.prune(app);
  }
  return planner.steps();
}

void requireFit(const std::vector<ApplyStep> &steps, const TaskList &stored) {
  const bool isIdle = std::all_of(steps.begin(), steps.end(), [](const ApplyStep &step) {
    return step.change == Change::kUnchanged;
  });
  if (isIdle) return;
  for (const TaskRecord *task : stored.tasks()) {
    if (isLeftUnreadable(*task, steps)) requireReadableTasks();
  }
  int64_t lines = 0;
  int64_t most = 0;
  for (const ApplyStep &step : steps) {
    if (step.change == Change::kUnchanged) continue;
    if (step.before != nullptr && hasCronLine(*step.before)) --lines;
    if (step.after != nullptr && hasCronLine(*step.after)) ++lines;
    most = std::max(most, lines);
  }
  if (most > 0) requireCronRoom(static_cast<size_t>(most));
}
