# A server that receives logs: nginx in the guest, with the documented configuration.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
# Later than the day of the build, which the programs take for the earliest possible day.
clock '2037-11-20 22:40'
server=/etc/tavrel-server
mkdir -p "$server" /srv/tavrel/.unfinished /etc/credstore /etc/tavrel
chown www-data: /srv/tavrel /srv/tavrel/.unfinished
certificate() { # NAME SUBJECT [ARGUMENT...]
  name=$1 subject=$2
  shift 2
  openssl req -x509 -days 30 -nodes -newkey ec -pkeyopt ec_paramgen_curve:P-256 -subj "$subject" \
    -keyout "$server/$name.key" -out "$server/$name.crt" "$@" 2>/dev/null
}
certificate authority /CN=authority
by="-CA $server/authority.crt -CAkey $server/authority.key
  -addext basicConstraints=critical,CA:FALSE"
# shellcheck disable=SC2086
certificate server /CN=logs.example.com $by -addext subjectAltName=DNS:logs.example.com
# shellcheck disable=SC2086
certificate device /CN=device-7 $by
cp "$server/authority.crt" "$server/devices-authority.crt"
cp "$server/authority.crt" /etc/credstore/tavrel-upload.authority
cp "$server/device.crt" /etc/credstore/tavrel-upload.certificate
cp "$server/device.key" /etc/credstore/tavrel-upload.key
cp "$here/../../docs/examples/upload/nginx.conf" /etc/nginx/conf.d/tavrel-upload.conf
echo "$address logs.example.com" >>/etc/hosts
connect
nginx

cat >/etc/tavrel/upload.plist <<'PLIST'
<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0">
<dict>
	<key>URL</key>
	<string>https://logs.example.com/logs</string>
</dict>
</plist>
PLIST
received() {
  (cd /srv/tavrel/device-7 2>/dev/null && ls) | sed -n 's/^\(log-[a-z]*\)-.*\.log\.gz$/\1/p'
}
