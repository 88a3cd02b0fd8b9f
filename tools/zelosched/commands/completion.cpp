// zelosched completion
#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "commands/command.h"
#include "commands/options.h"
#include "store/task_list.h"
#include "terminal/text.h"

namespace {

// ---- what there is to complete --------------------------------------------------------------

// The values that are suggested for an option.
struct Words {
  const char *option;
  const char *words;
};
constexpr Words kWords[] = {
    {"sort", "next id name state type owner app result"},
    {"overlap", "yes no"},
    {"app-overlap", "yes no"},
    {"weekly", "mon tue wed thu fri sat sun weekdays weekend all"},
    {"time-limit", "30m 2h 1d none"},
    {"every", "1h 2h off"},
    {"stagger", "15m 30m 1h 2h"},
};
constexpr char kOwner[] = "owner";  // whose value is a user
constexpr char kShells[] = "bash zsh fish";
constexpr char kPowerActions[] = "list add remove";

const char *wordsOf(const std::string &option) {
  for (const Words &known : kWords) {
    if (option == known.option) return known.words;
  }
  return "";
}

struct HelpOption {
  std::string name;
  char letter = '\0';
  bool hasValue = false;
  std::string summary;
};

size_t endOfWord(const std::string &text, size_t at) {
  while (at < text.size() &&
         (std::islower(static_cast<unsigned char>(text[at])) != 0 || text[at] == '-'))
    ++at;
  return at;
}

// "  -n, --count N                  how many runs; 20"; nothing of any other line.
bool readOption(const std::string &line, HelpOption *option) {
  const size_t dashes = line.find("--");
  if (dashes == std::string::npos) return false;
  const std::string before = line.substr(0, dashes);
  const bool hasLetter = before.size() == strlen("  -n, ") && before.starts_with("  -");
  if (before != "  " && !hasLetter) return false;
  const size_t begin = dashes + strlen("--");
  const size_t end = endOfWord(line, begin);
  if (end == begin) return false;
  *option = {line.substr(begin, end - begin), hasLetter ? before[strlen("  -")] : '\0', false, ""};
  const size_t gap = line.find("  ", end);
  option->hasValue = end < line.size() && gap != end;
  const size_t summary = gap == std::string::npos ? gap : line.find_first_not_of(' ', gap);
  if (summary != std::string::npos) option->summary = line.substr(summary);
  return true;
}

// Read from its help text, where each begins a line.
std::vector<HelpOption> optionsOf(const Command &command) {
  std::vector<HelpOption> options = {{"help", 'h', false, "say how it is used"}};
  const std::string help = command.help;
  HelpOption option;
  for (size_t at = 0; at < help.size();) {
    const size_t end = std::min(help.find('\n', at), help.size());
    if (readOption(help.substr(at, end - at), &option)) options.push_back(option);
    at = end + 1;
  }
  return options;
}

// In a synopsis such as "TASK... [--json]", operands are in capitals.
bool takes(const Command &command, const char *operand) {
  return std::strstr(command.synopsis, operand) != nullptr;
}
bool takesTasks(const Command &command) {
  return takes(command, "TASK") || takes(command, "ID");
}
bool isNamed(const Command &command, const char *name) {
  return std::strcmp(command.name, name) == 0;
}

// ---- bash -----------------------------------------------------------------------------------

constexpr char kBashFunctions[] = R"BASH(
_zelosched() {
  local cur prev words cword
  _init_completion -s 2>/dev/null || {
    cur=${COMP_WORDS[COMP_CWORD]}
    prev=${COMP_WORDS[COMP_CWORD-1]}
    words=("${COMP_WORDS[@]}")
    cword=$COMP_CWORD
  }
  local command=${words[1]} i
  for ((i = 2; i < cword; i++)); do
    if [[ ${words[i]} == -- ]]; then
      if type -t _command_offset >/dev/null; then _command_offset $((i + 1)); fi
      return
    fi
  done
  if ((cword == 1)); then
    mapfile -t COMPREPLY < <(compgen -W "$_zelosched_commands --help --version" -- "$cur")
    return
  fi
  case $prev in
    -o | --owner) mapfile -t COMPREPLY < <(compgen -u -- "$cur"); return ;;
    --*)
      if [[ -n ${_zelosched_values[$prev]} ]]; then
        mapfile -t COMPREPLY < <(compgen -W "${_zelosched_values[$prev]}" -- "$cur")
        return
      fi
      ;;
  esac
  if [[ $cur == -* ]]; then
    mapfile -t COMPREPLY < <(compgen -W "${_zelosched_options[$command]}" -- "$cur")
    return
  fi
  case ${_zelosched_operands[$command]} in
    tasks) _zelosched_ids "" ;;
    files) mapfile -t COMPREPLY < <(compgen -f -- "$cur") ;;
    power)
      if ((cword == 2)); then
        mapfile -t COMPREPLY < <(compgen -W "list add remove" -- "$cur")
      elif [[ ${words[2]} == add ]]; then
        mapfile -t COMPREPLY < <(compgen -W "on off" -- "$cur")
      elif [[ ${words[2]} == remove ]]; then
        _zelosched_ids power
      fi
      ;;
    shells) mapfile -t COMPREPLY < <(compgen -W "bash zsh fish" -- "$cur") ;;
  esac
}

# Ids, with the names beside them for as long as there is a choice. A part of a name finds its id.
_zelosched_ids() {
  local id name
  COMPREPLY=()
  while IFS=$'\t' read -r id name; do
    if [[ $id == "$cur"* || (-n $cur && ${name,,} == *"${cur,,}"*) ]]; then
      COMPREPLY+=("$id  ($name)")
    fi
  done < <("${words[0]}" completion ids $1 2>/dev/null)
  if ((${#COMPREPLY[@]} == 1)); then COMPREPLY=("${COMPREPLY[0]%%  (*}"); fi
}

complete -o default -F _zelosched zelosched
)BASH";

const char *operandsOf(const Command &command) {
  if (isNamed(command, "power")) return "power";
  if (isNamed(command, "completion")) return "shells";
  return takesTasks(command) ? "tasks" : takes(command, "FILE") ? "files" : "";
}

void printBash() {
  std::puts("# bash completion for zelosched; made by 'zelosched completion bash'");
  std::fputs("_zelosched_commands=\"", stdout);
  for (const Command *command : commands()) std::printf("%s ", command->name);
  std::puts("\"\ndeclare -gA _zelosched_options=(");
  for (const Command *command : commands()) {
    std::printf("  [%s]=\"", command->name);
    for (const HelpOption &option : optionsOf(*command)) std::printf("--%s ", option.name.c_str());
    std::puts("\"");
  }
  std::puts(")\ndeclare -gA _zelosched_values=(");
  for (const Words &known : kWords) std::printf("  [--%s]=\"%s\"\n", known.option, known.words);
  std::puts(")\ndeclare -gA _zelosched_operands=(");
  for (const Command *command : commands()) {
    std::printf("  [%s]=\"%s\"\n", command->name, operandsOf(*command));
  }
  std::printf(")\n%s", kBashFunctions);
}

// ---- zsh ------------------------------------------------------------------------------------

constexpr char kZshTasks[] = R"ZSH(
# Ids with the names beside them, and names.
_zelosched_tasks() {
  local line id name tab=$'\t'
  local -a ids names
  for line in ${(f)"$(zelosched completion ids $1 2>/dev/null)"}; do
    id=${line%%$tab*}
    name=${${line#*$tab}//:/\\:}
    ids+=("${id}:${name}")
    names+=("${name}:task ${id}")
  done
  _describe -t tasks task ids -- names
}

_zelosched() {
  local dashes=${words[(i)--]}
  if ((dashes < CURRENT)); then
    words=("${(@)words[dashes+1,-1]}")
    ((CURRENT -= dashes))
    _normal
    return
  fi
  if ((CURRENT == 2)); then
    _describe -t commands command _zelosched_commands
    compadd -- --help --version
    return
  fi
  local command=$words[2] curcontext=$curcontext
  words=("${(@)words[2,-1]}")
  ((CURRENT--))
  case $command in
)ZSH";
constexpr char kZshEnd[] = R"ZSH(  esac
}

if [[ $funcstack[1] == _zelosched ]]; then
  _zelosched "$@"
else
  compdef _zelosched zelosched
fi
)ZSH";

// For single quotes, with a backslash before characters special to _arguments and _describe.
std::string zshText(const std::string &text) {
  std::string out;
  for (const char c : text) {
    if (c == '\'') {
      out += "'\\''";
    } else {
      if (c == '[' || c == ']' || c == ':' || c == '\\') out += '\\';
      out += c;
    }
  }
  return out;
}

std::string zshValue(const HelpOption &option) {
  if (!option.hasValue) return "";
  if (option.name == kOwner) return ":user:_users";
  const std::string words = wordsOf(option.name);
  return words.empty() ? ":value: " : ":value:(" + words + ")";
}

void printZshOperands(const Command &command) {
  if (isNamed(command, "power")) {
    std::printf(" \\\n        '1:action:(%s)'", kPowerActions);
    std::printf(
        " \\\n        '*:power time:{ if [[ $words[2] == add ]]; then _values direction on"
        " off; elif [[ $words[2] == remove ]]; then _zelosched_tasks power; fi }'");
  } else if (isNamed(command, "completion")) {
    std::printf(" \\\n        '1:shell:(%s)'", kShells);
  } else if (takesTasks(command)) {
    std::printf(" \\\n        '*:task: _zelosched_tasks'");
  } else if (takes(command, "FILE")) {
    std::printf(" \\\n        '*:file:_files'");
  }
}

void printZsh() {
  std::puts(
      "#compdef zelosched\n# made by 'zelosched completion zsh'\ntypeset -ga"
      " _zelosched_commands=(");
  for (const Command *command : commands()) {
    std::printf("  '%s:%s'\n", command->name, zshText(command->summary).c_str());
  }
  std::printf(")\n%s", kZshTasks);
  for (const Command *command : commands()) {
    std::printf("    %s)\n      _arguments", command->name);
    for (const HelpOption &option : optionsOf(*command)) {
      const std::string rest = "[" + zshText(option.summary) + "]" + zshValue(option);
      std::printf(" \\\n        '--%s%s'", option.name.c_str(), rest.c_str());
      if (option.letter != '\0') std::printf(" \\\n        '-%c%s'", option.letter, rest.c_str());
    }
    printZshOperands(*command);
    std::puts("\n      ;;");
  }
  std::fputs(kZshEnd, stdout);
}

// ---- fish -----------------------------------------------------------------------------------

constexpr char kFishFunctions[] =
    R"FISH(# fish completion for zelosched; made by 'zelosched completion fish'

# The command is one of these, and no command of a task is being written.
function __zelosched_command
    set -l words (commandline -opc)
    test (count $words) -gt 1; and contains -- $words[2] $argv; and not contains -- -- $words
end

function __zelosched_no_command
    test (count (commandline -opc)) -eq 1
end

function __zelosched_power
    set -l words (commandline -opc)
    test (count $words) -gt 2; and test $words[2] = power; and test $words[3] = $argv[1]
end

function __zelosched_words
    test (count (commandline -opc)) -eq 2
end

function __zelosched_tasks
    zelosched completion ids $argv 2>/dev/null
    zelosched completion names $argv 2>/dev/null
end

complete -c zelosched -f
complete -c zelosched -n __zelosched_no_command -l help -d 'say how it is used'
complete -c zelosched -n __zelosched_no_command -l version -d 'tell the version'
complete -c zelosched -n '__zelosched_power add' -a 'on off'
complete -c zelosched -n '__zelosched_power remove' -a '(__zelosched_tasks power)'
)FISH";

// For single quotes.
std::string fishText(const std::string &text) {
  std::string out;
  for (const char c : text) {
    if (c == '\'' || c == '\\') out += '\\';
    out += c;
  }
  return out;
}

std::string fishValue(const HelpOption &option) {
  if (!option.hasValue) return "";
  if (option.name == kOwner) return " -x -a '(__fish_complete_users)'";
  const std::string words = wordsOf(option.name);
  return words.empty() ? " -x" : " -x -a '" + words + "'";
}

void printFishOperands(const Command &command) {
  const std::string condition =
      std::string("complete -c zelosched -n '__zelosched_command ") + command.name;
  if (isNamed(command, "power")) {
    std::printf("%s; and __zelosched_words' -a '%s'\n", condition.c_str(), kPowerActions);
  } else if (isNamed(command, "completion")) {
    std::printf("%s; and __zelosched_words' -a '%s'\n", condition.c_str(), kShells);
  } else if (takesTasks(command)) {
    std::printf("%s' -a '(__zelosched_tasks)'\n", condition.c_str());
  } else if (takes(command, "FILE")) {
    std::printf("%s' -F\n", condition.c_str());
  }
}

void printFish() {
  std::fputs(kFishFunctions, stdout);
  for (const Command *command : commands()) {
    std::printf("complete -c zelosched -n __zelosched_no_command -a %s -d '%s'\n", command->name,
                fishText(command->summary).c_str());
    for (const HelpOption &option : optionsOf(*command)) {
      std::printf("complete -c zelosched -n '__zelosched_command %s' -l %s", command->name,
                  option.name.c_str());
      if (option.letter != '\0') std::printf(" -s %c", option.letter);
      std::printf("%s -d '%s'\n", fishValue(option).c_str(), fishText(option.summary).c_str());
    }
    printFishOperands(*command);
  }
}

// ---- the command ----------------------------------------------------------------------------

void printIds(const TaskRecord &task) {
  std::printf("%d\t%s\n", task.ID, printable(task.Name).c_str());
}

void printNames(const TaskRecord &task) {
  std::printf("%s\ttask %d\n", printable(task.Name).c_str(), task.ID);
}

int printTasks(void (*print)(const TaskRecord &task), const std::vector<std::string> &words) {
  const TaskList list;
  for (const TaskRecord *task : list.tasks()) {
    if (words.size() == 1 || isPower(*task)) print(*task);
  }
  return kDone;
}

int runCompletion(int argc, char **argv) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoCommand();
  const std::vector<std::string> &words = arguments.operands();
  constexpr struct {
    const char *name;
    void (*print)();
  } kScripts[] = {{"bash", printBash}, {"zsh", printZsh}, {"fish", printFish}};
  for (const auto &[name, print] : kScripts) {
    if (words != std::vector<std::string>{name}) continue;
    print();
    return kDone;
  }
  // Called by the scripts.
  const bool isList = words.size() == 1 || (words.size() == 2 && words[1] == "power");
  if (isList && words[0] == "ids") return printTasks(printIds, words);
  if (isList && words[0] == "names") return printTasks(printNames, words);
  throw UsageError("for which shell? There are bash, zsh and fish");
}

}  // namespace

const Command kCompletionCommand = {
    "completion", "bash|zsh|fish", "print the completion script for a shell",
    "Prints the script by which the shell completes commands, options and tasks: by their\n"
    "ids, and by their names; in bash a part of a name finds the id. To try it:\n"
    "\n"
    "  source <(zelosched completion bash)      source <(zelosched completion zsh)\n"
    "  zelosched completion fish | source\n",
    runCompletion};
