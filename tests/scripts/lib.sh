# shellcheck shell=bash
# What the tests of the scripts share. Sourced, never run.

# shellcheck disable=SC2034  # for the tests that source this file
project=$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd -P)
failures=0
output=$(mktemp)
trap 'rm -f "$output"; [[ $failures -eq 0 ]]' EXIT

# claim TEXT COMMAND...: what the command says is shown where it fails.
claim() {
  if "${@:2}" >"$output" 2>&1; then
    printf 'ok: %s\n' "$1"
  else
    printf 'NOT SO: %s\n' "$1"
    sed 's/^/    /' "$output"
    failures=$((failures + 1))
  fi
}

# says TEXT COMMAND...: the command succeeds, and TEXT is in what it says.
says() {
  "${@:2}" >"$output.said" 2>&1 || { cat "$output.said" && return 1; }
  contains "$1"
}

# refuses TEXT COMMAND...: it fails, and TEXT is in what it says.
refuses() {
  if "${@:2}" >"$output.said" 2>&1; then
    cat "$output.said"
    echo "it succeeded"
    return 1
  fi
  contains "$1"
}

contains() {
  local status=0
  grep -qF -e "$1" "$output.said" || { cat "$output.said" && status=1; }
  rm "$output.said"
  return "$status"
}
