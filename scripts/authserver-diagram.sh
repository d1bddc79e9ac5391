#!/usr/bin/env bash
# Draws docs/authserver-login.svg from docs/authserver-login.msc.
#
#   scripts/authserver-diagram.sh             renews the drawing
#   scripts/authserver-diagram.sh --check     only checks that it is current
#
# Installs what is missing (scripts/packages.sh, group drawings).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

case $#:${1-} in
  0: | 1:--check) ;;
  *)
    echo "usage: scripts/authserver-diagram.sh [--check]" >&2
    exit 2
    ;;
esac

drawing=docs/authserver-login.svg
scripts/packages.sh drawings
# Calls of the library are blue. The background is white, also on a dark page.
new=$(sed -E 's/(=> store \[label = "[^"]*")/\1, linecolour = "#0b57a4", textcolour = "#0b57a4"/' \
  docs/authserver-login.msc | mscgen -T svg -i - -o - |
  sed -E '0,/^<polygon/s//<rect width="100%" height="100%" fill="white"\/>\n<polygon/' |
  perl -pe 's/(<text x="\d+" y=")(\d+)/$1 . ($2 - 4)/e') # moves each text up, away from its arrow

if [ "${1-}" = --check ]; then
  if [ "$new" != "$(<"$drawing")" ]; then
    echo "authserver-diagram: $drawing is not current, run scripts/authserver-diagram.sh" >&2
    exit 1
  fi
  echo "authserver-diagram: $drawing is current"
else
  printf '%s\n' "$new" >"$drawing"
  echo "authserver-diagram: drew $drawing"
fi
