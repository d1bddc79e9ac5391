#!/usr/bin/env bash
# Runs a command where the library's fixed database path is private and empty.
#
#   scripts/lib/private-var.sh COMMAND...
#
# Only the command and its children see the empty /var in memory, with the database's folder in it
# and, if they lie there, this checkout and its build folder. It is gone when the last of them ends.
# Needs root, or a kernel that lets users make namespaces.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/../.."

user=()
[ "$(id -u)" -eq 0 ] || user=(--user --map-root-user)
if ! unshare "${user[@]}" --mount true; then
  echo "private-var: this machine does not let you make a namespace: run it as root" >&2
  exit 1
fi
build=$(scripts/lib/build-folder.sh release)
kept=()
for folder in "$PWD" "${build%/*}"; do
  [[ $folder/ != /var/* ]] || kept+=("$folder")
done

# The new /var is made elsewhere, as long as what it takes over from the old one can be seen.
# shellcheck disable=SC2016 # expanded inside
exec unshare "${user[@]}" --mount bash -c '
  set -euo pipefail
  new=$(mktemp --directory /tmp/authserver-var-XXXXXX)
  trap "umount --recursive \"$new\" 2>/dev/null || true; rmdir \"$new\"" EXIT
  mount -t tmpfs -o mode=755 authserver "$new"
  (
    umask 022
    mkdir -m 1777 "$new/tmp"
    mkdir -p -m 700 "$new/packages/Keyloft/target/etc"
    while [ "$1" != -- ]; do
      mkdir -p "$new${1#/var}"
      mount --rbind "$1" "$new${1#/var}"
      shift
    done
  )
  while [ "$1" != -- ]; do shift; done
  shift
  mount --no-mtab --move "$new" /var
  rmdir "$new"
  trap - EXIT
  cd "$PWD"
  exec "$@"' private-var "${kept[@]}" -- "$@"
