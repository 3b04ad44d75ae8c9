#!/usr/bin/env bash
# Builds two consumers in one of the four ways and runs them in private mounts; or
# looks whether every link of the installed documents leads to something.
# Usage: run.sh BUILD-FOLDER find_package|pkg_config|static|parent|documents
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

# loads_little PROGRAM...: of all that it was made of, only what is to be shared.
loads_little() {
  for program in "$@"; do
    ! readelf -dW "$program" | grep -E 'NEEDED.*(keldoauth|jsoncpp|sqlite3|stdc|gcc)' ||
      fail "$program loads that"
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
    eval "flags=($(pkg-config --cflags --libs keldoauth-grants keldoauth))"
    g++ -std=c++17 "${strict[@]}" "$here/../../examples/first_login.cpp" "${flags[@]}" -o "$work/login"
    ;;
  static)
    # The program chooses, by a property or by the name of a pkg-config file.
    cmake -S "$here/find_package" -B "$work" -G Ninja -DCMAKE_PREFIX_PATH="$prefix" \
      -DCONSUMER_STATIC=ON >/dev/null
    cmake --build "$work" >/dev/null
    run_consumers
    loads_little "$work/consumer" "$work/login"
    export PKG_CONFIG_PATH=$libraries/pkgconfig
    eval "flags=($(pkg-config --cflags --libs keldoauth-static))"
    g++ -std=c++17 "$here/consumer.cpp" "${flags[@]}" -o "$work/consumer"
    eval "flags=($(pkg-config --cflags --libs keldoauth-grants keldoauth-static))"
    g++ -std=c++17 "$here/../../examples/first_login.cpp" "${flags[@]}" -o "$work/login"
    loads_little "$work/consumer" "$work/login"
    # Both at once would be two copies of SQLite in a process.
    if cmake -S "$here/find_package" -B "$work/both" -DCMAKE_PREFIX_PATH="$prefix" \
      -DCONSUMER_STATIC=ON -DCONSUMER_BOTH=ON >/dev/null 2>"$work/refusal"; then
      fail "a program may link both flavours"
    fi
    grep -q KELDOAUTH_FLAVOUR "$work/refusal"
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
