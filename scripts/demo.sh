#!/usr/bin/env bash
# Builds the library and runs examples/lifecycle.cpp on the real database file.
# Installs what is missing (scripts/packages.sh, group build). Makes the database's folder, the
# database and the key of the encryption stand-in if they are missing. Removes the rows it adds.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/demo.sh" >&2 && exit 2; }

data=/var/packages/Keyloft/target/etc

if ! mkdir -p "$data" 2>/dev/null || [ ! -w "$data" ]; then
  echo "demo: cannot write to $data: run this script as root, or as the owner of that folder" >&2
  exit 1
fi
if [ ! -O "$data" ]; then # the folder's owner could not open the files that root makes
  echo "demo: $data belongs to another user: run this script as that user" >&2
  exit 1
fi
scripts/packages.sh build
folder=$(scripts/build.sh release release -DZEVOOAUTH_BUILD_TESTS=OFF -- lifecycle | tail -n 1)
umask 077 # the database holds tokens in plain text
"$folder/examples/lifecycle"
