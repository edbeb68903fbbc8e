# shellcheck shell=bash
# Sourced by the other scripts: installs packages, builds, and keeps commands quiet.

root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)

# Debian packages to build and test, and those that only the checks of .ci/run need.
packages=(cmake g++ libgtest-dev libseccomp-dev ninja-build pkg-config python3)
# shellcheck disable=SC2034 # used by the scripts that source this file
check_packages=("${packages[@]}" clang clang-format clang-tidy doxygen dpkg-dev file golang-go
  libclang-rt-dev libsystemd-dev mandoc rustc systemd valgrind)

# Runs a command, and prints its output only if it fails.
quietly() {
  local log
  log=$(mktemp)
  if ! "$@" >"$log" 2>&1 </dev/null; then
    cat "$log" >&2
    rm -f "$log"
    echo "failed: $*" >&2
    return 1
  fi
  rm -f "$log"
}

# Installs the missing packages if root runs it, and otherwise prints the command that does.
require_packages() {
  local package missing=()
  command -v dpkg-query >/dev/null || return 0 # not Debian: the build reports missing packages
  for package in "$@"; do
    [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) == installed* ]] ||
      missing+=("$package")
  done
  ((${#missing[@]} > 0)) || return 0
  if ((EUID != 0)); then
    echo "Some packages are missing. Install them, as root, with:" >&2
    echo "  apt-get install ${missing[*]}" >&2
    return 1
  fi
  echo "Installing ${missing[*]} ..." >&2
  export DEBIAN_FRONTEND=noninteractive
  quietly apt-get update
  quietly apt-get install --yes --no-install-recommends "${missing[@]}"
}

# build PRESET [TARGET...]: builds the targets, or everything.
build() (
  preset=$1
  shift
  cd "$root" || exit
  configure "$preset"
  quietly cmake --build --preset "$preset" ${1+--target "$@"}
)

configure() {
  [[ ! -e $root/build/$1/build.ninja ]] || return 0
  echo "Building in build/$1; the first time takes a while ..." >&2
  (cd "$root" && quietly cmake --preset "$1")
}
