#!/bin/sh
# What an administrator would write in kelvane's place. For the ordinary cases alone: every file is
# there and well-formed, and no link, file or directory stands where another kind is expected.

store=/var/db/timezone
system=/usr/share/zoneinfo.default

reset_to_system() {
  echo "$0: $1; resetting to the system partition" >&2
  rm -f "$store/zoneinfo" "$store/icutz" /var/db/icutz
  ln -s "$system" "$store/zoneinfo"
}

compatible() { # directory of a release
  [ -f "$1/icutz/icutz$schema.dat" ]
}

newer() { # version, version
  [ "$1" != "$2" ] && printf '%s\n' "$2" "$1" | sort -CV
}

read -r system_version <"$system/+VERSION"
system_version=$system_version.1.0
read -r schema </usr/share/icu/icutzformat.txt
active_version=$system_version

current=$(readlink "$store/zoneinfo")
case $current in
  "$system") current_version=$system_version ;;
  "$store"/tz/*/zoneinfo)
    current=${current%/*}
    current_version=${current##*/}
    if compatible "$current" && ! newer "$system_version" "$current_version"; then
      active_version=$current_version
    else
      reset_to_system "$current is incompatible or old"
    fi
    ;;
  *)
    current_version=$system_version
    reset_to_system "bad link $current"
    ;;
esac

update=$(readlink "$store/tz_latest")
if [ "$update" ]; then
  update_version=${update##*/}
  if compatible "$update" && newer "$update_version" "$current_version"; then
    rm -f "$store/zoneinfo" "$store/icutz" /var/db/icutz
    ln -s "$update/zoneinfo" "$store/zoneinfo"
    ln -s "$update/icutz" "$store/icutz"
    printf '%s_%s' "$active_version" "$update_version" >"$store/TZVersionDiffRecord"
  else
    echo "$0: $update_version is incompatible or not newer than $current_version" >&2
  fi
fi

case $(readlink "$store/localtime") in
  "$store"/zoneinfo/*) ;;
  *)
    rm -f "$store/localtime"
    ln -s "$store/zoneinfo/America/Los_Angeles" "$store/localtime"
    ;;
esac
