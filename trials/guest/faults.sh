# Runs every unit with its folders missing, on a read-only system, without room in /tmp, and with
# folders that are read-only, owned by others, or full. A unit that cannot work must fail with a
# status and a message; none may be killed by a signal or hang.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
kept="/var/mobile /var/lib/tavrel"
folders="$kept /run/tavrel"
store="statistics store /var/mobile/Library/Brimhold/BHDataStore.sqlitedb"

# Whether a unit has ended or is waiting for something to do.
idle() {
  process=$(systemctl show -P MainPID "$1")
  # Until the program is executed, its name is in parentheses.
  [ "$process" = 0 ] || awk '/^Name:/ {executed = $2 !~ /[(]/} /^State:/ {waits = $2 == "S"}
    END {exit !(executed && waits)}' "/proc/$process/status"
}

# The messages of a unit's last start, from warnings upwards.
warnings() {
  journalctl --quiet --sync
  invocation=$(systemctl show -P InvocationID "$1")
  journalctl --quiet -o cat -p warning "_SYSTEMD_INVOCATION_ID=$invocation" |
    sed "s/^/  /; s|$store|STORE|; s/ [0-9]* values/ N values/"
}

# The outcome of starting each unit: first those that end, then those that stay.
outcomes() {
  systemctl reset-failed 'tavrel*.service'
  for unit in collect fold daily health upload metrics; do
    systemctl restart "tavrel-$unit.service" 2>/dev/null
    while busy; do sleep 0.1; done
    echo "$unit: $(outcome "tavrel-$unit.service")"
    warnings "tavrel-$unit.service"
  done
  for unit in tavrel tavrel-sampler tavrel-statsd; do
    systemctl restart "$unit.service" 2>/dev/null
    until idle "$unit.service" 2>/dev/null; do sleep 0.1; done
    echo "$unit: $(systemctl is-active "$unit.service") $(outcome "$unit.service")"
    warnings "$unit.service"
    systemctl stop "$unit.service" 2>/dev/null  # it warns of sockets that can start the unit
  done
}

the_rest_works="metrics: success 0
tavrel: active success 0
tavrel-sampler: active success 0
tavrel-statsd: active success 0"
all_work="collect: success 0
fold: success 0
daily: success 0
health: success 0
upload: success 0
$the_rest_works"

cover() { # OPTIONS OF TMPFS, FOLDER...
  options=$1
  shift
  for folder in "$@"; do mount -t tmpfs -o "$options" none "$folder"; done
}
uncover() {
  for folder in "$@"; do umount "$folder"; done
}

# The first upload takes everything that has waited since the power cut.
connect
nginx
systemctl stop tavrel-fold.path tavrel-upload.path tavrel-sampler.service
expect "units with their folders" "$all_work" "$(outcomes)"
expect "nothing waits any more" "" "$(logs pending)$(logs outbox)"
# nginx keeps files open for writing, which prevents a read-only remount.
nginx -s quit 2>/dev/null
while [ -e /run/nginx.pid ]; do sleep 0.1; done

for folder in $folders; do mv "$folder" "$folder.kept"; done
expect "units without their folders" "$all_work" "$(outcomes)"
for folder in $folders; do rm -rf "$folder" && mv "$folder.kept" "$folder"; done

# Keep writable what a read-only system needs. Meanwhile the journal keeps its files in /run.
journalctl --relinquish-var
cover mode=755 /var
mount -o remount,bind,ro /
expect "the system is read-only" 1 "$(touch /etc/tavrel/file 2>/dev/null; echo $?)"
expect "units on a read-only system with an empty /var" "$all_work" "$(outcomes)"
expect "the folders that they made" "755 root root /var/lib/tavrel
755 root root /var/mobile" "$(stat -c '%a %U %G %n' /var/lib/tavrel /var/mobile)"
mount -o remount,bind,rw /
uncover /var
journalctl --flush

# Any user can bring this about.
cover nr_inodes=1 /tmp
expect "no folder can be made in /tmp" 1 "$(mkdir /tmp/folder 2>/dev/null; echo $?)"
expect "units without room in /tmp" "$all_work" "$(outcomes)"
uncover /tmp

# A request stays as long as no fold can be confined.
mkdir -p /run/systemd/system/tavrel-fold.service.d
printf '[Service]\nInaccessiblePaths=/missing\n' >/run/systemd/system/tavrel-fold.service.d/fault.conf
systemctl daemon-reload
touch /run/tavrel/stat/fold-wanted
systemctl start tavrel-fold.path
sleep 10
expect "the path unit goes on" active "$(systemctl is-active tavrel-fold.path)"
systemctl stop tavrel-fold.path
settle
journalctl --quiet --sync
folds=$(journalctl --quiet -o cat -u tavrel-fold.service | grep -c 'Failed at step NAMESPACE')
expect "the request starts folds" 1 "$((folds > 0))"
most "folds that could not be confined, in ten seconds" 11 "$folds"
rm -r /run/systemd/system/tavrel-fold.service.d
systemctl daemon-reload

# shellcheck disable=SC2086
cover ro $kept
expect "units with read-only folders" "collect: success 0
fold: exit-code 1
  tavrelctl: STORE: its folder cannot be made: Read-only file system: mount its file system for \
writing; what programs recorded waits for the next fold
daily: success 0
  this run will not be remembered: cannot write /var/lib/tavrel/last-run.plist: Read-only file \
system; make the file system writable
  STORE: its folder cannot be made: Read-only file system: mount its file system for writing; what \
programs recorded waits for the next fold
  STORE: its folder cannot be made: Read-only file system: mount its file system for writing; \
N values are not kept yet: cannot lock /var/mobile/Library/Brimhold/.lock: No such file or directory
  the run's statistics could not be saved: another run today repeats day 24799
  cannot make the folder /var/mobile/Library: Read-only file system; make the file system writable
  this run will not be remembered: cannot write /var/lib/tavrel/last-run.plist: Read-only file \
system; make the file system writable
health: exit-code 1
  cannot keep counters: cannot make the folder /var/lib/tavrel/health: Read-only file system; make \
the file system writable
upload: exit-code 238
  tavrel-upload.service: Failed to set up special execution directory in /var/lib: Read-only file \
system
  tavrel-upload.service: Failed at step STATE_DIRECTORY spawning /usr/sbin/tavrel-upload: Read-only \
file system
$the_rest_works" \
  "$(outcomes)"
# shellcheck disable=SC2086
uncover $kept

# shellcheck disable=SC2086
cover "uid=65534,gid=65534,mode=700" $folders
expect "units with the folders of others" "$all_work" "$(outcomes)"
# shellcheck disable=SC2086
uncover $folders

# shellcheck disable=SC2086
cover "size=64k" $folders
for folder in $folders; do mkdir "$folder/Library"; done
for folder in $folders; do cat /dev/zero >"$folder/full" 2>/dev/null; done
expect "units with full folders" "collect: exit-code 1
  tavrelctl: cannot record in /run/tavrel/stat: less than an eighth of its tmpfs is free, or a limit of \
this process is exhausted: run 'tavrelctl stat fold' or free space in /run
fold: success 0
daily: exit-code 0
  this run will not be remembered: cannot write /var/lib/tavrel/last-run.plist: No space left on \
device; free some space
  STORE: database or disk is full: free some space in its file system; N values are not kept yet: \
cannot write /var/mobile/Library/Brimhold/BHDataStore.sqlitedb-kept: No space left on device; free \
some space
  the run's statistics could not be saved: another run today repeats day 24799
  cannot write /var/mobile/Library/Preferences/com.norvane.tallied.tavrel.plist: No space left on \
device; free some space
  this run will not be remembered: cannot write /var/lib/tavrel/last-run.plist: No space left on \
device; free some space
  tavrelctl: STORE: database or disk is full: free some space in its file system
health: exit-code 1
  cannot keep counters: cannot write /var/lib/tavrel/health/memory.plist: No space left on device; \
free some space
  cannot write /run/tavrel/health/nvme0.plist: No space left on device; free some space
upload: success 0
metrics: exit-code 1
  tavrelctl: cannot write /run/tavrel/metrics/tavrel.prom: No space left on device; free some space
tavrel: active success 0
tavrel-sampler: activating exit-code 1
  tavrelctl: cannot record in /run/tavrel/stat: less than an eighth of its tmpfs is free, or a limit of \
this process is exhausted: run 'tavrelctl stat fold' or free space in /run
tavrel-statsd: active success 0
  tavrel-statsd: less than an eighth of the tmpfs of /run/tavrel/stat is free, or a limit of the \
process is exhausted: nothing is recorded" \
  "$(outcomes)"
# shellcheck disable=SC2086
uncover $folders

expect "units with their folders again" "$all_work" "$(outcomes)"
systemctl start tavrel-fold.path tavrel-upload.path tavrel-sampler.service
