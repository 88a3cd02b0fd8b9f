// Tasks by their ids or their names.
#include <algorithm>
#include <optional>

#include "commands/options.h"
#include "store/task_list.h"
#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr char kDigits[] = "0123456789";

bool isNumber(const std::string &word) {
  return !word.empty() && word.find_first_not_of(kDigits) == std::string::npos;
}

int64_t idOfNumber(const std::string &word) {
  const std::optional<int64_t> id = parseNumber(word);
  if (!id) throw UsageError("'" + printable(word) + "' is no task id");
  return *id;
}

// Reads the list when the first name is looked up.
class Names {
 public:
  int64_t idOf(const std::string &name) {
    if (!list_) list_.emplace();
    std::vector<int64_t> ids;
    for (const TaskRecord *task : list_->tasks()) {
      if (name == task->Name) ids.push_back(task->ID);
    }
    if (ids.empty()) throw Failure("there is no task of the name '" + printable(name) + "'");
    if (ids.size() > 1) throw Failure(severalOf(name, ids));
    return ids.front();
  }

 private:
  static std::string severalOf(const std::string &name, const std::vector<int64_t> &ids) {
    std::string text = "'" + printable(name) + "' is the name of tasks ";
    for (size_t i = 0; i < ids.size(); ++i) {
      text += (i == 0 ? "" : i + 1 == ids.size() ? " and " : ", ") + std::to_string(ids[i]);
    }
    return text + ": give the id of one";
  }

  std::optional<TaskList> list_;
};

}  // namespace

std::vector<int64_t> parseIds(const std::vector<std::string> &operands) {
  if (operands.empty()) throw UsageError("which task? Give its id or its name");
  Names names;
  std::vector<int64_t> ids;
  for (const std::string &operand : operands) {
    const int64_t id = isNumber(operand) ? idOfNumber(operand) : names.idOf(operand);
    if (std::find(ids.begin(), ids.end(), id) == ids.end()) ids.push_back(id);
  }
  return ids;
}
