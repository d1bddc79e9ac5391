#!/usr/bin/env bash
# scripts/test.sh --plain, and the demo in a private /var, in the hardest place: in a copy of the
# checkout below /var, in a home that is closed to others, at a path with a blank, entered through a
# symbolic link. The sanitizers see the same in every place. The copy, and what is built from it, is
# removed in the end.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/test-odd-place.sh" >&2 && exit 2; }

home=$(mktemp --directory /var/tmp/zevooauth-home-XXXXXX) # of mode 0700
trap '[ $? -eq 0 ] || echo "test-odd-place: failed" >&2; rm -rf "$home"' EXIT
mkdir "$home/a checkout"
tar --create --exclude=./build --exclude=./.git . | tar --extract --directory "$home/a checkout"
ln -s 'a checkout' "$home/link"
export HOME=$home
unset XDG_CACHE_HOME

cd "$home/link"
scripts/test.sh --plain
demo=$(scripts/build.sh release release -DZEVOOAUTH_BUILD_TESTS=OFF -- lifecycle | tail -n 1)
scripts/lib/private-var.sh "$demo/examples/lifecycle" | tail -n 1
echo "test-odd-place: passed in $home"
