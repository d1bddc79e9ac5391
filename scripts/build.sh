#!/usr/bin/env bash
# Configures and builds one preset, all of it or the targets named.
#
#   scripts/build.sh PRESET FOLDER [CMAKE OPTION...] [-- TARGET...]
#
# FOLDER is a name below build/; where the checkout belongs to somebody else it lies in the user's
# own cache folder instead, or in /tmp if there is none. The last line tells where.
set -euo pipefail
cd "$(dirname "$0")/.."

preset=$1 folder=$2
shift 2
options=()
while [ $# -gt 0 ] && [ "$1" != -- ]; do
  options+=("$1")
  shift
done
shift "$(($# > 0))"
root=$PWD/build
if ! mkdir -p "$root" 2>/dev/null || [ ! -w "$root" ] ||
  { [ -e "$root/$folder" ] && [ ! -w "$root/$folder" ]; }; then
  root=${XDG_CACHE_HOME:-${HOME:-/nonexistent}/.cache}/zevooauth-$(cksum <<<"$PWD" | cut -d ' ' -f 1)
  if ! mkdir -p "$root" 2>/dev/null; then
    root=/tmp/zevooauth-build-$(id -u)
    [ -d "$root" ] || mkdir -m 700 "$root"
  fi
  if [ ! -O "$root" ]; then
    echo "build: $root belongs to somebody else" >&2
    exit 1
  fi
fi

echo "build: preset $preset in $root/$folder" >&2
cmake --preset "$preset" -B "$root/$folder" "${options[@]}" >/dev/null
cmake --build "$root/$folder" ${1:+--target "$@"} -- --quiet >&2
echo "$root/$folder"
