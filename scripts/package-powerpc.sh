#!/usr/bin/env bash
# Makes the archive for the appliance, zevooauth-<version>-powerpc.tar.gz in the build folder. It
# has the library, headers, oauthctl and documents, but no stand-ins for the host's libraries.
# Compares what its programs need with platform/powerpc/NEEDS.txt. Then uses the archive under
# emulation, in a root folder that has only the libraries that the archive needs.
# Installs what is missing (scripts/packages.sh, groups build and powerpc), and keeps the libraries
# that it builds for the target (scripts/lib/powerpc-libraries.sh). The same commit gives the same
# archive on every machine.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/package-powerpc.sh" >&2 && exit 2; }

source=$PWD
list=platform/powerpc/NEEDS.txt
sysroot=/usr/powerpc-linux-gnu/lib

fail() {
  echo "package-powerpc: $1" >&2
  exit 1
}

# Check this first, because building takes minutes. The archive is used in another root folder.
user=()
[ "$(id -u)" -eq 0 ] || user=(--user --map-root-user)
unshare "${user[@]}" --mount true ||
  fail 'this machine does not let you make a namespace: run this script as root'

scripts/packages.sh build powerpc
libraries=$(scripts/lib/build-folder.sh powerpc-libraries)
scripts/lib/powerpc-libraries.sh "$libraries"
build=$(scripts/build.sh powerpc-release powerpc-release -DPOWERPC_LIBRARIES="$libraries" | tail -n 1)

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
chmod 755 "$work" # it holds the root folder of a system
umask 022

version=$(sed -n 's/^CMAKE_PROJECT_VERSION:STATIC=//p' "$build/CMakeCache.txt")
read -r mark newest date < <(grep -m 1 '^## ' CHANGELOG.md)
[ "$mark $newest" = "## $version" ] || fail "CHANGELOG.md begins with $newest, this is $version"
SOURCE_DATE_EPOCH=$(date --utc --date "${date//[()]/}" +%s)
name=zevooauth-$version-powerpc
archive=$name.tar.gz

cmake --install "$build" --strip --prefix "$work/$name" >/dev/null
cp "$list" "$work/$name/NEEDS.txt"

# The archive has the expected programs, is hardened, and does not tell where it was made.
cd "$work/$name"
mapfile -t objects < <(LC_ALL=C grep -rlaP '^\x7fELF' . | sort)
[ "${objects[*]}" = "./bin/oauthctl ./lib/libzevooauth.so.$version" ] ||
  fail "programs in the archive: ${objects[*]}"
"$source/tests/hardening_test.sh" --installed . || fail "the archive is not hardened"
places=(-e "$source/" -e "$(dirname "$build")/" -e "$work/")
if grep -rlaF "${places[@]}" .; then
  fail "these files name a folder of this machine"
fi

# FILE: prints the libraries that it needs.
asks_for() {
  readelf --dynamic --wide "$1" | sed -n 's/.*(NEEDED).*\[\(.*\)\]/\1/p'
}

# SONAME: prints the path of the library that is used in place of the appliance's.
find_library() {
  local folder
  for folder in "$libraries/lib" "$sysroot"; do
    [ ! -e "$folder/$1" ] || { echo "$folder/$1" && return; }
  done
  fail "there is no $1"
}

# NAME: prints the version of this library of the target, as pkg-config knows it.
built_against() {
  echo "built against $(PKG_CONFIG_LIBDIR=$libraries/lib/pkgconfig pkg-config --modversion "$1")"
}

# SONAME: prints a note on the origin or the version of the library, if the list has one.
origin() {
  case $1 in
    libzevo*) echo 'brought by the appliance' ;;
    libjsoncpp.*) built_against jsoncpp ;;
    libsmartcols.*) built_against smartcols ;;
    libsqlite3.*)
      sed -n 's/^#define SQLITE_VERSION  *"\(.*\)"/built against \1/p' "$libraries/include/sqlite3.h"
      ;;
  esac
}

# Prints the lines that the list must have, from the programs themselves.
needs() {
  local headers direct indirect library versions
  headers=$(readelf --file-header "${objects[@]}")
  echo "programs $(sed -n 's/^ *\(Class\|Data\|Machine\): *\(.*complement, \)*//p' <<<"$headers" |
    awk '!seen[$0]++' | paste -sd, | sed 's/,/, /g')"
  echo "kernel $(readelf --notes "${objects[@]}" | sed -n 's/.*OS: \(.*\), ABI: /\1 /p' | sort -u)"

  direct=$(for object in "${objects[@]}"; do asks_for "$object"; done | sort -u |
    grep -v '^libzevooauth\.')
  readelf --version-info --wide "${objects[@]}" | awk '
    / File: / { match($0, / File: [^ ]+/); file = substr($0, RSTART + 7, RLENGTH - 7) }
    / Name: .* Version: / { match($0, / Name: [^ ]+/); print file, substr($0, RSTART + 7, RLENGTH - 7) }
  ' | sort --version-sort -u >"$work/versions"
  for library in $direct; do
    # The last version of each family, for example of GLIBCXX, is the newest.
    versions=$(awk -v library="$library" '
      $1 == library { family = $2; sub(/_[0-9.]*$/, "", family); newest[family] = $2 }
      END { for (family in newest) print newest[family] }' "$work/versions" | sort | paste -sd ' ')
    echo "$library ${versions:--} $(origin "$library")"
  done
  # Add what these libraries need themselves. The host brings what its own libraries need.
  indirect=$(for library in $direct; do
    [[ $library == libzevo* ]] || asks_for "$(find_library "$library")"
  done | sort -u | grep -vxF "$direct" || true)
  for library in $indirect; do
    echo "$library - for others of these libraries"
  done
}

needs | sed 's/ $//' >"$work/needs"
if ! diff --unified=0 --label "$list" --label built \
  <(sed '1,/^$/d; s/  */ /g' "$work/$name/NEEDS.txt") "$work/needs" >&2; then
  fail "the built programs do not need what $list says"
fi
echo "package-powerpc: the programs need what $list says"

tar --create --sort=name --mtime="@$SOURCE_DATE_EPOCH" --owner=0 --group=0 --numeric-owner \
  --mode=u=rwX,go=rX --format=gnu --directory "$work" "$name" | gzip -n9 >"$work/$archive"

# This root folder imitates the appliance. It has the archive, the libraries of the list, the
# stand-ins for the host's libraries, and the library that the stand-ins need.
root=$work/root
data=/var/packages/Keyloft/target/etc
mkdir -p "$root/usr" "$root/lib" "$root$data"
tar --extract --file "$work/$archive" --directory "$root/usr" --strip-components=1 --no-same-owner
while read -r library; do
  [[ $library == libzevo* ]] || cp "$(find_library "$library")" "$root/lib/"
done < <(sed -n 's/^\([^ ]*\.so[^ ]*\) .*/\1/p' "$root/usr/NEEDS.txt")
cmake --install "$build" --prefix "$root" --component standins >/dev/null
cp "$(find_library libnettle.so.8)" "$root/lib/"

# Compile a separate program that uses the library.
export PKG_CONFIG_LIBDIR=$root/usr/lib/pkgconfig:$libraries/lib/pkgconfig
mapfile -t options < <(pkg-config --cflags --libs zevooauth | xargs printf '%s\n')
powerpc-linux-gnu-g++ -std=c++17 "$source/tests/install/consumer.cpp" "${options[@]}" \
  "-Wl,-rpath-link,$root/lib" -o "$root/consumer"

cp "$(command -v qemu-ppc-static)" "$root/qemu"
enter=(unshare "${user[@]}" --mount chroot "$root") # this root folder has no /dev/urandom

# STATUS TEXT PROGRAM ARGUMENT...: fails unless the program ends with STATUS and the regular
# expression TEXT matches its whole output.
expect() {
  local status=0 said
  said=$(env --ignore-environment PATH="$PATH" TZ=UTC "${enter[@]}" /qemu "${@:3}" 2>&1) || status=$?
  if [ "$status" -ne "$1" ] || ! [[ $said =~ ^($2)$ ]]; then
    fail "under emulation, ${*:3} ended with $status and said: $said"
  fi
}

secret='[0-9a-f]{64}'
# Run the operator's first commands. The files that they write must be in this root folder.
oauthctl=/usr/bin/oauthctl
expect 0 "oauthctl $version" $oauthctl --version
expect 0 "id +1
client_id +$secret
client_secret +$secret" $oauthctl client add --name 'Photo album' \
  --redirect-uri https://album.example/callback --scope 'read write'
expect 0 'ID NAME        ENABLED REDIRECT URI           SCOPE
 1 Photo album yes     album.example/callback read write' $oauthctl client list
expect 0 'TABLE   ROWS CEILING USED EXPIRED SOONEST EXPIRY LATEST EXPIRY
clients    1    1000  0 %       - -              -
codes      0    1000  0 %       0 -              -
tokens     0    1000  0 %       0 -              -
log        1    1000  0 %       - -              -
.*schema versions oauth_clientInfo 2, oauth_grantCode 2, oauth_token 2' $oauthctl status
expect 0 "sound: $data/oauth.db" $oauthctl check
expect 1 'oauthctl: not valid: no such access token' $oauthctl token verify < <(printf '0%.0s' {1..64})
expect 0 'wrote /backup.db: 1 client, 0 codes, 0 tokens, 1 log line' $oauthctl backup /backup.db
for file in "$root$data/oauth.db" "$root/backup.db"; do
  [ "$(head --bytes 15 "$file")" = 'SQLite format 3' ] || fail "$file is no database"
done
expect 0 'alice 64' /consumer

cd "$(dirname "$build")"
cp "$work/$archive" .
echo "package-powerpc: $PWD/$archive, $(stat --format %s "$archive") bytes," \
  "sha256 $(sha256sum "$archive" | cut -d ' ' -f 1)"
