#!/usr/bin/env bash
# Configures a preset, and builds all of it or the named targets.
#
#   scripts/build.sh PRESET FOLDER [CMAKE OPTION...] [-- TARGET...]
#
# FOLDER is the name of a folder below build/, or below another folder if build/ cannot be used
# (scripts/lib/build-folder.sh). The last line of the output is its path. A release that is not
# hardened is an error.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

if [ $# -lt 2 ] || [[ $1 == -* || $2 == -* ]]; then
  echo "usage: scripts/build.sh PRESET FOLDER [CMAKE OPTION...] [-- TARGET...]" >&2
  exit 2
fi
preset=$1
folder=$(scripts/lib/build-folder.sh "$2")
shift 2
options=()
while [ $# -gt 0 ] && [ "$1" != -- ]; do
  options+=("$1")
  shift
done
shift "$(($# > 0))"

echo "build: preset $preset in $folder" >&2
cmake --preset "$preset" -B "$folder" "${options[@]}" >/dev/null
cmake --build "$folder" ${1:+--target "$@"} -- --quiet >&2
if [ "$preset" != fuzz ] &&
  grep -qx 'CMAKE_BUILD_TYPE:STRING=RelWithDebInfo' "$folder/CMakeCache.txt"; then
  tests/hardening_test.sh --built "$folder" >&2
fi
echo "$folder"
