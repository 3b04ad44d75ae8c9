#!/usr/bin/env bash
# The library, built and installed twice from copies of the sources: in folders
# of other names, other time zones, another language and with another umask. Both
# installed copies are the same byte by byte. scripts/reproducible does it with the
# packages.
set -euo pipefail
source "$(dirname "${BASH_SOURCE[0]}")/../../scripts/lib.sh"

# With a cache of objects one of the two would be the other's.
export CCACHE_DISABLE=1
work=/tmp/reproducible

# installed_from FOLDER TO
installed_from() {
  mkdir -p "$1"
  git -C "$project" ls-files -z --cached --others --exclude-standard |
    tar -C "$project" --null -T - -c | tar -x -C "$1"
  # Not optimised: it is about what else goes into a file.
  quietly cmake -S "$1" -B "$1/built here" -G Ninja -DKELDOAUTH_PLATFORM=standin \
    -DKELDOAUTH_TOOLS=OFF -DKELDOAUTH_SERVICE=OFF -DKELDOAUTH_EXAMPLES=OFF \
    -DCMAKE_INSTALL_PREFIX=/usr -DCMAKE_CXX_FLAGS_RELEASE=-O0
  quietly cmake --build "$1/built here"
  DESTDIR=$2 quietly cmake --install "$1/built here"
}

(umask 022 && TZ=UTC LC_ALL=C.UTF-8 installed_from "$work/one" "$work/first")
(umask 077 && TZ=Pacific/Auckland LC_ALL=C installed_from "$work/another/longer name" "$work/second")

[[ -e $(find "$work/first" -name 'libkeldoauth.so.*' -type f) ]] || die "nothing was installed"
diff -r "$work/first" "$work/second"
