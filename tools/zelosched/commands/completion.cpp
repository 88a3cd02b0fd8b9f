// zelosched completion
#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

#include "commands/command.h"
#include "commands/options.h"
#include "store/task_list.h"
#include "terminal/text.h"

namespace {

// The options of a sub-command stand at the beginnings of the lines of its help.
std::string optionsOf(const Command &command) {
  std::string options = "--help";
  const std::string help = command.help;
  for (size_t at = 0; (at = help.find("--", at)) != std::string::npos;) {
    size_t end = at + 2;
    while (end < help.size() && (std::islower(help[end]) != 0 || help[end] == '-')) ++end;
    const size_t line = help.rfind('\n', at) + 1;
    const std::string before = help.substr(line, at - line);
    const bool beginsLine = before == "  " || (before.starts_with("  -") && before.ends_with(", "));
    if (beginsLine && end > at + 2) options.append(" ").append(help, at, end - at);
    at = end;
  }
  return options;
}

constexpr char kFunction[] = R"BASH(
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
    --sort) mapfile -t COMPREPLY < <(compgen -W "next id name state type owner app result" -- "$cur"); return ;;
    --overlap | --app-overlap) mapfile -t COMPREPLY < <(compgen -W "yes no" -- "$cur"); return ;;
    --weekly) mapfile -t COMPREPLY < <(compgen -W "mon tue wed thu fri sat sun weekdays weekend all" -- "$cur"); return ;;
  esac
  if [[ $cur == -* ]]; then
    mapfile -t COMPREPLY < <(compgen -W "${_zelosched_options[$command]}" -- "$cur")
    return
  fi
  case $command in
    show | edit | enable | disable | remove | run | next | history | export) _zelosched_ids "" ;;
    power)
      if ((cword == 2)); then
        mapfile -t COMPREPLY < <(compgen -W "list add remove" -- "$cur")
      elif [[ ${words[2]} == add ]]; then
        mapfile -t COMPREPLY < <(compgen -W "on off" -- "$cur")
      elif [[ ${words[2]} == remove ]]; then
        _zelosched_ids power
      fi
      ;;
    import) mapfile -t COMPREPLY < <(compgen -f -- "$cur") ;;
    completion) mapfile -t COMPREPLY < <(compgen -W bash -- "$cur") ;;
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

int printScript() {
  std::puts("# bash completion for zelosched; made by 'zelosched completion bash'");
  std::fputs("_zelosched_commands=\"", stdout);
  for (const Command *command : commands()) std::printf("%s ", command->name);
  std::puts("\"\ndeclare -gA _zelosched_options=(");
  for (const Command *command : commands()) {
    std::printf("  [%s]=\"%s\"\n", command->name, optionsOf(*command).c_str());
  }
  std::printf(")\n%s", kFunction);
  return kDone;
}

int printIds(bool powerOnly) {
  const TaskList list;
  for (const ZELO_SCHED_TASK *task : list.tasks()) {
    if (!powerOnly || isPower(*task)) {
      std::printf("%d\t%s\n", task->ID, printable(task->Name).c_str());
    }
  }
  return kDone;
}

int runCompletion(int argc, char **argv) {
  const Arguments arguments(argc, argv, {});
  arguments.requireNoCommand();
  const std::vector<std::string> &words = arguments.operands();
  if (words == std::vector<std::string>{"bash"}) return printScript();
  if (words == std::vector<std::string>{"ids"}) return printIds(false);
  if (words == std::vector<std::string>{"ids", "power"}) return printIds(true);
  throw UsageError("for which shell? There is bash");
}

}  // namespace

const Command kCompletionCommand = {
    "completion", "bash", "print the completion script for a shell",
    "Prints the script by which bash completes commands, options, and the ids of tasks,\n"
    "also by a part of their names. To try it: source <(zelosched completion bash)\n",
    runCompletion};
