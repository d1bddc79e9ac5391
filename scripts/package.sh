#!/usr/bin/env bash
# Builds the Debian packages and checks them with lintian.
# Installs what is missing (scripts/packages.sh, groups build and package). The same commit gives
# the same packages, byte for byte.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/package.sh" >&2 && exit 2; }

scripts/packages.sh build package
folder=$(scripts/lib/build-folder.sh packages)
rm -rf "$folder"
mkdir -p "$folder"

version=$(sed -nE '1s/.*\((.*)\).*/\1/p' debian/changelog)
if ! grep -qF "project(zevooauth VERSION ${version%%[+~]*} " CMakeLists.txt; then
  echo "package: debian/changelog has version $version, but CMakeLists.txt has another" >&2
  exit 1
fi

# Build in a copy, because the packages are written beside the tree, and the path may have a blank.
work=$(mktemp --directory --tmpdir zevooauth-package-XXXXXX)
trap 'rm -rf "$work"' EXIT
mkdir "$work/zevooauth"
tar --create --exclude=./build --exclude=./.git . | tar --extract --directory "$work/zevooauth"
jobs=$(nproc)
export DEB_BUILD_OPTIONS="noautodbgsym parallel=$jobs"
if ! (cd "$work/zevooauth" &&
  dpkg-buildpackage --build=binary --unsigned-source --unsigned-changes) >"$work/build.log" 2>&1; then
  tail -n 40 "$work/build.log"
  echo "package: could not build the packages" >&2
  exit 1
fi

for package in "$work"/*.deb; do
  dpkg-deb --extract "$package" "$work/installed"
done
if ! { tests/hardening_test.sh --built "$work"/zevooauth/obj-* &&
  tests/hardening_test.sh --installed "$work/installed"; }; then
  echo "package: the packages are not hardened" >&2
  exit 1
fi

cp "$work"/zevooauth_* "$work"/*.deb "$folder"
cd "$folder"
if ! lintian --allow-root --fail-on error,warning --info ./*.changes; then
  echo "package: lintian finds an error or a warning in the packages" >&2
  exit 1
fi
ls -l --human-readable ./*.deb
echo "package: four packages in $folder, and lintian has no error and no warning"
