#!/usr/bin/env bash
# Builds two consumers in one of the three ways and runs them in private mounts; or
# looks whether every link of the installed documents leads to something.
# Usage: run.sh BUILD-FOLDER find_package|pkg_config|parent|documents
set -euo pipefail

build=$1
way=$2
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd -P)
work=$build/install-$way
strict=(-Wall -Wextra -Weffc++ -Wformat=2 -Wold-style-cast -Wuseless-cast -Werror)
prefix=$work/prefix

rm -rf "$work"
mkdir -p "$work"
libraries=$work
if [[ $way != parent ]]; then
  cmake --install "$build" --prefix "$prefix" >/dev/null
  libraries=$(dirname "$(find "$prefix" -name libkeldoauth.so.1)")
fi

fail() {
  printf '%s\n' "$*" >&2
  exit 1
}

run_consumers() {
  for program in consumer login; do
    KELDOAUTH_LIB_DIR=$libraries "$here/../support/sandbox.sh" "$work/$program"
  done
}

case $way in
  find_package)
    # Whether or not JsonCpp says where it is, without pkg-config, and by a
    # consumer that did not think of the language's version.
    for without in jsoncpp PkgConfig; do
      cmake -S "$here/find_package" -B "$work" -G Ninja --fresh --no-warn-unused-cli \
        -DCMAKE_PREFIX_PATH="$prefix" -DCMAKE_CXX_STANDARD=14 \
        -DCMAKE_DISABLE_FIND_PACKAGE_PkgConfig=ON \
        -DCMAKE_DISABLE_FIND_PACKAGE_"$without"=ON >/dev/null
      cmake --build "$work" --clean-first >/dev/null
      run_consumers
    done
    exit
    ;;
  pkg_config)
    export PKG_CONFIG_PATH=$libraries/pkgconfig
    flags=()
    # It writes a blank within a path as a shell would take it.
    eval "flags=($(pkg-config --cflags --libs keldoauth))"
    # The headers are fit for whom warnings are errors.
    g++ -std=c++17 "${strict[@]}" "$here/consumer.cpp" "${flags[@]}" -o "$work/consumer"
    eval "flags=($(pkg-config --cflags --libs keldoauth-grants))"
    g++ -std=c++17 "${strict[@]}" "$here/../../examples/first_login.cpp" "${flags[@]}" -o "$work/login"
    ;;
  parent)
    cmake -S "$here/parent" -B "$work" -G Ninja -DKELDOAUTH_PLATFORM=standin >/dev/null
    cmake --build "$work" --target consumer login >/dev/null
    cmake --install "$work" --prefix "$prefix" >/dev/null
    installed=$(cd "$prefix" && find . -type f | sort | xargs)
    [[ $installed == "./bin/consumer ./bin/login" ]] || fail "the parent installed $installed"
    libraries=$work/keldoauth
    ;;
  documents)
    exec "$here/check-links" "$prefix"
    ;;
esac
run_consumers
