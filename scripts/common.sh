# Sourced by the other scripts: what they need of the machine, whoever runs them and from wherever.
# shellcheck shell=bash

set -euo pipefail
cd "$(dirname "$(realpath "${BASH_SOURCE[0]}")")/.."
exec </dev/null
umask 022
# An ordinary user's has no chroot(8).
export PATH=$PATH:/usr/sbin
unset TZ TZDIR
export LC_ALL=C DEBIAN_FRONTEND=noninteractive
: "${CMAKE_BUILD_PARALLEL_LEVEL:=$(nproc)}"
export CMAKE_BUILD_PARALLEL_LEVEL

fail() {
  echo "$(basename "$0"): $*" >&2
  exit 1
}

[[ $PWD != *\"* ]] || fail "CMake cannot build below a directory with \" in its name; rename it"

# Runs a command and shows its output only where it fails, which ends the script.
quietly() {
  local output
  output=$("$@" 2>&1) || {
    printf '%s\n' "$output" >&2
    fail "this has failed: $*"
  }
}

need_packages() {
  local package missing=()
  for package; do
    [[ $(dpkg-query -W -f='${Status}' "$package" 2>&1) == *' installed' ]] || missing+=("$package")
  done
  ((${#missing[@]} > 0)) || return 0
  ((EUID == 0)) || fail "packages are missing; as root: apt-get install ${missing[*]}"
  echo "Installing ${missing[*]}"
  # Without the lists that are out of reach, those at hand may do.
  apt-get update &>/dev/null || true
  quietly apt-get install --yes --no-install-recommends --no-remove "${missing[@]}"
}

build_preset() {
  echo "Building build/$1"
  quietly cmake --preset "$1"
  quietly cmake --build --preset "$1"
}

# Throw-away roots lie under build/, where programs may run. Root enters one, or a user who is root
# in a namespace of their own; containers may withhold either.
as_root=()
((EUID == 0)) || as_root=(unshare --map-root-user)

need_throw_away_roots() {
  { mkdir -p build 2>/dev/null && [[ -w build ]]; } || fail "this checkout is not writable; copy it"
  in_root / true 2>/dev/null && return
  ((EUID == 0)) && fail "root may not call chroot here; the container needs CAP_SYS_CHROOT"
  fail "an ordinary user gets no user namespace here (unshare --map-root-user); run it as root"
}

in_root() { "${as_root[@]}" chroot "$@"; } # root directory, command

# Replaces the script by a command whose mounts end with it.
exec_with_own_mounts() {
  "${as_root[@]}" unshare --mount true 2>/dev/null || fail "nothing can be mounted here:" \
    "a container needs CAP_SYS_ADMIN, and a chroot must be a mount (mount --bind ROOT ROOT)"
  exec "${as_root[@]}" unshare --mount "$@"
}
