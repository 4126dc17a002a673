# What the tool reports after the plug was pulled, and that the next run makes up for it.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
day_done() {
  tavrelctl prefs get com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970
}
expect "the log of the run that was cut off is whole" "24799 (2037-11-24)" \
  "$(tavrelctl log show latest | sed -n 's/^Day *//p')"
most "the day is not done" 24798 "$(day_done)"
tavrelctl status --check >/root/status
expect "status --check sees the unfinished run" 1 "$?"
expect "what it says of it" "WARNING last-run: the daily run of day 24799 (2037-11-24), begun AGO, \
was killed before its end; the last one to finish a day ended AGO" \
  "$(sed -n 's/ [0-9]* \(s\|min\|h\) ago/ AGO/g; / last-run: /p' /root/status)"
expect "the store is sound" ok "$(python3 -c '
import sqlite3
store = sqlite3.connect("/var/mobile/Library/Brimhold/BHDataStore.sqlitedb")
print(*store.execute("PRAGMA integrity_check").fetchone())')"
expect "a run is due again without a midnight" 10min \
  "$(systemctl show -P TimersMonotonic tavrel-daily.timer | sed -n 's/.*OnBootUSec=\([^ ]*\) .*/\1/p')"
systemctl start tavrel-daily.service
settle
expect "that run ends the day" 24799 "$(day_done)"
# A day that is not done is repeated as a whole.
expect "the day has a second log" "log-tallied
log-tallied" "$(logs pending)"
expect "nothing is critical after it" "" "$(tavrelctl status --check | grep -E '^(CRITICAL|UNKNOWN)')"
