#!/usr/bin/env bash
# Tells where what is built under this name lies.
#
#   scripts/build-folder.sh NAME
#
# That is below build/; where the checkout belongs to somebody else, in the user's own cache folder
# instead, or in /tmp if there is none.
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
    echo "build-folder: $root belongs to somebody else" >&2
    exit 1
  fi
fi
echo "$root/$1"
