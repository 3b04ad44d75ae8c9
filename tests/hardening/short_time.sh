#!/usr/bin/env bash
# Each source, compiled for a time_t of 32 bits, is refused with the reason.
# Usage: short_time.sh 'COMMAND OPTION...' SOURCE...
set -euo pipefail

read -ra compile <<<"$1"
shift
for source in "$@"; do
  "${compile[@]}" -D_TIME_BITS=64 -D_FILE_OFFSET_BITS=64 "$source"
  if said=$("${compile[@]}" -U_TIME_BITS -U_FILE_OFFSET_BITS "$source" 2>&1); then
    printf '%s compiles with a time_t of 32 bits\n' "$source" >&2
    exit 1
  fi
  grep -q 'compile with -D_TIME_BITS=64 -D_FILE_OFFSET_BITS=64' <<<"$said" ||
    { printf '%s\n' "$said" >&2 && exit 1; }
done
