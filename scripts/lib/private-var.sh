#!/usr/bin/env bash
# Runs a command in a private /var, so that the library's fixed database path is private and empty.
#
#   scripts/lib/private-var.sh COMMAND...
#
# The private /var is in memory, and only the command and its children see it. It has the database's
# folder and /var/tmp, and this checkout and its build folder if they lie below /var. It disappears
# when the last of these processes ends. Needs root, or a kernel that lets users make namespaces.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/../.."

user=()
[ "$(id -u)" -eq 0 ] || user=(--user --map-root-user)
if ! unshare "${user[@]}" --mount true; then
  echo "private-var: this machine does not let you make a namespace: run this script as root" >&2
  exit 1
fi
build=$(scripts/lib/build-folder.sh release)
kept=()
for folder in "$PWD" "${build%/*}"; do
  [[ $folder/ != /var/* ]] || kept+=("$folder")
done

# The new /var is made in another place first, because it takes over folders of the old one.
# shellcheck disable=SC2016 # the inner shell expands these
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
