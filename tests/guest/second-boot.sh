#!/bin/sh
# The start after the pulled plug.
set -u
here=$(dirname "$0")
for part in check truth faults removal; do
  # shellcheck source=/dev/null
  . "$here/$part.sh"
done
checked
