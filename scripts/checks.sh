# Checks that are counted, and summed up at the end. Sourced after lib.sh, never run.

passed=0
failed=0
skipped=0

# result STATUS WHAT: counts one check; STATUS is 0 if it passed.
result() {
  if [ "$1" -eq 0 ]; then
    passed=$((passed + 1))
    echo "ok      $2"
  else
    failed=$((failed + 1))
    echo "NOT OK  $2"
  fi
}

# check WHAT COMMAND...: one check; its output is shown when it fails.
check() {
  local what=$1 output rc=0
  shift
  output=$("$@" 2>&1) || rc=$?
  result "$rc" "$what"
  [ "$rc" -eq 0 ] || printf '%s\n' "$output"
}

# omit WHAT REASON: one check that cannot run here.
omit() {
  skipped=$((skipped + 1))
  echo "SKIPPED $1: $2"
}

# conclude: the last line of a script; its status is the script's.
conclude() {
  echo "$passed passed, $failed failed$([ $skipped -eq 0 ] || echo ", $skipped skipped")"
  [ "$failed" -eq 0 ]
}
