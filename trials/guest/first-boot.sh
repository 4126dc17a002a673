#!/bin/sh
# The first start of the guest's system, up to the moment when the plug is pulled.
#   first-boot.sh whole|short PACKAGES LATER-PACKAGES
# shellcheck disable=SC2034,SC2154 # The parts share variables.
set -u
here=$(dirname "$0")
extent=$1 packages=$2 later=$3
later_version=$(dpkg-deb -f "$later"/tavrel_*.deb Version)
if [ "$extent" = whole ]; then
  parts="days away upgrade"
  hours=$(seq -w 0 23) samples=$(seq 60)
else
  parts="days upgrade"
  hours="00 01 12 23" samples="1 2"
fi
for part in check install server $parts; do
  # shellcheck source=/dev/null
  . "$here/$part.sh"
done
checked || exit 1
# shellcheck source=/dev/null
. "$here/power-cut.sh"
