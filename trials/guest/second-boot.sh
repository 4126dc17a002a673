#!/bin/sh
# The start after the plug was pulled.
#   second-boot.sh whole|short
set -u
here=$(dirname "$0")
extent=$1
parts="truth faults removal"
[ "$extent" = whole ] || parts="truth removal"
for part in check $parts; do
  # shellcheck source=/dev/null
  . "$here/$part.sh"
done
checked
