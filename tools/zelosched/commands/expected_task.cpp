#include "commands/expected_task.h"

#include <json/json.h>

#include "json/json_out.h"
#include "terminal/failure.h"
#include "terminal/text.h"

namespace {

// A text that is not UTF-8 has replaced bytes in the JSON that a caller may have read.
bool isLike(const std::optional<std::string> &expected, const char *text) {
  return !expected || *expected == text || *expected == jsonText(text).asString();
}

}  // namespace

void ExpectedTask::require(const TaskRecord &task) const {
  if (isLike(name_, task.Name) && isLike(app_, task.App)) return;
  throw Failure(
      titleOf(task) + " is not the expected task" + (name_ ? " '" + printable(*name_) + "'" : "") +
      (app_ ? " of the application '" + printable(*app_) + "'" : "") + ": nothing was done");
}
