// The name and application that a caller expects: since the caller listed the tasks, the id may
// have been given to another one.
#pragma once

#include <optional>
#include <string>

#include "commands/options.h"
#include "store/task_list.h"

#define EXPECTED_TASK_OPTIONS    \
  {"if-name", Option::kValue}, { \
    "if-app", Option::kValue     \
  }
#define EXPECTED_TASK_HELP                                                                \
  "  --if-name NAME                 only when the task has that name now, as zelosched\n" \
  "                                 list --json tells it; and\n"                          \
  "  --if-app NAME                  only when it is of that application\n"

class ExpectedTask {
 public:
  ExpectedTask() = default;
  explicit ExpectedTask(const Arguments &arguments)
      : name_(arguments.value("if-name")), app_(arguments.value("if-app")) {}

  // Throws Failure when the task is another one. Before a change, call it under ChangeLock.
  void require(const TaskRecord &task) const;
  bool isAny() const { return name_ || app_; }

 private:
  std::optional<std::string> name_;
  std::optional<std::string> app_;
};
