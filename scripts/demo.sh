#!/usr/bin/env bash
# Builds the library and tells the story of examples/lifecycle.cpp on the real database file.
# Installs what is missing (scripts/packages.sh, group build). Makes the database's folder if there
# is none, and the database and the key of the encryption stand-in in it; rows it makes are removed.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/demo.sh" >&2 && exit 2; }

data=/var/packages/Keyloft/target/etc

if ! mkdir -p "$data" 2>/dev/null || [ ! -w "$data" ]; then
  echo "demo: cannot write to $data: run it as root, or as the owner of that folder" >&2
  exit 1
fi
if [ ! -O "$data" ]; then # what root makes there would be closed to the folder's owner
  echo "demo: $data belongs to somebody else: run it as that user" >&2
  exit 1
fi
scripts/packages.sh build
folder=$(scripts/build.sh release release -DZEVOOAUTH_BUILD_TESTS=OFF -- lifecycle | tail -n 1)
umask 077 # the database holds tokens in plain text
"$folder/examples/lifecycle"
