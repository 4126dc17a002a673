# A power cut in the daily run of the next day. The plug is pulled when the log is there and the run
# is still at work, frozen so that it cannot end first. The watcher has the same priority as the run.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
cat >/run/watch <<'WATCH'
found=
until [ -e "$found" ]; do
  for found in "$1"/pending/log-tallied-20371125*.log; do :; done
done
echo 1 >/sys/fs/cgroup/tavrel.slice/cgroup.freeze
WATCH
nice -n 10 sh /run/watch "$submission" &
# Neither now nor after the start may an upload take the logs that are checked.
systemctl stop tavrel-upload.timer
touch -d '2037-11-25 01:00 UTC' /var/lib/systemd/timers/stamp-tavrel-upload.timer
sync
date --utc --set '2037-11-25 01:10' >/dev/null
wait
touch /run/job/pull
sleep 60
echo "DIFFERS  nobody pulled the plug within a minute"
exit 1
