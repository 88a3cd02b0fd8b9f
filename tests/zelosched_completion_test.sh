#!/bin/bash
# Completion as the shells do it: each completes commands, options, their values and tasks.
#
# Functions are called by check, and what stands in single quotes is for another shell:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/have_terminals.sh
. "$here/support/have_terminals.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

export PATH=$BUILD_DIR/bin:$PATH HOME=$SCRATCH LC_ALL=C.UTF-8

two_tasks() {
  clean
  add --daily 08:30 --name 'Nightly backup' -- true
  add --daily 08:30 --name 'Mirror: all' -- true
  z power add off --daily 23:00 >/dev/null
}

# ---- bash -----------------------------------------------------------------------------------

# What bash offers for the words of a line, of which the last is being written.
in_bash() {
  bash --norc -c '
    source <(zelosched completion bash)
    COMP_WORDS=("$@")
    COMP_CWORD=$(($# - 1))
    _zelosched
    printf "%s," "${COMPREPLY[@]}"' - zelosched "$@"
}

# What stands in the line after a tab, in a bash at a terminal.
typed_in_bash() {
  bash --norc -ic 'bind "set bell-style none" 2>/dev/null; source <(zelosched completion bash); complete -p zelosched' 2>/dev/null
}

bash_completes() {
  two_tasks
  same "$(in_bash exp)|$(in_bash list --fa)|$(in_bash list --sort o)|$(in_bash edit 1 --time-limit 3)" \
    "export,|--failed,|owner,|30m," &&
    same "$(in_bash show '')" "1  (Nightly backup),2  (Mirror: all),91272300  (PowerOff task 0)," &&
    same "$(in_bash show back)|$(in_bash enable 2)|$(in_bash power remove '')|$(in_bash completion f)" \
      "1,|2,|91272300,|fish," &&
    [[ $(typed_in_bash) == *"_zelosched zelosched"* ]]
}

# ---- zsh ------------------------------------------------------------------------------------

# The line after a tab was typed at its end, and what zsh lists below when there is a choice.
in_zsh() {
  python3 - "$1" "$SCRATCH" <<'PTY'
import os, pty, re, sys, time
line, directory = sys.argv[1:]
pid, terminal = pty.fork()
if pid == 0:
    os.execvp("zsh", ["zsh", "-f", "-i"])


def until(mark):
    seen = b""
    while mark not in seen:
        seen += os.read(terminal, 65536)
    return seen


def send(text):
    os.write(terminal, text.encode())


send("stty -echo; unsetopt zle; PS1=; PS2=; echo rea''dy\n")
until(b"ready")
send(f"fpath=({directory} $fpath); autoload -Uz compinit; compinit -u -D; setopt zle; bindkey -e\n")
# Completes the whole line without asking, and tells what it has become.
send("zstyle ':completion:*' list-prompt ''; LISTMAX=9999; tell() { zle -I; print -r -- \"<<$BUFFER>>\"; BUFFER=; }\n")
send("zle -N tell; bindkey '^X' tell; bindkey '^I' complete-word; setopt auto_list no_beep; PS1=; echo rea''dy\n")
until(b"ready")
send(line + "\t\x18")
seen = until(b">>").decode()
print(re.sub(r"\x1b\[[0-9;?]*[a-zA-Z]", "", seen).replace("\r", ""))
send("exit\n")
PTY
}

# The line that a tab makes of it.
line_in_zsh() {
  in_zsh "$1" | sed -n 's/.*<<\(.*\)>>.*/\1/p'
}

zsh_completes() {
  two_tasks
  zelosched completion zsh >"$SCRATCH/_zelosched"
  same "$(line_in_zsh 'zelosched exp')" 'zelosched export ' &&
    same "$(line_in_zsh 'zelosched list --fa')" 'zelosched list --failed ' &&
    same "$(line_in_zsh 'zelosched list --sort o')" 'zelosched list --sort owner ' &&
    same "$(line_in_zsh 'zelosched show Nig')" 'zelosched show Nightly\ backup ' &&
    same "$(line_in_zsh 'zelosched show Mir')" 'zelosched show Mirror:\ all ' &&
    same "$(line_in_zsh 'zelosched power rem')" 'zelosched power remove ' &&
    same "$(line_in_zsh 'zelosched power remove 9')" 'zelosched power remove 91272300 ' &&
    same "$(line_in_zsh 'zelosched completion fi')" 'zelosched completion fish ' &&
    [[ $(in_zsh 'zelosched show ') == *"Nightly backup"*"Mirror: all"* ]]
}

# ---- fish -----------------------------------------------------------------------------------

# What fish offers for a line, with what it says of each.
in_fish() {
  fish --no-config -c 'zelosched completion fish | source; complete -C $argv[1]' -- "$1" | tr '\t\n' '=,'
}

fish_completes() {
  two_tasks
  same "$(in_fish 'zelosched exp')" "export=write tasks as JSON," &&
    same "$(in_fish 'zelosched list --fa')" "--failed=only those whose last run ended badly," &&
    same "$(in_fish 'zelosched list --sort ow')" "owner=next, id, name, state, type, owner, app or result," &&
    [[ $(in_fish 'zelosched show ') == *"1=Nightly backup,2=Mirror: all,91272300=PowerOff task 0,"* ]] &&
    same "$(in_fish 'zelosched show Nig')" "Nightly backup=task 1," &&
    same "$(in_fish 'zelosched power rem')|$(in_fish 'zelosched power remove 9')|$(in_fish 'zelosched power add of')" \
      "remove,|91272300=PowerOff task 0,|off," &&
    same "$(in_fish 'zelosched completion ba')" "bash,"
}

# ---- all ------------------------------------------------------------------------------------

# Of every command, every option that its help has.
every_option_is_known() {
  local name options option shell bad=0
  for shell in bash zsh fish; do zelosched completion "$shell" >"$SCRATCH/$shell"; done
  for name in $(zelosched --help | sed -n 's/^  \([a-z-]*\) .*/\1/p'); do
    options=$(zelosched "$name" --help | grep -oE '^  (-[a-z], )?--[a-z-]+' | grep -oE -- '--[a-z-]+' || true)
    for option in $options; do
      grep -qE "^  \[$name\]=\".*$option " "$SCRATCH/bash" || { echo "bash: $name $option"; bad=1; }
      sed -n "/^    $name)/,/;;/p" "$SCRATCH/zsh" | grep -q "'$option\[" || { echo "zsh: $name $option"; bad=1; }
      grep -q "'__zelosched_command $name' -l ${option#--} " "$SCRATCH/fish" || { echo "fish: $name $option"; bad=1; }
    done
  done
  return "$bad"
}

the_scripts_are_well_formed() {
  bash -n "$SCRATCH/bash" && { ! command -v zsh >/dev/null || zsh -n "$SCRATCH/zsh"; } &&
    { ! command -v fish >/dev/null || fish --no-execute "$SCRATCH/fish"; }
}

start_zelosched_tests
check "bash completes" bash_completes
for shell in zsh fish; do
  if command -v "$shell" >/dev/null; then
    check "$shell completes" "${shell}_completes"
  else
    skip "$shell completes" "$shell is not installed"
  fi
done
check "every option of every command is completed in each shell" every_option_is_known
check "the scripts are well formed" the_scripts_are_well_formed
finish
