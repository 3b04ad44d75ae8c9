#!/usr/bin/env bash
# What the options of a build do. Runs in private mounts, where what is to be
# missing can be hidden.
# Usage: options.sh missing|switched|language|archive|sysroot|configurations|documented
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

hide_nettle() { mount -n -t tmpfs tmpfs /usr/include/nettle; }

# The parts of a tree: what each builds that the others do not.
declare -A targets=([TOOLS]=keldoauth_cli [SERVICE]=keldoauth_service [EXAMPLES]=first_token)
has_target() { ninja -C "$1" -t targets all | grep "^$2: " >/dev/null; }

case $subject in
  missing)
    # All of it is said at once, with the way out.
    hide_cli11
    hide_nettle
    if configured all; then fail "configured without CLI11 and nettle"; fi
    for word in CLI11 libcli11-dev nettle-dev 'for KELDOAUTH_TOOLS, -DKELDOAUTH_TOOLS=OFF' \
      KELDOAUTH_SERVICE=OFF 'for the stand-ins'; do
      grep -q -- "$word" all.log || fail "not a word of $word: $(<all.log)"
    done
    # The same of what flags take away; and the folder is good for another try.
    if configured flags -DCMAKE_CXX_FLAGS=-fno-exceptions "${parts_off[@]}" \
      -DKELDOAUTH_PLATFORM=auto; then fail "configured without exceptions"; fi
    grep -q -- -fno-exceptions flags.log || fail "not a word of the flag: $(<flags.log)"
    umount /usr/include/nettle
    configured flags -DCMAKE_CXX_FLAGS= "${parts_off[@]}" || fail "$(<flags.log)"
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
    lib="$work/a folder/lib" include="$work/another folder"
    configured tree -DBUILD_SHARED_LIBS=OFF "${parts_off[@]}" -DCMAKE_BUILD_TYPE=Debug \
      -DCMAKE_INSTALL_PREFIX="$work/prefix" -DCMAKE_INSTALL_LIBDIR="$lib" \
      -DCMAKE_INSTALL_INCLUDEDIR="$include"
    cmake --build tree >/dev/null
    cmake --install tree >/dev/null
    [[ -z $(find "$work" -name 'libkeldoauth.so*') ]] || fail "a shared library was built"

    cmake -S "$here/find_package" -B found -G Ninja -DCMAKE_PREFIX_PATH="$work/a folder" >/dev/null
    cmake --build found >/dev/null
    export PKG_CONFIG_PATH=$lib/pkgconfig
    flags=()
    # It writes a blank within a path as a shell would take it.
    flags=()
    eval "flags=($(pkg-config --cflags --libs keldoauth))"
    g++ -std=c++17 "$here/consumer.cpp" "${flags[@]}" -o consumer
    eval "flags=($(pkg-config --cflags --libs keldoauth-grants keldoauth))"
    g++ -std=c++17 "$project/examples/first_login.cpp" "${flags[@]}" -o login
    for program in found/consumer found/login consumer login; do
      LD_LIBRARY_PATH=$lib "./$program"
      rm -f /var/packages/Corvane/target/etc/*
    done

    # A link may stand in the place of the state's folder.
    umount -n /var/packages/Corvane/target/etc
    rmdir /var/packages/Corvane/target/etc
    mkdir -m 0700 elsewhere
    ln -s "$work/elsewhere" /var/packages/Corvane/target/etc
    LD_LIBRARY_PATH=$lib ./login
    [[ -s elsewhere/oauth.db ]] || fail "the store is not where the link leads"
    ;;
  sysroot)
    # A toolchain file that says as little as they do: compiler and root. What
    # pkg-config says is of another machine then.
    mkdir root pc
    ln -s /usr /lib root
    [[ ! -e /lib64 ]] || ln -s /lib64 root
    printf '%s\n' 'Name: jsoncpp' 'Description: x' 'Version: 0' 'Cflags: -I/nowhere' \
      'Libs: -L/nowhere -ljsoncpp' >pc/jsoncpp.pc
    cat >toolchain.cmake <<END
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_C_COMPILER gcc)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_SYSROOT $work/root)
set(CMAKE_FIND_ROOT_PATH $work/root)
foreach(kind LIBRARY INCLUDE PACKAGE)
  set(CMAKE_FIND_ROOT_PATH_MODE_\${kind} ONLY)
endforeach()
END
    touch libjsoncpp.a
    PKG_CONFIG_LIBDIR=$work/pc configured tree "${parts_off[@]}" \
      -DCMAKE_TOOLCHAIN_FILE="$work/toolchain.cmake" -DKELDOAUTH_STATIC_JSONCPP="$work/libjsoncpp.a" ||
      fail "$(<tree.log)"
    cmake --build tree --target keldoauth >tree.log || fail "$(<tree.log)"
    # No folder of the building machine's is in what is installed.
    ! grep -F "$work" tree/*.pc tree/KeldOAuthConfig.cmake || fail "the root of the build is named"
    ;;
  configurations)
    # A generator of several, whose files lie in a folder for each, with names that
    # are none of a caller's business.
    cmake -S "$project" -B tree -G "Ninja Multi-Config" -DKELDOAUTH_PLATFORM=standin \
      "${parts_off[@]}" -DKELDOAUTH_EXAMPLES=ON -DCMAKE_DEBUG_POSTFIX=d >tree.log
    cmake --build tree --config Debug --target first_token >tree.log || fail "$(<tree.log)"
    LD_LIBRARY_PATH=tree/Debug tree/Debug/first_token
    # The tests' scripts look for files where a generator of one puts them.
    if cmake tree -DKELDOAUTH_TESTS=ON -DKELDOAUTH_TOOLS=ON >tree.log 2>&1; then
      fail "configured the tests"
    fi
    grep -q 'generator of one configuration' tree.log || fail "$(<tree.log)"
    ;;
  documented)
    # docs/packaging.md has the options that there are, with their defaults.
    configured tree
    {
      cmake -N -L tree | sed -nE 's/^(KELD[A-Z0-9_]+):[A-Z]+=(.*)/\1 \2/p'
      echo BUILD_SHARED_LIBS ON
    } | grep -v _STATIC_JSONCPP | sort >real
    awk -F ' *[|] *' '/^\| `(KELD|BUILD_)/ {
      names = split($2, name, ", *")
      gsub(/`/, "", $3)
      for (i = 1; i <= names; i++) { gsub(/`/, "", name[i]); print name[i], $3 }
    }' "$project/docs/packaging.md" | grep -v _STATIC_JSONCPP | sort >said
    sed -i -e 's/^KELDOAUTH_PLATFORM standin/KELDOAUTH_PLATFORM auto/' real
    diff said real || fail "docs/packaging.md (<) and CMake (>) differ"
    ;;
  *) fail "no such subject: $subject" ;;
esac
