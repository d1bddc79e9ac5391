#!/usr/bin/env bash
# Configures and builds one preset, all of it or the targets named.
#
#   scripts/build.sh PRESET FOLDER [CMAKE OPTION...] [-- TARGET...]
#
# FOLDER is a name below build/, or another folder (scripts/lib/build-folder.sh). The last line
# tells where it is. A release that is not hardened is an error.
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
