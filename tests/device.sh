# shellcheck shell=bash disable=SC2034,SC2154
# A device in a throw-away root, described as text like the worlds of the other tests. Sourced.
# In: $program, a static executable. Out: $work, a directory that is removed at the end.

set -euo pipefail
umask 022
# An ordinary user's has no chroot(8). Not /sbin, where the program is in a throw-away root.
export PATH=/usr/sbin:$PATH
((EUID == 0)) || UNPRIVILEGED=yes exec unshare --map-root-user bash "$0" "$@"
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# device ROOT: a root with the program and the entries that standard input describes, one a line:
# "/file = content" or "/link -> target".
device() {
  local path kind value
  mkdir -p "$1/sbin"
  cp "$program" "$1/sbin/kelvane"
  while read -r path kind value; do
    mkdir -p "$1${path%/*}"
    case $kind in
      '=') printf '%s\n' "$value" >"$1$path" ;;
      '->') ln -s "$value" "$1$path" ;;
    esac
  done
}

# The entries of the system partition, of a download, and of links that select one.
system() {
  printf '/usr/share/%s\n' "zoneinfo.default/+VERSION = $1" "zoneinfo.default/Europe/Paris = TZif" \
    "icu/icutzformat.txt = 44l"
}
download() {
  printf "/var/db/timezone/tz/$1/%s\n" "zoneinfo/Europe/Paris = TZif" \
    "icutz/icutz${2-44l}.dat = data"
}
on() {
  printf "/var/db/timezone/%s\n" "zoneinfo -> /var/db/timezone/tz/$1/zoneinfo" \
    "icutz -> /var/db/timezone/tz/$1/icutz"
}

# snapshot ROOT: $store, the store's links and files as text, $record, what the record holds, and
# $data, everything that no run may change, with sizes and times.
snapshot() {
  local all
  # In C's order the store's lines, which begin with a slash, come first.
  all=$'\n'$(cd "$1" && find usr var/db -regextype egrep \
    -regex '(usr|var/db/timezone/tz)(/.*)?' -printf 'data %p %y %l %s %T@\n' -o \
    ! -type d -printf '/%p -> %l\n' | LC_ALL=C sort)
  store=${all%%$'\ndata'*} record=
  data=${all#"$store"} store=${store#$'\n'}
  [[ ! -f $1/var/db/timezone/TZVersionDiffRecord ]] ||
    IFS= read -r -d '' record <"$1/var/db/timezone/TZVersionDiffRecord" || true
}
