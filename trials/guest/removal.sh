# Removal and purge.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
nginx -s quit 2>/dev/null
mkdir -p "$submission/outbox"
: >"$submission/outbox/log-tallied-20371125T000000Z-00000000.log"
systemctl restart tavrel-upload.service
settle
expect "an upload waits for its next attempt" activating \
  "$(systemctl is-active tavrel-upload.service)"
apt-get remove -qq -y tavrel-upload >/root/apt.log 2>&1
expect "the package that sends is removed" 0 "$?"
expect "nothing sends any more" inactive "$(systemctl is-active tavrel-upload.service)"
: >/var/mobile/Library/Preferences/.tavrel-0123abcd.tmp
apt-get remove -qq -y '*tavrel*' '*brimhold*' >>/root/apt.log 2>&1
expect "the packages are removed" 0 "$?"
expect "their units are gone" "" "$(systemctl list-units --no-legend --plain 'tavrel*' |
  grep -v '\.slice')"
expect "the data stays" BHDataStore.sqlitedb \
  "$(find /var/mobile/Library/Brimhold -name '*.sqlitedb' -printf '%f')"
# shellcheck disable=SC2046
apt-get purge -qq -y $(dpkg-query -W -f '${db:Status-Abbrev}${Package}\n' '*tavrel*' |
  sed -n 's/^rc *//p') >>/root/apt.log 2>&1
expect "the packages are purged" 0 "$?"
# What others wrote stays: the maker's whitelist, the server's name, the permission. Anything else
# that has appeared since the installation belongs to the test, or to apt, dpkg and useradd.
expect "what is left" "/Library
/Library/Application Support
/Library/Application Support/Brimhold
/Library/Application Support/Brimhold/Whitelist_Pellio.plist
/etc/tavrel
/etc/tavrel/upload.plist
/var/mobile
/var/mobile/Library
/var/mobile/Library/Preferences
/var/mobile/Library/Preferences/.lock
/var/mobile/Library/Preferences/com.norvane.zentrix.plist" \
  "$(find / -xdev | sort | comm -13 /root/before - | grep -Ev '^/(root|srv/tavrel|var/(log|lib/systemd|lib/dpkg|lib/apt|lib/nginx|cache)|etc/(nginx|tavrel-server|credstore|sub[gu]id-)|tmp|run)(/|$)')"
