# Every unit with its folders missing, read-only, full, and owned by others. A unit that cannot work
# fails with a status and a line; none is ended by a signal or hangs.
# shellcheck shell=sh disable=SC2034,SC2154 # Variables are shared by the parts.
folders="/var/mobile /var/lib/tavrel /run/tavrel"

outcomes() {
  for unit in collect fold daily health upload; do
    systemctl reset-failed "tavrel-$unit.service" 2>/dev/null
    systemctl start "tavrel-$unit.service" 2>/dev/null
    settle
    echo "$unit $(outcome "tavrel-$unit.service")"
  done
}

all_work="collect success 0
fold success 0
daily success 0
health success 0
upload success 0"

cover() { # OPTIONS OF TMPFS
  for folder in $folders; do mount -t tmpfs -o "$1" none "$folder"; done
}
uncover() {
  for folder in $folders; do umount "$folder"; done
}

systemctl stop tavrel-fold.path tavrel-upload.path tavrel-collect.timer
expect "units with their folders" "$all_work" "$(outcomes)"

for folder in $folders; do mv "$folder" "$folder.kept"; done
expect "units without their folders" "$all_work" "$(outcomes)"
for folder in $folders; do rm -rf "$folder" && mv "$folder.kept" "$folder"; done

cover ro
expect "units with read-only folders" "$all_work" "$(outcomes)"
uncover

cover "uid=65534,gid=65534,mode=700"
expect "units with the folders of others" "$all_work" "$(outcomes)"
uncover

cover "size=64k"
for folder in $folders; do
  mkdir -p "$folder/Library"
  cat /dev/zero >"$folder/full" 2>/dev/null
done
expect "units with full folders" "$all_work" "$(outcomes)"
uncover
expect "units with their folders again" "$all_work" "$(outcomes)"
systemctl start tavrel-fold.path tavrel-upload.path tavrel-collect.timer
