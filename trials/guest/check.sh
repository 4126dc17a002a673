# Functions that the guest's scripts share. They print a line for each check; `checked` returns
# 1 when one of them failed.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
failures=0

# expect WHAT EXPECTED ACTUAL: checks that both texts are the same, byte by byte.
expect() {
  if [ "$2" = "$3" ]; then
    echo "ok       $1"
  else
    failures=$((failures + 1))
    echo "DIFFERS  $1"
    diff /dev/fd/3 /dev/fd/4 3<<EXPECTED 4<<ACTUAL | sed 's/^/         /'
$2
EXPECTED
$3
ACTUAL
  fi
}

# most WHAT LIMIT ACTUAL: checks that a number does not exceed a limit.
most() {
  if [ "$3" -le "$2" ]; then
    echo "ok       $1: $3, at most $2"
  else
    failures=$((failures + 1))
    echo "DIFFERS  $1: $3 is more than $2"
  fi
}

# note WHAT: prints a figure without a check.
note() { echo "         $1"; }

checked() {
  [ "$failures" -eq 0 ] || echo "$failures checks failed"
  return "$((failures > 0))"
}

# Sets the clock, and waits until everything that became due has ended.
clock() {
  date --utc --set "$1" >/dev/null
  settle
}

services="tavrel-folders.service tavrel-collect.service tavrel-fold.service tavrel-health.service
  tavrel-daily.service tavrel-upload.service"

# Whether a service of tavrel is working or about to. An upload that waits for its
# next attempt does not count.
busy() {
  # shellcheck disable=SC2086
  systemctl show -P Job -P SubState $services | grep -qvE '^(|dead|failed|auto-restart)$'
}

# Waits until tavrel is idle. After work, checks again, because one unit starts another.
settle() {
  sleep 0.3
  while busy; do
    while busy; do sleep 0.2; done
    sleep 0.3
  done
}

# Bytes written to the file system's block device since the system started.
written() {
  sync
  awk '{print $7 * 512}' /sys/block/vda/stat
}

# CPU time of all tavrel units since the slice was made, in microseconds.
processor() { awk '$1 == "usage_usec" {print $2}' /sys/fs/cgroup/tavrel.slice/cpu.stat; }

# The result and exit status of a unit's last run.
outcome() { systemctl show -P Result -P ExecMainStatus "$1" | paste -sd ' '; }

# Gives the guest an address and a default route, which an upload to another machine needs: until
# the next start.
address=192.0.2.1
connect() { ip address add "$address/32" dev lo && ip route add default dev lo; }

submission=/var/mobile/Library/Logs/Submission
logs() { (cd "$submission/$1" 2>/dev/null && ls) | sed -n 's/^\(log-[a-z]*\)-.*\.log$/\1/p' | sort; }
