#!/usr/bin/env bash
# Runs scripts/test.sh --plain, and the demo in a private /var, in a difficult place: in a copy of
# the checkout below /var, in a home that is closed to other users, at a path with a blank, entered
# through a symbolic link. The sanitizers are left out, because they find the same in every place.
# At the end the script removes the copy and everything built from it.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/test-odd-place.sh" >&2 && exit 2; }

home=$(mktemp --directory /var/tmp/zevooauth-home-XXXXXX) # mktemp gives it mode 0700
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
