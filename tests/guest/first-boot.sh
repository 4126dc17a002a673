#!/bin/sh
# The first start of the guest's system, up to a pulled plug.
#   first-boot.sh PACKAGES LATER-PACKAGES
# shellcheck disable=SC2034 # The parts use the variables.
set -u
here=$(dirname "$0")
packages=$1 later=$2
later_version=$(dpkg-deb -f "$later"/tavrel_*.deb Version)
samples=$(seq 60)
for part in check install server days upgrade; do
  # shellcheck source=/dev/null
  . "$here/$part.sh"
done
checked || exit 1

# The daily run of the next day. The plug is pulled when its log is there and it is still at work.
date --utc --set '2037-11-25 01:10' >/dev/null
until [ -n "$(logs pending)" ]; do :; done
touch /run/job/pull
sleep 60
