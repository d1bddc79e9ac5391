#!/usr/bin/env bash
# Tests the packages in bare Debian 12 systems, which it makes in the build folder. Builds the
# packages twice, and both builds must be the same byte for byte. Installs, uses, upgrades and
# removes them.
# Must run as root. Installs what is missing (scripts/packages.sh, group bare). Everything else is
# installed in those systems, and their downloads are kept for the next time.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/test-package.sh" >&2 && exit 2; }

if [ "$(id -u)" -ne 0 ]; then
  echo "test-package: run this script as root, because it makes bare systems" >&2
  exit 1
fi
if ! unshare --mount --pid --fork --mount-proc true; then
  echo "test-package: this machine does not let root make a namespace" >&2
  exit 1
fi
trap '[ $? -eq 0 ] || echo "test-package: failed" >&2' EXIT
scripts/packages.sh bare
folder=$(scripts/lib/build-folder.sh test-package)

within() { # ROOT COMMAND...: runs it without this machine's environment and processes
  local root=$folder/$1
  shift
  unshare --mount --pid --fork --mount-proc --root="$root" env --ignore-environment \
    HOME=/root PATH=/usr/sbin:/usr/bin:/sbin:/bin LC_ALL=C.UTF-8 DEBIAN_FRONTEND=noninteractive "$@"
}

quietly() { # COMMAND...: prints its output only if it fails
  "$@" >"$folder/log" 2>&1 || {
    local code=$?
    cat "$folder/log"
    return "$code"
  }
}

fresh() { # ROOT: makes a bare system of this name
  rm -rf "${folder:?}/$1"
  cp -a "$folder/bare" "$folder/$1"
  cp /etc/resolv.conf "$folder/$1/etc/"
}

keep_downloads() { # ROOT
  cp -u "$folder/$1"/var/cache/apt/archives/*.deb "$folder/bare/var/cache/apt/archives/"
}

if [ ! -e "$folder/bare.done" ]; then
  rm -rf "$folder/bare"
  # shellcheck disable=SC2016 # apt-get expands this itself
  mirror=$(apt-get indextargets --format '$(REPO_URI)' 'Created-By: Packages' 'Origin: Debian' \
    'Codename: bookworm' | sort -u | head -n 1)
  quietly debootstrap --variant=minbase bookworm "$folder/bare" "$mirror"
  cp /etc/resolv.conf "$folder/bare/etc/"
  echo 'Dpkg::Use-Pty "0";' >"$folder/bare/etc/apt/apt.conf.d/no-terminal"
  within bare apt-get -qq update
  touch "$folder/bare.done"
fi
echo "test-package: a bare Debian 12 is ready"

# Build the same commit twice, in different places and with different settings of the user.
fresh build
mkdir "$folder/build/first"
tar --create --exclude=./build --exclude=./.git . | tar --extract --directory "$folder/build/first"
cp -a "$folder/build/first" "$folder/build/srv/second one"
quietly within build /first/scripts/package.sh
tail -n 5 "$folder/log"
keep_downloads build
(
  umask 077
  quietly within build env TZ=Asia/Tokyo LC_ALL=C HOME=/tmp "/srv/second one/scripts/package.sh"
)
version=$(sed -nE '1s/.*\((.*)\).*/\1/p' debian/changelog)
# The second checkout has a blank in its path, so its packages are in the cache folder.
second=$(echo "$folder"/build/tmp/.cache/zevooauth-*/packages)
for package in libzevooauth1 libzevooauth-dev oauthctl zevooauth-standins; do
  cmp "$folder"/{build/first/build/packages,"${second#"$folder/"}"}/"${package}_${version}"_*.deb
done
echo "test-package: two builds of one commit are the same, byte for byte"

# The next version has the same files and another number.
mkdir "$folder/build/packages"
for package in "$folder"/build/first/build/packages/*.deb; do
  cp "$package" "$folder/build/packages"
  dpkg-deb --raw-extract "$package" "$folder/build/next"
  sed -i -E "/^(Version|Depends):/s/$version/$version+next/g" "$folder/build/next/DEBIAN/control"
  dpkg-deb --build "$folder/build/next" "$folder/build/packages" >/dev/null
  rm -r "$folder/build/next"
done

fresh use
mkdir -p "$folder/use/packages/new"
cp "$folder"/build/packages/*.deb "$folder/use/packages"
mv "$folder"/use/packages/*+next_* "$folder/use/packages/new"
cp -r tests/install README.md tests/packages_in_use.sh "$folder/use/packages"
within use /packages/packages_in_use.sh "$version"
keep_downloads use
rm -rf "$folder/build" "$folder/use"
echo "test-package: passed: built twice alike, installed, used, upgraded and removed"
