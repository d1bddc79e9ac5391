#!/usr/bin/env bash
# Makes the folder of that name below build/ and prints its path. Where the checkout belongs to
# somebody else, or its path has a blank, which some tools split at, it lies in the user's own cache
# folder instead, or in /tmp if there is none.
#
#   scripts/build-folder.sh NAME
set -euo pipefail
cd "$(dirname "$0")/.."

usable() { # ROOT NAME
  [[ $1 != *[[:space:]]* ]] && mkdir -p "$1" 2>/dev/null && [ -w "$1" ] &&
    { [ ! -e "$1/$2" ] || [ -w "$1/$2" ]; }
}

root=$PWD/build
if ! usable "$root" "$1"; then
  root=${XDG_CACHE_HOME:-${HOME:-/nonexistent}/.cache}/zevooauth-$(cksum <<<"$PWD" | cut -d ' ' -f 1)
  if ! usable "$root" "$1"; then
    root=/tmp/zevooauth-build-$(id -u)
    [ -d "$root" ] || mkdir -m 700 "$root"
  fi
  if [ ! -O "$root" ]; then
    echo "build-folder: $root belongs to somebody else" >&2
    exit 1
  fi
fi
mkdir -p "$root/$1"
echo "$root/$1"
