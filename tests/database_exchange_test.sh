#!/usr/bin/env bash
# A database that one program writes is read, verified, edited and purged by another, and what is
# left is read by the first. Each program is a command of one or more words.
#
#   database_exchange_test.sh READER WRITER
#   database_exchange_test.sh READER --golden FOLDER     a database written long ago
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
