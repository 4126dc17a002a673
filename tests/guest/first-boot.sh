#!/bin/sh
# The first start of the guest's system, up to a pulled plug.
#   first-boot.sh whole|short PACKAGES LATER-PACKAGES
# shellcheck disable=SC2034,SC2154 # The parts share variables.
set -u
here=$(dirname "$0")
extent=$1 packages=$2 later=$3
later_version=$(dpkg-deb -f "$later"/tavrel_*.deb Version)
if [ "$extent" = whole ]; then
  parts="days away upgrade"
  hours=$(seq -w 0 23) samples=$(seq 60)
else
  parts="days upgrade"
  hours="00 01 12 23" samples="1 2"
fi
for part in check install server $parts; do
  # shellcheck source=/dev/null
  . "$here/$part.sh"
done
checked || exit 1

# The daily run of the next day. The plug is pulled when its log is there and it is still at work:
# frozen, so that it does not come to its end meanwhile. The watcher yields to the run.
cat >/run/watch <<'WATCH'
found=
until [ -e "$found" ]; do
  for found in "$1"/pending/log-tallied-20371125*.log; do :; done
done
echo 1 >/sys/fs/cgroup/tavrel.slice/cgroup.freeze
WATCH
nice -n 10 sh /run/watch "$submission" &
date --utc --set '2037-11-25 01:10' >/dev/null
wait
touch /run/job/pull
sleep 60
