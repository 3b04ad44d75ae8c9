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

tmpfs() { mount -t tmpfs -o "mode=$1" tmpfs "$2"; }

# What the mounts below would hide is kept at hand under /mnt until the end.
tmpfs 755 /mnt
mkdir /mnt/project /mnt/var
mount --rbind "$project" /mnt/project
mount --rbind /var /mnt/var
if [[ -n ${KELDOAUTH_STATE:-} ]]; then
  mkdir /mnt/state
  mount --bind "$KELDOAUTH_STATE" /mnt/state
fi

tmpfs 1777 /tmp

# The host may have no /var/packages to mount over, and must not get one.
tmpfs 755 /var
for entry in /mnt/var/*; do
  name=${entry##*/}
  if [[ -L $entry ]]; then
    cp -P "$entry" "/var/$name"
  elif [[ -d $entry && $name != packages ]]; then
    mkdir "/var/$name"
    mount --rbind "$entry" "/var/$name"
  fi
done
(umask 022 && mkdir -p "$state_dir")
if [[ -n ${KELDOAUTH_STATE:-} ]]; then
  mount --move /mnt/state "$state_dir"
else
  tmpfs 700 "$state_dir"
fi

if [[ ! -e $project/CMakeLists.txt ]]; then
  mkdir -p "$project"
  mount --rbind /mnt/project "$project"
fi
cd "${KELDOAUTH_CWD:-$project}"
umount -R -l /mnt

if [[ -n ${KELDOAUTH_LIB_DIR:-} ]]; then
  export LD_LIBRARY_PATH=$KELDOAUTH_LIB_DIR${LD_LIBRARY_PATH:+:$LD_LIBRARY_PATH}
fi
exec "$@"
