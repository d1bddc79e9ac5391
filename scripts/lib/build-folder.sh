#!/usr/bin/env bash
# Makes the folder NAME below build/ and prints its path. If the checkout belongs to another user,
# or if its path has a blank, at which some tools split it, the folder is made in the user's cache
# folder instead, or in /tmp if there is no cache folder.
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
  # Nobody else may own a folder from which programs are run.
  if usable "$root" "$1" && { [ "$root" = "$own" ] || { [ -O "$root" ] && [ ! -L "$root" ]; }; }; then
    mkdir -p "$root/$1"
    echo "$root/$1"
    exit
  fi
done
echo "build-folder: $root belongs to somebody else" >&2
exit 1
