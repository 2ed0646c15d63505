# shellcheck shell=bash
# Runs in the root that scripts/bench makes: measures each program in three ordinary cases.

set -Eeuo pipefail
trap 'echo "bench: this has failed: $BASH_COMMAND" >&2' ERR
store=/var/db/timezone system=/usr/share/zoneinfo.default download=$store/tz/2023c.1.0

mkdir -p $system/Europe /usr/share/icu $download/{zoneinfo/Europe,icutz} /links
echo 2022a >$system/+VERSION
echo 2023c >$download/zoneinfo/+VERSION
echo 44l >/usr/share/icu/icutzformat.txt
touch {$system,$download/zoneinfo}/Europe/Paris $download/icutz/icutz44l.dat

# Before each run, untimed.
put_links_back="find $store -maxdepth 1 ! -type d -delete; cp -a /links/. $store"

# The links, and what the record holds.
list_store() { find $store -maxdepth 1 ! -type d -printf '%f %l\n' -type f -exec cat {} \; | sort; }

afresh() { sh -c "$put_links_back" && "$@"; }

row() { printf '%-15s  %-12s  %5s  %5s  %5s  %11s\n' "$@"; }

measure() { # case, program
  local time calls instructions
  hyperfine --shell=none --warmup 20 --runs 500 --prepare "sh -c '$put_links_back'" \
    --export-csv /times "/sbin/$2" &>/dev/null
  time=$(awk -F , 'NR == 2 {printf "%.2f", $4 * 1000}' /times)
  afresh command time --format %M --output /memory "/sbin/$2" 2>/dev/null
  afresh strace -f -qq -e signal=none -o /calls "/sbin/$2" 2>/dev/null
  calls=$(grep -vc ' resumed>' /calls)
  afresh env -i valgrind.bin --tool=callgrind --trace-children=yes \
    --callgrind-out-file=/callgrind.%p "/sbin/$2" 2>/dev/null
  instructions=$(sed -n 's/^totals: //p' /callgrind.* | paste -sd +)
  rm /callgrind.*
  row "$1" "$2" "$time" "$(</memory)" "$calls" "$((instructions))"
}

row case program ms KiB calls instructions
for case in "system data" "newest download" activation; do
  rm -f /links/*
  ln -s $store/zoneinfo/Europe/Paris /links/localtime
  [[ $case == system* ]] || ln -s $download /links/tz_latest
  [[ $case == newest* ]] || ln -s $system /links/zoneinfo
  [[ $case != newest* ]] || ln -s $download/{zoneinfo,icutz} /links
  measure "$case" nothing
  measure "" kelvane
  left=$(list_store)
  measure "" reconcile.sh
  [[ $(list_store) == "$left" ]]
done
