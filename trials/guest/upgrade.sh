# A client of the service, and an upgrade with data that is interrupted and then completed.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
socket=/run/tavrel/com.norvane.tallied.tavrel.socket
expect "the service sleeps" inactive "$(systemctl is-active tavrel.service)"
tavrelctl send force yesterday >/dev/null 2>&1
expect "a client starts it" active "$(systemctl is-active tavrel.service)"
until [ -n "$(logs pending)" ]; do sleep 0.2; done
expect "it files the log of the day" log-tallied "$(logs pending)"
rm "$submission"/pending/*
expect "other users are refused" 1 "$(setpriv --reuid recorder --clear-groups \
  tavrelctl send force yesterday >/dev/null 2>&1; echo $?)"

# An owner who does not want readings of drives.
systemctl disable --quiet --now tavrel-health.timer
exported() { tavrelctl stat export | grep -F com.example. | sort; }
before=$(exported)
expect "there are statistics to keep" 0 "$([ -n "$before" ]; echo $?)"
if [ "$extent" = whole ]; then
  # The second package is being unpacked, and the first is not configured yet.
  : >/root/dpkg.log
  dpkg --unpack "$later"/*.deb >/root/dpkg.log 2>&1 &
  dpkg=$!
  until grep -q '^Unpacking tavrel:* ' /root/dpkg.log; do :; done
  kill -KILL "$dpkg"
  wait "$dpkg" 2>/dev/null
  dpkg --configure -a >>/root/dpkg.log 2>&1
fi
apt-get install -qq -y --no-install-recommends "$later"/*.deb >>/root/apt.log 2>&1
expect "the packages are upgraded" 0 "$?"
expect "their version" "$later_version" "$(dpkg-query -W -f '${Version}\n' tavrel tavrel-statsd \
  tavrel-upload libbrimhold1 python3-brimhold | sort -u)"
expect "all is configured" "" "$(dpkg --audit)"
expect "an upgrade keeps the statistics" "$before" "$(exported)"
expect "what was switched off stays off" disabled,inactive "$({
  systemctl is-enabled tavrel-health.timer
  systemctl is-active tavrel-health.timer
} | paste -sd ,)"
systemctl enable --quiet --now tavrel-health.timer
expect "the timers run on" 5 "$(systemctl list-units --no-legend --plain --state=active \
  'tavrel-*.timer' | wc -l)"
expect "so does the sampler" active "$(systemctl is-active tavrel-sampler.service)"
expect "the service's socket" socket "$(stat -c %F $socket)"
record 7
