#!/usr/bin/env bash
# What the options of a build do. Runs in private mounts, where what is to be
# missing can be hidden.
# Usage: options.sh missing|switched|language|archive
set -euo pipefail

subject=$1
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd -P)
project=$(cd "$here/../.." && pwd -P)
work=/tmp/options

mkdir "$work"
cd "$work"

fail() {
  printf '%s\n' "$*" >&2
  exit 1
}

# configured FOLDER OPTION...: a tree of the project in FOLDER, not built.
configured() {
  cmake -S "$project" -B "$1" -G Ninja -DKELDOAUTH_PLATFORM=standin "${@:2}" >"$1.log" 2>&1
}
parts_off=(-DKELDOAUTH_TOOLS=OFF -DKELDOAUTH_SERVICE=OFF -DKELDOAUTH_EXAMPLES=OFF)

hide_cli11() { mount -n -t tmpfs tmpfs /usr/include/CLI; }

# hide_nettle: pkg-config sees nothing but these two.
hide_nettle() {
  mkdir pc
  cp "$(pkg-config --variable=pcfiledir jsoncpp)/jsoncpp.pc" \
    "$(pkg-config --variable=pcfiledir sqlite3)/sqlite3.pc" pc
  export PKG_CONFIG_LIBDIR=$work/pc
}

# The parts of a tree: what each builds that the others do not.
declare -A targets=([TOOLS]=keldoauth_cli [SERVICE]=keldoauth_service [EXAMPLES]=first_token)
has_target() { ninja -C "$1" -t targets all | grep "^$2: " >/dev/null; }

case $subject in
  missing)
    # All of it is said at once, with the way out.
    hide_cli11
    hide_nettle
    if configured all; then fail "configured without CLI11 and nettle"; fi
    for word in CLI11 libcli11-dev nettle-dev KELDOAUTH_TOOLS=OFF KELDOAUTH_SERVICE=OFF; do
      grep -q -- "$word" all.log || fail "not a word of $word: $(<all.log)"
    done
    ;;
  switched)
    for part in "${!targets[@]}"; do
      configured "without-$part" "-DKELDOAUTH_$part=OFF"
      for other in "${!targets[@]}"; do
        wanted=yes there=no
        [[ $other != "$part" ]] || wanted=no
        if has_target "without-$part" "${targets[$other]}"; then there=yes; fi
        [[ $there == "$wanted" ]] || fail "without $part: $other is there: $there"
      done
    done
    configured kept -DKELDOAUTH_INSTALL=OFF
    cmake --install kept --prefix "$work/prefix" >/dev/null
    [[ ! -e $work/prefix ]] || fail "installed with KELDOAUTH_INSTALL=OFF: $(find prefix)"
    # The library and the tool are not one name, whatever runs the build.
    ninja -C kept -t targets all | grep -x 'keldoauth: phony' >/dev/null ||
      fail "the library is no target of its own"
    ;;
  language)
    declare -A standards=([98]=17 [14]=17 [17]=17 [20]=20 [23]=23)
    for asked in "${!standards[@]}"; do
      configured "in-$asked" -DCMAKE_CXX_STANDARD="$asked" -DCMAKE_UNITY_BUILD=ON "${parts_off[@]}"
      commands=in-$asked/compile_commands.json
      used=$(jq -r '.[].command' "$commands" | grep -oE -- '-std=[^ ]+' | sort -u)
      standard=${standards[$asked]/23/2[3b]}
      # shellcheck disable=SC2053  # a pattern: the newest has a working name, too
      [[ $used == -std=c++$standard ]] || fail "asked for $asked: $used"
      ! grep -q 'unity_' "$commands" || fail "sources are put together"
    done
    ;;
  archive)
    # Nothing but the library, in folders of a packager's choice.
    hide_cli11
    lib=$work/a/lib include=$work/b/include
    configured tree -DBUILD_SHARED_LIBS=OFF "${parts_off[@]}" -DCMAKE_BUILD_TYPE=Debug \
      -DCMAKE_INSTALL_PREFIX="$work/prefix" -DCMAKE_INSTALL_LIBDIR="$lib" \
      -DCMAKE_INSTALL_INCLUDEDIR="$include"
    cmake --build tree >/dev/null
    cmake --install tree >/dev/null
    [[ -z $(find "$work" -name 'libkeldoauth.so*') ]] || fail "a shared library was built"

    cmake -S "$here/find_package" -B found -G Ninja -DKeldOAuth_DIR="$lib/cmake/KeldOAuth" >/dev/null
    cmake --build found >/dev/null
    export PKG_CONFIG_PATH=$lib/pkgconfig
    read -ra flags <<<"$(pkg-config --cflags --libs keldoauth)"
    g++ -std=c++17 "$here/consumer.cpp" "${flags[@]}" -o consumer
    read -ra flags <<<"$(pkg-config --cflags --libs keldoauth-grants keldoauth)"
    g++ -std=c++17 "$project/examples/first_login.cpp" "${flags[@]}" -o login
    for program in found/consumer found/login consumer login; do
      LD_LIBRARY_PATH=$lib "./$program"
      rm -f /var/packages/Corvane/target/etc/*
    done
    ;;
  *) fail "no such subject: $subject" ;;
esac
