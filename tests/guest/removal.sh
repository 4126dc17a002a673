# Removal and purge.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
nginx -s quit 2>/dev/null
apt-get remove -qq -y '*tavrel*' '*brimhold*' >/root/apt.log 2>&1
expect "the packages are removed" 0 "$?"
expect "their units are gone" "" "$(systemctl list-units --no-legend --plain 'tavrel*' |
  grep -v '\.slice')"
expect "the data stays" BHDataStore.sqlitedb "$(ls /var/mobile/Library/Brimhold)"
apt-get purge -qq -y '*tavrel*' '*brimhold*' >>/root/apt.log 2>&1
expect "the packages are purged" 0 "$?"
expect "what is left" "" "$(find / -xdev | sort | comm -13 /root/before - |
  grep -Ev '^/(root|srv/tavrel|var/(log|lib/systemd|lib/dpkg|lib/nginx|cache)|etc/(nginx|tavrel-server|credstore)|tmp|run)(/|$)')"
