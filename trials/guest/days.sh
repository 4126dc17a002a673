# Three days by the clock: what one day records leaves the device on the next.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
mkdir -p '/Library/Application Support/Brimhold'
cp "$here/whitelist.plist" '/Library/Application Support/Brimhold/Whitelist_Pellio.plist'

useradd --no-create-home --groups brimhold recorder
mkdir /run/recorder && mkfifo /run/recorder/in /run/recorder/out && chown -R recorder /run/recorder
systemd-run --quiet --unit=recorder --uid=recorder python3 "$here/recorder.py"
record() {
  echo "$1" >/run/recorder/in
  read -r answer </run/recorder/out
  [ "$answer" = recorded ] || expect "a value is recorded" recorded "$answer"
}

# The kernel's account of what tavrel's units wrote, without the file system's own journal.
written_by_units() {
  sync
  sed -n 's/.* wbytes=\([0-9]*\).*/\1/p' /sys/fs/cgroup/tavrel.slice/io.stat |
    awk '{sum += $1} END {print sum + 0}'
}

tavrelctl allow >/dev/null
expect "permission is given" 0 "$?"
record 5
clock '2037-11-21 00:07'
clock '2037-11-21 01:07'
expect "nothing of the day of the permission is filed" "" "$(logs pending)$(logs outbox)"
record 12
record 4

systemctl set-property --runtime tavrel.slice IOAccounting=yes
# The sampler with a period of a second instead of a minute, and the timer, which needs no sampler.
mkdir -p /run/systemd/system/tavrel-sampler.service.d
printf '[Service]\nExecStart=\nExecStart=/usr/bin/tavrelctl stat collect --every 1\n' \
  >/run/systemd/system/tavrel-sampler.service.d/quick.conf
systemctl daemon-reload && systemctl restart tavrel-sampler.service
sleep 3
used=$(processor)
sleep 20
sample_used=$((($(processor) - used) / 20))
memory=$(cat /sys/fs/cgroup/tavrel.slice/tavrel-sampler.service/memory.current)
rm -r /run/systemd/system/tavrel-sampler.service.d
systemctl daemon-reload && systemctl start tavrel-collect.timer
expect "the timer replaces the sampler" inactive "$(systemctl is-active tavrel-sampler.service)"
systemctl stop tavrel-collect.timer
settle
used=$(processor)
for start in 1 2 3 4; do systemctl start tavrel-collect.service; done
start_used=$((($(processor) - used) / 4))

# The day that is measured: a sample for each minute, the folds, the run and the upload. Its samples
# are counted, so nothing else takes any; their CPU time was measured with the sampler above.
clock '2037-11-22 00:00'
echo "minutes and hours of a day"
writes=$(written) own_writes=$(written_by_units) used=$(processor)
for hour in $hours; do
  clock "2037-11-22 $hour:07"
  for sample in $samples; do
    tavrelctl stat collect --once >/dev/null
  done
  # The kernel and the journal do this themselves some time after a change.
  journalctl --quiet --sync && sync
done
arrived=$(received)
clock '2037-11-23 00:01'
day_writes=$(($(written) - writes)) day_own=$(($(written_by_units) - own_writes))
day_used=$(($(processor) - used))
expect "on the day after, its log is at the server" log-tallied "$arrived"
expect "what the server has of it" "starts 20
seconds [2.0, 6.0, 4.0, 8.0, 2]
seconds {'(-inf, 5]': 1, '(5, inf)': 1}" "$(zcat /srv/tavrel/device-7/*.log.gz | python3 -c '
import plistlib, sys
log = plistlib.loads(sys.stdin.buffer.read())
print("starts", log["BHScalars"]["com.example.starts"])
print("seconds", log["BHDistributions"]["com.example.seconds"])
print("seconds", log["BHDistributionsHistogram"]["com.example.seconds"])')"
expect "nothing waits" "" "$(logs pending)$(logs outbox)"
expect "others see the outbox" 755 "$(stat -c %a /var/mobile/Library/Logs/Submission/outbox)"
record 3
clock '2037-11-23 00:07'
expect "the next day's log is filed" log-tallied "$(logs pending)"
clock '2037-11-23 01:07'
expect "and sent on the same day" "log-tallied
log-tallied" "$(received)"
clock '2037-11-24 00:01'
taken=$(($(echo "$hours" | wc -w) * $(echo "$samples" | wc -w)))
expect "samples of the measured day" "$taken" \
  "$(tavrelctl stat show com.norvane.usage.samples --json | python3 -c '
import json, sys
days = json.load(sys.stdin)["scalar"]["days"]
print(*[day["value"] for day in days if day["date"] == "2037-11-22"])')"
expect "the health of the guest's drive" "nvme0 QEMU NVMe Ctrl good 49850" \
  "$(tavrelctl disks --json | python3 -c '
import json, sys
for disk in json.load(sys.stdin)["disks"]:
    print(disk["name"], disk["model"], disk["verdict"], disk["figures"]["temperature"])')"
systemctl start tavrel-sampler.service
expect "no unit failed" "" "$(systemctl list-units --no-legend --plain --state=failed 'tavrel*')"
note "CPU time of a sample: $sample_used us of the sampler, $start_used us with a start of its \
service, at an instruction a nanosecond"
note "memory of the sampler with its share of the page cache: $memory bytes"
note "CPU time of the other units in $(echo "$hours" | wc -w) hours: $((day_used / 1000)) ms"
note "written in them: $day_own bytes by these units, $day_writes by the whole system"
if [ "$extent" = whole ]; then
  most "CPU time of the day at an instruction a nanosecond, ms" 12000 \
    $(((day_used + 1440 * sample_used) / 1000))
  most "bytes written by these units in the day" 3000000 "$day_own"
fi
