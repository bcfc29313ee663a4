# Shared by the scripts: where things are, and how a script reports. Sourced, never run.

set -euo pipefail

root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
jobs=$(nproc 2>/dev/null || echo 2)

# One clock for a run: a script that another one starts goes on with its time.
export SSOCLIENT_STARTED=${SSOCLIENT_STARTED:-$(date +%s)}
elapsed() { echo $(($(date +%s) - SSOCLIENT_STARTED)); }

# say TEXT: one line of progress, with the seconds since the start.
say() { printf '[%4ds] %s\n' "$(elapsed)" "$*"; }

# die TEXT: one line on standard error, exit status 1.
die() {
  printf '%s: %s\n' "$(basename "$0")" "$*" >&2
  exit 1
}

# misused TEXT: the same for wrong arguments, exit status 2.
misused() {
  printf '%s: %s\n' "$(basename "$0")" "$*" >&2
  exit 2
}

# skip TEXT: this check cannot run here; scripts/test counts it as skipped.
skip() {
  printf 'skipped: %s\n' "$*"
  exit 77
}

# usage FILE: the comment that FILE begins with, or its doc string.
usage() {
  awk 'NR == 1 { next }
    /^"""/ { if (doc++) exit; sub(/^"""/, ""); print; next }
    doc { print; next }
    /^#/ { sub(/^# ?/, ""); print; next }
    { exit }' "$1"
}

need_root() { [ "$(id -u)" -eq 0 ] || die "needs root (namespaces, set-id programs, apt)"; }

# needs GROUP...: installs these groups of scripts/packages; a check that cannot have one is skipped.
needs() {
  local absent
  absent=$("$root/scripts/setup" --lacking "$@")
  [ -z "$absent" ] || skip "this system's package sources lack: $absent"
  "$root/scripts/setup" "$@"
}

# version_is TOOL PATTERN: whether TOOL --version has a line that matches; what a tool finds, and
# how it formats, depends on its version.
version_is() { [[ "$("$1" --version 2>/dev/null)" =~ $2 ]]; }

# alone: waits until no other script works in this checkout, and removes the build folders that
# were made elsewhere: CMake refuses them. A script that another one starts is covered by it.
alone() {
  [ "${SSOCLIENT_ALONE:-}" != "$root" ] || return 0
  mkdir -p "$root/build"
  exec 9<>"$root/build/lock"
  if ! flock --nonblock 9; then
    say "another run works in this checkout ($(head -n 1 "$root/build/lock")): waiting for it"
    flock 9
  fi
  printf 'process %d, %s\n' $$ "$(basename "$0")" >"$root/build/lock"
  export SSOCLIENT_ALONE=$root
  local cache folder
  find "$root/build" -maxdepth 4 -name CMakeCache.txt | while read -r cache; do
    folder=$(dirname "$cache")
    [ ! "$(sed -n 's/^CMAKE_CACHEFILE_DIR:INTERNAL=//p' "$cache")" -ef "$folder" ] || continue
    say "the checkout was moved: making ${folder#"$root"/} again"
    rm -rf "$folder"
  done
}

# quietly LABEL [--log FILE] COMMAND...: runs a long step with its output in a log file; shows
# that it goes on (a dot every five seconds), and the end of the log when it fails. The step is
# ended with the script.
quietly() {
  local label=$1 log= pid rc=0 ticks=0
  shift
  if [ "$1" = --log ]; then
    log=$2
    shift 2
  fi
  local file=${log:-$(mktemp)}
  printf '[%4ds] %s ' "$(elapsed)" "$label"
  set -m
  ("$@") >"$file" 2>&1 </dev/null &
  pid=$!
  set +m
  trap 'kill -- -'$pid'; exit 130' INT TERM HUP
  while kill -0 "$pid" 2>/dev/null; do
    sleep 0.2
    ticks=$((ticks + 1))
    [ $((ticks % 25)) -ne 0 ] || printf '.'
  done
  wait "$pid" || rc=$?
  trap - INT TERM HUP
  case $rc in
    0) printf ' done\n' ;;
    77) printf ' %s\n' "$(grep '^skipped: ' "$file" | tail -n 1)" ;;
    *)
      printf ' FAILED (status %d)\n' "$rc"
      tail -n 60 "$file"
      ;;
  esac
  [ -n "$log" ] || rm -f "$file"
  return "$rc"
}
