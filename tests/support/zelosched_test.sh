# shellcheck shell=bash
# For scripts that test zelosched: running it, also at another time, and what it says. Sourced after
# shell_test.sh, with SCRATCH set.

readonly ZELOSCHED=$BUILD_DIR/bin/zelosched
readonly FAKE=$BUILD_DIR/tests/fake_time.so

# What hangs shall fail.
z() {
  timeout 60 "$ZELOSCHED" "$@"
}

at() {
  local moment=$1
  shift
  FAKE_TIME=$(date -u -d "$moment" +%s) LD_PRELOAD=$FAKE z "$@"
}

# Runs it and keeps status, out and err.
# shellcheck disable=SC2034
try() {
  status=0
  "$@" >"$SCRATCH/out" 2>"$SCRATCH/err" </dev/null || status=$?
  out=$(cat "$SCRATCH/out")
  err=$(cat "$SCRATCH/err")
}

# A program that every user can run, wherever the checkout lies: below root's home, say, which is
# closed to others.
readonly FOR_OTHERS=/run/for_others/zelosched
copy_for_others() {
  local directory=${FOR_OTHERS%/*}
  mkdir -p "$directory"
  cp "$BUILD_DIR"/lib/*.so* "$directory"
  cp "$ZELOSCHED" "$directory/zelosched.program"
  cat >"$FOR_OTHERS" <<EOF
#!/bin/sh
LD_LIBRARY_PATH=$directory exec $directory/zelosched.program "\$@"
EOF
  chmod -R a+rX "$directory"
  chmod a+x "$FOR_OTHERS"
}
