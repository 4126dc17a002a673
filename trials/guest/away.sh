# A server that is unreachable, a clock set back, and the server's return.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
nginx -s quit 2>/dev/null
clock '2037-11-24 00:07'
systemctl restart tavrel-upload.service
settle
expect "an upload without the server" "success 75" "$(outcome tavrel-upload.service)"
expect "the log waits" log-tallied "$(logs pending)$(logs outbox)"

# A service that waits for its next attempt blocks the units that start it.
systemctl stop tavrel-upload.service 2>/dev/null
clock '2037-11-22 12:00'
systemctl start tavrel-daily.service
expect "a run with the clock set back" "success 0" "$(outcome tavrel-daily.service)"
expect "it files nothing" log-tallied "$(logs pending)$(logs outbox)"
expect "the clock is reported" "WARNING clock: today is day 24797 (2037-11-22), and day 24798 \
(2037-11-23) was already reported: the clock was set back, and no run comes before then" \
  "$(tavrelctl status --check | grep ' clock: ')"

nginx
clock '2037-11-24 05:00'
systemctl restart tavrel-upload.service
settle
expect "an upload with the server again" "success 0" "$(outcome tavrel-upload.service)"
expect "each day's log is there once" "log-tallied
log-tallied
log-tallied" "$(received)"
expect "nothing waits then" "" "$(logs pending)$(logs outbox)"
