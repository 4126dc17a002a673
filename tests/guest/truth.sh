# What the tool says after the plug was pulled, and that the next run makes up for it.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
day_done() {
  tavrelctl prefs get com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970
}
expect "the day is not done" 20781 "$(day_done)"
said=$(tavrelctl status --check)
expect "status --check sees the unfinished run" 1 "$?"
echo "$said" | sed 's/^/         /'
expect "the store is sound" ok "$(python3 -c '
import sqlite3
store = sqlite3.connect("/var/mobile/Library/Brimhold/BHDataStore.sqlitedb")
print(*store.execute("PRAGMA integrity_check").fetchone())')"
systemctl start tavrel-daily.service
expect "the next run ends the day" 20782 "$(day_done)"
expect "status --check after it" 0 "$(tavrelctl status --check >/dev/null; echo $?)"
