# Shared by the scripts of this folder: where things are, and how a script speaks.
# Sourced, never run.

set -euo pipefail

root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
jobs=$(nproc 2>/dev/null || echo 2)
started=$SECONDS

# say TEXT: one line of progress, with the seconds since the start.
say() { printf '[%4ds] %s\n' "$((SECONDS - started))" "$*"; }

# die TEXT: one line on standard error, exit status 1.
die() {
  printf '%s: %s\n' "$(basename "$0")" "$*" >&2
  exit 1
}

need_root() { [ "$(id -u)" -eq 0 ] || die "needs root (namespaces, set-id programs, apt)"; }

# quietly LABEL [--log FILE] COMMAND...: runs a long step with its output in a log file; shows
# that it goes on (a dot every five seconds), and the end of the log when it fails.
quietly() {
  local label=$1 log= pid rc=0 ticks=0
  shift
  if [ "$1" = --log ]; then
    log=$2
    shift 2
  fi
  local file=${log:-$(mktemp)}
  printf '[%4ds] %s ' "$((SECONDS - started))" "$label"
  ("$@") >"$file" 2>&1 &
  pid=$!
  while kill -0 "$pid" 2>/dev/null; do
    sleep 0.2
    ticks=$((ticks + 1))
    [ $((ticks % 25)) -ne 0 ] || printf '.'
  done
  wait "$pid" || rc=$?
  if [ "$rc" -eq 0 ]; then
    printf ' done\n'
  else
    printf ' FAILED (status %d)\n' "$rc"
    tail -n 60 "$file"
  fi
  [ -n "$log" ] || rm -f "$file"
  return "$rc"
}
