# Installs the packages while the clock shows 1970, as on a device without a battery.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.

# All tavrel units share a slice, which adds up their CPU time.
for unit in tavrel.service tavrel-.service; do
  mkdir -p "/run/systemd/system/$unit.d"
  printf '[Service]\nSlice=tavrel.slice\n' >"/run/systemd/system/$unit.d/slice.conf"
done
# Each jump of the clock would start a random delay again.
for timer in daily fold upload; do
  mkdir -p "/run/systemd/system/tavrel-$timer.timer.d"
  printf '[Timer]\nRandomizedDelaySec=0\nAccuracySec=1s\n' \
    >"/run/systemd/system/tavrel-$timer.timer.d/exact.conf"
done
# Also prevent a run that is due because of the time since the start.
printf 'OnBootSec=\nOnCalendar=*-*-* 00:05:00 UTC\n' \
  >>/run/systemd/system/tavrel-daily.timer.d/exact.conf
systemctl daemon-reload
systemd-run --quiet --unit=keeps-slice --slice=tavrel.slice sleep infinity
find / -xdev | sort >/root/before

date --utc --set '1970-01-01 00:20' >/dev/null
export DEBIAN_FRONTEND=noninteractive
apt-get install -qq -y --no-install-recommends "$packages"/tavrel_*.deb \
  "$packages"/tavrel-statsd_*.deb "$packages"/tavrel-upload_*.deb "$packages"/libbrimhold1_*.deb \
  "$packages"/python3-brimhold_*.deb >/root/apt.log 2>&1
expect "packages are installed" 0 "$?"
settle
units="tavrel-daily.timer
tavrel-fold-shutdown.service
tavrel-fold.path
tavrel-fold.timer
tavrel-health.timer
tavrel-sampler.service
tavrel-upload-boot.timer
tavrel-upload.path
tavrel-upload.timer
tavrel.socket"
expect "what is enabled" "$units" \
  "$(systemctl list-unit-files --no-legend --state=enabled 'tavrel*' | awk '{print $1}' | sort)"
expect "what is active" "$units" "$(systemctl list-units --no-legend --plain \
  --state=active 'tavrel*' | awk '{print $1}' | grep -Ev '^tavrel(-folders.service|.slice)$' | sort)"
expect "processes: the sampler" tavrelctl \
  "$(sed 's,.*,/proc/&/comm,' /sys/fs/cgroup/tavrel.slice/tavrel*/cgroup.procs | xargs cat)"
expect "folder of those who record" "1770 root brimhold" "$(stat -c '%a %U %G' /run/tavrel/stat)"
systemctl start tavrel-daily.service
expect "a run in 1970" "success 0" "$(outcome tavrel-daily.service)"
expect "it files nothing" "" "$(logs pending)"
expect "the wrong clock is reported" "CRITICAL clock: today is day 0 (1970-01-01), before this program \
was built: set the clock" "$(tavrelctl status --check | grep ' clock: ')"
