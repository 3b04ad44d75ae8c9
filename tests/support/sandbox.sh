#!/usr/bin/env bash
# Runs a command in a private mount namespace, so that the library works on its
# real paths and the host is never touched:
#   - fresh tmpfs over /tmp and over the folder of the database file;
#   - everything else, the project included, stays where it is.
# Usage: sandbox.sh COMMAND [ARGUMENT...]
#   KELDOAUTH_STATE    a folder to use as the state folder instead of a tmpfs
#   KELDOAUTH_LIB_DIR  where the built libraries are (for LD_LIBRARY_PATH)
set -euo pipefail

state_dir=/var/packages/Corvane/target/etc
project=$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd -P)

if [[ ${KELDOAUTH_IN_SANDBOX:-} != entered ]]; then
  namespaces=(--mount --propagation private)
  [[ $EUID -eq 0 ]] || namespaces+=(--user --map-root-user)
  KELDOAUTH_IN_SANDBOX=entered exec unshare "${namespaces[@]}" "${BASH_SOURCE[0]}" "$@"
fi
unset KELDOAUTH_IN_SANDBOX

# -n: the host's table of mounts is not ours to write, or even closed to us.
tmpfs() { mount -n -t tmpfs -o "mode=$1" tmpfs "$2"; }
# What a mount hides is still to be had through a descriptor opened before.
put_back() { mount -n --no-canonicalize "$1" "/proc/self/fd/$2" "$3"; }

exec {project_fd}<"$project" {var_fd}</var
if [[ -n ${KELDOAUTH_STATE:-} ]]; then
  exec {state_fd}<"$KELDOAUTH_STATE"
fi

tmpfs 1777 /tmp

# The host may have no /var/packages to mount over, and must not get one.
tmpfs 755 /var
for entry in "/proc/self/fd/$var_fd"/*; do
  name=${entry##*/}
  if [[ -L $entry ]]; then
    cp -P "$entry" "/var/$name"
  elif [[ -d $entry && $name != packages ]]; then
    mkdir "/var/$name"
    mount -n --no-canonicalize --rbind "$entry" "/var/$name"
  fi
done
(umask 022 && mkdir -p "$state_dir")
if [[ -n ${KELDOAUTH_STATE:-} ]]; then
  put_back --bind "$state_fd" "$state_dir"
  exec {state_fd}<&-
else
  tmpfs 700 "$state_dir"
fi

if [[ ! -e $project/CMakeLists.txt ]]; then
  mkdir -p "$project"
  put_back --rbind "$project_fd" "$project"
fi
exec {project_fd}<&- {var_fd}<&-
cd "${KELDOAUTH_CWD:-$project}"

if [[ -n ${KELDOAUTH_LIB_DIR:-} ]]; then
  export LD_LIBRARY_PATH=$KELDOAUTH_LIB_DIR${LD_LIBRARY_PATH:+:$LD_LIBRARY_PATH}
fi
exec "$@"
