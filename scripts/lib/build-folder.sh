#!/usr/bin/env bash
# Makes the folder of that name below build/ and prints its path. Where the checkout belongs to
# somebody else, or its path has a blank, which some tools split at, it lies in the user's own cache
# folder instead, or in /tmp if there is none.
#
#   scripts/lib/build-folder.sh NAME
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/../.."

usable() { # ROOT NAME
  [[ $1 != *[[:space:]]* ]] && mkdir -p "$1" 2>/dev/null && [ -w "$1" ] &&
    { [ ! -e "$1/$2" ] || [ -w "$1/$2" ]; }
}

checkout=$(cksum <<<"$PWD" | cut -d ' ' -f 1)
cache=${XDG_CACHE_HOME:-${HOME:-/nonexistent}/.cache}/zevooauth-$checkout
own=$(realpath --canonicalize-missing build)
for root in "$own" "$(realpath --canonicalize-missing "$cache")" "/tmp/zevooauth-$(id -u)-$checkout"; do
  # What others may have made is no place to run programs from.
  if usable "$root" "$1" && { [ "$root" = "$own" ] || { [ -O "$root" ] && [ ! -L "$root" ]; }; }; then
    mkdir -p "$root/$1"
    echo "$root/$1"
    exit
  fi
done
echo "build-folder: $root belongs to somebody else" >&2
exit 1
