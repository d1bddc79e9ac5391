#!/usr/bin/env bash
# One program writes a database. Another one reads, verifies, edits and purges it. Then the first
# one reads what is left. Each program is a command of one or more words.
#
#   database_exchange_test.sh READER WRITER
#   database_exchange_test.sh READER --golden FOLDER     reads a database that was written earlier
set -euo pipefail

read -ra reader <<<"$1"
folder=$(mktemp --directory --tmpdir zevooauth-exchange-XXXXXX)
trap 'rm -rf "$folder"' EXIT

if [ "$2" = --golden ]; then
  cp "$3"/oauth.db "$3"/zevocore.key "$folder"
  writer=("${reader[@]}")
else
  read -ra writer <<<"$2"
  "${writer[@]}" write "$folder"
fi
"${reader[@]}" check "$folder"
"${reader[@]}" change "$folder"
"${writer[@]}" changed "$folder"
echo "database exchange: read, verified, edited, purged and read again"
