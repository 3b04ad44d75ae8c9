# shellcheck shell=bash
# What the scripts of this folder share. Sourced, never run.

project=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd -P)
# shellcheck disable=SC2034  # for the scripts that source this file
scripts=$project/scripts

if [[ -t 1 && -z ${NO_COLOR:-} ]]; then
  bold=$'\e[1m' dim=$'\e[2m' red=$'\e[31m' green=$'\e[32m' plain=$'\e[0m'
else
  # shellcheck disable=SC2034
  bold='' dim='' red='' green='' plain=''
fi

die() {
  printf '%s: %s\n' "${0##*/}" "$*" >&2
  exit 1
}

# Every script tells its usage when asked: the words at its head.
case ${1:-} in
  -h | --help)
    sed -n '2,/^[^#]/ s/^# \{0,1\}//p' "$0"
    exit
    ;;
esac

# progress TEXT: one line that says what is going on.
progress() { printf '%s==> %s%s\n' "$bold" "$*" "$plain"; }

# quietly COMMAND...: its output is shown only when it fails.
quietly() {
  local output status=0
  output=$("$@" 2>&1 </dev/null) || status=$?
  [[ $status -eq 0 ]] || printf '%s\n' "$output" >&2
  return "$status"
}

# Whoever runs these scripts trusts the checkout, another user's as well.
git() { command git -c safe.directory='*' "$@"; }

# configure FOLDER OPTION...: a build with the stand-in platform libraries.
# A folder that came along from a checkout elsewhere starts afresh.
configure() {
  local folder=$1 fresh=() cache=$1/CMakeCache.txt
  shift
  if [[ -e $cache ]] && ! grep -qxF "CMAKE_HOME_DIRECTORY:INTERNAL=$project" "$cache"; then
    fresh=(--fresh)
  fi
  quietly cmake -S "$project" -B "$folder" -G Ninja "${fresh[@]}" \
    -DKELDOAUTH_PLATFORM=standin "$@"
}

# What scripts/cross builds for, the target first.
# shellcheck disable=SC2034
cross_architectures=(armhf arm64 armel i386 s390x)

# configure_cross ARCHITECTURE FOLDER OPTION...: the same for another processor.
configure_cross() {
  configure "$2" "-DCMAKE_TOOLCHAIN_FILE=$project/cmake/cross/$1.cmake" "${@:3}"
}

# build FOLDER [TARGET...]: on a terminal ninja counts its steps in one line.
build() {
  local folder=$1 loudness=quietly
  shift
  if [[ -t 1 ]]; then loudness='command'; fi
  "$loudness" cmake --build "$folder" --parallel "$(nproc)" ${1:+--target "$@"}
}

# require_private_mounts: everything that runs the library needs them.
require_private_mounts() {
  quietly "$project/tests/support/sandbox.sh" true ||
    die "no private mounts here: run as root, or as a user who may create user namespaces"
}

# private_apt FOLDER ARCHITECTURE: an apt of its own in the array "apt", for what
# FOLDER/etc/sources.list names. It keeps the host's way to the network, and
# nothing else of it.
private_apt() {
  local folder=$1 architecture=$2
  mkdir -p "$folder"/{lists/partial,cache/archives/partial,etc/preferences.d,etc/apt.conf.d}
  : >"$folder/status"
  apt-config dump Acquire >"$folder/etc/apt.conf.d/acquire"
  # shellcheck disable=SC2034
  apt=(env "APT_CONFIG=/dev/null" apt-get -q -y
    -o "Dir::Etc=$folder/etc" -o "Dir::Etc::sourceparts=/dev/null"
    -o "Dir::State=$folder" -o "Dir::State::status=$folder/status" -o "Dir::Cache=$folder/cache"
    -o "APT::Architecture=$architecture" -o "APT::Architectures::=$architecture"
    -o APT::Install-Recommends=false -o APT::Sandbox::User=)
}
