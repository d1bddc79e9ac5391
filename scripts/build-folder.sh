#!/usr/bin/env bash
# Makes the folder of that name below build/ and prints its path; where the checkout belongs to
# somebody else it lies in the user's own cache folder instead, or in /tmp if there is none.
#
#   scripts/build-folder.sh NAME
set -euo pipefail
cd "$(dirname "$0")/.."

root=$PWD/build
if ! mkdir -p "$root" 2>/dev/null || [ ! -w "$root" ] ||
  { [ -e "$root/$1" ] && [ ! -w "$root/$1" ]; }; then
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
mkdir -p "$root/$1"
echo "$root/$1"
