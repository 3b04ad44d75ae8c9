#!/usr/bin/env bash
# Builds a consumer in one of the three ways and runs it in private mounts.
# Usage: run.sh BUILD-FOLDER find_package|pkg_config|subdirectory
set -euo pipefail

build=$1
way=$2
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd -P)
work=$build/install-$way
prefix=$work/prefix

rm -rf "$work"
mkdir -p "$work"
libraries=$work
if [[ $way != subdirectory ]]; then
  cmake --install "$build" --prefix "$prefix" >/dev/null
  libraries=$(dirname "$(find "$prefix" -name libkeldoauth.so.1)")
fi

case $way in
  find_package)
    cmake -S "$here/find_package" -B "$work" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" >/dev/null
    cmake --build "$work" >/dev/null
    ;;
  pkg_config)
    export PKG_CONFIG_PATH=$libraries/pkgconfig
    read -ra flags <<<"$(pkg-config --cflags --libs keldoauth)"
    g++ -std=c++17 "$here/consumer.cpp" "${flags[@]}" -o "$work/consumer"
    ;;
  subdirectory)
    cmake -S "$here/subdirectory" -B "$work" -G Ninja -DKELDOAUTH_PLATFORM=standin >/dev/null
    cmake --build "$work" --target consumer >/dev/null
    ;;
esac

KELDOAUTH_LIB_DIR=$libraries "$here/../support/sandbox.sh" "$work/consumer"
