# A client of the service, an upgrade with data, and a run in whose middle the plug is pulled.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
socket=/run/tavrel/com.norvane.tallied.tavrel.socket
expect "the service sleeps" inactive "$(systemctl is-active tavrel.service)"
tavrelctl send force yesterday
expect "a client starts it" active "$(systemctl is-active tavrel.service)"
expect "other users are refused" 1 "$(setpriv --reuid recorder --clear-groups \
  tavrelctl send force yesterday >/dev/null 2>&1; echo $?)"

before=$(tavrelctl stat export | sort | sha256sum)
apt-get install -qq -y --no-install-recommends "$later"/*.deb >>/root/apt.log 2>&1
expect "the packages are upgraded" 0 "$?"
expect "their version" "$later_version" "$(dpkg-query -W -f '${Version}' tavrel)"
expect "an upgrade keeps the statistics" "$before" "$(tavrelctl stat export | sort | sha256sum)"
expect "the timers run on" 5 "$(systemctl list-units --no-legend --plain --state=active \
  'tavrel-*.timer' | wc -l)"
expect "the service's socket" socket "$(stat -c %F $socket)"
record 7
