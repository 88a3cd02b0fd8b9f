// The arguments of a sub-command, and the errors of wrong ones.
//
//   constexpr Option kOptions[] = {{"json"}, {"limit", Option::kValue}};
//   const Arguments arguments(argc, argv, kOptions);
//   if (arguments.has("json")) ...
//
// What is wrong is thrown as UsageError; a sub-command's --help is answered before it runs.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "commands/command.h"
#include "terminal/failure.h"

struct Option {
  enum Values { kNone = 0, kValue = 1, kTwoValues = 2 };
  const char *name;
  Values values = kNone;
  char letter = '\0';
};

class Arguments {
 public:
  Arguments(int argc, char **argv, std::span<const Option> options);

  bool has(std::string_view option) const;
  // The value last given, or both with a blank between them of an option that has two; nothing when
  // the option was not given.
  std::optional<std::string> value(std::string_view option) const;
  std::string value(std::string_view option, const char *otherwise) const;
  // Each one, of an option that can be given several times.
  std::vector<std::string> values(std::string_view option) const;
  // A whole number from `least` to `most`.
  std::optional<int64_t> number(std::string_view option, int64_t least, int64_t most) const;
  const std::vector<std::string> &operands() const { return operands_; }
  // What stands after "--", when that is there.
  const std::optional<std::vector<std::string>> &afterDashes() const { return afterDashes_; }

  void requireNoOperands() const;
  void requireNoCommand() const;

 private:
  std::vector<std::pair<std::string, std::string>> given_;
  std::vector<std::string> operands_;
  std::optional<std::vector<std::string>> afterDashes_;
};

// The ids of the tasks that the operands name, by an id or by a name that is one task's alone; one
// at least, no id twice. Digits alone are an id. Throws UsageError and Failure.
std::vector<int64_t> parseIds(const std::vector<std::string> &operands);

// Runs the sub-command: answers --help, and says what is wrong with the arguments.
int runWithOptions(const Command &command, int argc, char **argv);
