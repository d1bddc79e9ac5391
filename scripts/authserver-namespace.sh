#!/usr/bin/env bash
# Runs a command where the library's fixed database path is private and empty.
#
#   scripts/authserver-namespace.sh COMMAND...
#
# Only the command and its children see the empty /var in memory, with the database's folder in it;
# it is gone when the last of them ends. Needs root, or a kernel that lets users make namespaces.
set -euo pipefail

if [[ $PWD/ == /var/* ]]; then
  echo "authserver-namespace: $PWD would be hidden, work outside /var" >&2
  exit 1
fi
user=()
[ "$(id -u)" -eq 0 ] || user=(--user --map-root-user)
# shellcheck disable=SC2016 # expanded inside
exec unshare "${user[@]}" --mount bash -c '
  set -euo pipefail
  mount -t tmpfs -o mode=755 authserver /var
  mkdir -m 1777 /var/tmp
  mkdir -p -m 700 /var/packages/Keyloft/target/etc
  exec "$@"' authserver-namespace "$@"
