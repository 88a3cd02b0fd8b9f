# shellcheck shell=bash
# For test scripts: `check "what must hold" COMMAND...` prints one result line per test; end with
# `finish`. `skip "what" "why"` counts a test as skipped.

: "${BUILD_DIR:?the build directory}"
tests_failed=0

check() {
  local name=$1
  shift
  if "$@"; then
    echo "ok - $name"
  else
    echo "not ok - $name"
    tests_failed=1
  fi
}

skip() {
  echo "skip - $1 ($2)"
}

# daemon PACKAGE PROGRAM: that of the machine, or the one that scripts/deps has unpacked
daemon() {
  if [[ -x $2 ]]; then echo "$2"; else echo "$BUILD_DIR/$1$2"; fi
}

# Compares two texts and shows both when they differ.
same() {
  [[ $1 == "$2" ]] || { printf 'wanted: %s\ngot:    %s\n' "$2" "$1"; return 1; }
}

finish() {
  exit "$tests_failed"
}
