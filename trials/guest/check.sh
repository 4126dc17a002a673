# What the scripts of the guest share. They print a line for each check; the status of `checked` is 1
# when one of them failed.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
failures=0

# expect WHAT EXPECTED ACTUAL: both texts are the same, byte by byte.
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

# most WHAT LIMIT ACTUAL: a number is not above a limit.
most() {
  if [ "$3" -le "$2" ]; then
    echo "ok       $1: $3, at most $2"
  else
    failures=$((failures + 1))
    echo "DIFFERS  $1: $3 is more than $2"
  fi
}

# note WHAT: a figure that nothing is expected of.
note() { echo "         $1"; }

checked() {
  [ "$failures" -eq 0 ] || echo "$failures checks failed"
  return "$((failures > 0))"
}

# Sets the clock, and waits until what became due has ended.
clock() {
  date --utc --set "$1" >/dev/null
  settle
}

services="tavrel-folders.service tavrel-collect.service tavrel-fold.service tavrel-health.service
  tavrel-daily.service tavrel-upload.service"

# Whether a service of tavrel is at work or about to be. An upload that waits for its next attempt is
# neither.
busy() {
  # shellcheck disable=SC2086
  systemctl show -P Job -P SubState $services | grep -qvE '^(|dead|failed|auto-restart)$'
}

# Until nothing of tavrel is on its way. After work it looks twice, because one unit starts another.
settle() {
  sleep 0.3
  while busy; do
    while busy; do sleep 0.2; done
    sleep 0.3
  done
}

# What the file system's block device was given to write since the system started, in bytes.
written() {
  sync
  awk '{print $7 * 512}' /sys/block/vda/stat
}

# CPU time of all units of tavrel since the slice was made, in microseconds.
processor() { awk '$1 == "usage_usec" {print $2}' /sys/fs/cgroup/tavrel.slice/cpu.stat; }

# What the unit's last run said of itself: its result and exit status.
outcome() { systemctl show -P Result -P ExecMainStatus "$1" | paste -sd ' '; }

submission=/var/mobile/Library/Logs/Submission
logs() { (cd "$submission/$1" 2>/dev/null && ls) | sed -n 's/^\(log-[a-z]*\)-.*\.log$/\1/p' | sort; }
