#include "commands/options.h"

#include <getopt.h>

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <cstring>

#include "terminal/number.h"
#include "terminal/text.h"

namespace {

constexpr int kFirstLongOption = 256;  // above every letter
constexpr char kEndOfOptions[] = "--";

std::vector<option> longOptions(std::span<const Option> options) {
  std::vector<option> result;
  for (size_t i = 0; i < options.size(); ++i) {
    const int argument = options[i].values == Option::kNone ? no_argument : required_argument;
    result.push_back({options[i].name, argument, nullptr, kFirstLongOption + static_cast<int>(i)});
  }
  result.push_back({nullptr, 0, nullptr, 0});
  return result;
}

// The colon in front lets a missing value be told from an unknown option.
std::string letters(std::span<const Option> options) {
  std::string result = ":";
  for (const Option &option : options) {
    if (option.letter == '\0') continue;
    result += option.letter;
    if (option.values != Option::kNone) result += ':';
  }
  return result;
}

const Option &optionOf(int found, std::span<const Option> options) {
  if (found >= kFirstLongOption) return options[static_cast<size_t>(found - kFirstLongOption)];
  return *std::find_if(options.begin(), options.end(),
                       [&](const Option &option) { return option.letter == found; });
}

[[noreturn]] void refuse(int found, char **argv) {
  const std::string said = found == ':' ? "needs a value" : "is no option of this command";
  const bool isLetter = optopt > 0 && optopt < kFirstLongOption;
  const std::string name =
      isLetter ? std::string("-") + static_cast<char>(optopt) : std::string(argv[optind - 1]);
  throw UsageError("'" + printable(name) + "' " + said);
}

std::string usageOf(const Command &command) {
  const bool isNameAll = *command.synopsis == '\0';
  return std::string(command.name) + (isNameAll ? "" : " ") + command.synopsis;
}

bool hasBlank(const char *text) {
  return std::strchr(text, ' ') != nullptr;
}

// "--weekly mon 08:30" is two arguments; "--weekly 'mon 08:30'" and "--weekly=mon 08:30" are one.
std::string secondValue(const Option &option, int argc, char **argv) {
  if (hasBlank(optarg)) return optarg;
  if (optind >= argc) throw UsageError(std::string("'--") + option.name + "' needs two values");
  return std::string(optarg) + " " + argv[optind++];
}

}  // namespace

Arguments::Arguments(int argc, char **argv, std::span<const Option> options) {
  char **const end = argv + argc;
  char **const dashes =
      std::find_if(argv, end, [](const char *word) { return strcmp(word, kEndOfOptions) == 0; });
  if (dashes != end) afterDashes_.emplace(dashes + 1, end);
  const int count = static_cast<int>(dashes - argv);

  const std::vector<option> longs = longOptions(options);
  const std::string shorts = letters(options);
  optind = 0;  // starts over
  opterr = 0;
  for (int found;
       (found = getopt_long(count, argv, shorts.c_str(), longs.data(), nullptr)) != -1;) {
    if (found == '?' || found == ':') refuse(found, argv);
    const Option &option = optionOf(found, options);
    std::string value;
    if (option.values == Option::kValue) value = optarg;
    if (option.values == Option::kTwoValues) value = secondValue(option, count, argv);
    given_.emplace_back(option.name, std::move(value));
  }
  operands_.assign(argv + optind, argv + count);
}

bool Arguments::has(std::string_view option) const {
  return std::any_of(given_.begin(), given_.end(),
                     [&](const auto &given) { return given.first == option; });
}

std::optional<std::string> Arguments::value(std::string_view option) const {
  const auto found = std::find_if(given_.rbegin(), given_.rend(),
                                  [&](const auto &given) { return given.first == option; });
  if (found == given_.rend()) return std::nullopt;
  return found->second;
}

std::string Arguments::value(std::string_view option, const char *otherwise) const {
  return value(option).value_or(otherwise);
}

std::vector<std::string> Arguments::values(std::string_view option) const {
  std::vector<std::string> found;
  for (const auto &[name, value] : given_) {
    if (name == option) found.push_back(value);
  }
  return found;
}

std::optional<int64_t> Arguments::number(std::string_view option, int64_t least,
                                         int64_t most) const {
  const std::optional<std::string> text = value(option);
  if (!text) return std::nullopt;
  const std::optional<int64_t> number = parseNumber(*text);
  if (!number || *number < least || *number > most) {
    throw UsageError("'--" + std::string(option) + "' takes a number from " +
                     std::to_string(least) + " to " + std::to_string(most) + ", not '" +
                     printable(*text) + "'");
  }
  return number;
}

void Arguments::requireNoOperands() const {
  if (!operands_.empty()) {
    throw UsageError("'" + printable(operands_.front()) + "' is more than this command takes");
  }
}

void Arguments::requireNoCommand() const {
  if (afterDashes_) throw UsageError("this command takes nothing after '--'");
}

int runWithOptions(const Command &command, int argc, char **argv) {
  char **const end = std::find_if(
      argv + 1, argv + argc, [](const char *word) { return strcmp(word, kEndOfOptions) == 0; });
  const bool wantsHelp = std::any_of(argv + 1, end, [](const char *word) {
    return strcmp(word, "--help") == 0 || strcmp(word, "-h") == 0;
  });
  if (wantsHelp) {
    std::printf("usage: zelosched %s\n\n%s", usageOf(command).c_str(), command.help);
    return kDone;
  }
  try {
    return command.run(argc, argv);
  } catch (const UsageError &error) {
    std::fprintf(stderr, "zelosched %s: %s\nusage: zelosched %s\nTry 'zelosched %s --help'.\n",
                 command.name, error.what(), usageOf(command).c_str(), command.name);
    return kUsage;
  }
}
