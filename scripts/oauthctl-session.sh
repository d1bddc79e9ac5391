#!/usr/bin/env bash
# Runs the commands that docs/oauthctl.md shows, and writes their real output into the page.
#
#   scripts/oauthctl-session.sh                               renews the page
#   scripts/oauthctl-session.sh --check [FOLDER [EMULATOR...]]  only checks that it is current
#
# In the console blocks of the page, the script runs the lines that begin with "$ ", and replaces
# the lines after them. It also runs comments that begin with "session:", and hides their output.
# FOLDER has the test programs. If no FOLDER is given, the script builds them. The clock stands
# still, and random values are replaced by others that stay the same.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

check=
if [ "${1-}" = --check ]; then
  check=yes
  shift
elif [ $# -gt 0 ]; then
  echo "usage: scripts/oauthctl-session.sh [--check [FOLDER [EMULATOR...]]]" >&2
  exit 2
fi
if [ $# -eq 0 ]; then
  scripts/packages.sh build test
  set -- "$(scripts/build.sh dev dev -- oauthctl_in_folder oauthctl_issue | tail -n 1)/tests/oauthctl"
fi
programs=$1
emulator=("${@:2}")
page=$PWD/docs/oauthctl.md

folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
mkdir -m 700 "$folder/etc" "$folder/home"
export OAUTHCTL_FOLDER=$folder/etc TZ=UTC
OAUTHCTL_NOW=$(date -u -d '2026-11-21 09:30' +%s)
export OAUTHCTL_NOW

# shellcheck disable=SC2317 # the commands of the page call it
oauthctl() { "${emulator[@]}" "$programs/oauthctl_in_folder" "$@"; }
# shellcheck disable=SC2317
issue() { "${emulator[@]}" "$programs/oauthctl_issue" "$@"; }

declare -A stable=()
# Prints the output with the paths of a real machine. Each random value becomes the digest of its
# number in the page, also where only the beginning of a secret is shown.
steady() {
  local text value
  text=$(sed "s|$folder/etc|/var/packages/Keyloft/target/etc|g" "$folder/output")
  while read -r value; do
    [ -n "${stable[$value]-}" ] ||
      stable[$value]=$(printf 'value %d' "${#stable[@]}" | sha256sum | cut -c 1-64)
  done < <(grep -oE '\b[0-9a-f]{64}\b' <<<"$text")
  for value in "${!stable[@]}"; do
    text=${text//$value/${stable[$value]}}
    text=${text//client_secret ${value:0:4}.../client_secret ${stable[$value]:0:4}...}
  done
  [ -z "$text" ] || printf '%s\n' "$text"
}

status=0
run() { # COMMAND: runs it in the operator's home, and writes its output to $folder/output
  local before=$status
  set +e
  (
    cd "$folder/home" || exit
    umask 077
    (exit "$before")
    eval "$1"
  ) </dev/null >"$folder/output" 2>&1
  status=$?
  set -e
}

block=
while IFS= read -r line; do
  case $block$line in
    '```console') block=console ;;
    'console```') block= ;;
    'console$ '*)
      printf '%s\n' "$line"
      command=${line#??}
      while [[ $line == *\\ ]] && IFS= read -r line; do
        printf '%s\n' "$line"
        command+=$'\n'$line
      done
      run "$command"
      steady
      continue
      ;;
    console*) continue ;; # the output of an earlier run
    '<!-- session: '*)
      command=${line#'<!-- session: '}
      run "${command%' -->'}"
      if [ "$status" -ne 0 ]; then
        echo "oauthctl-session: failed: $command: $(<"$folder/output")" >&2
        exit 1
      fi
      ;;
  esac
  printf '%s\n' "$line"
done <"$page" >"$folder/page"

if cmp --silent "$page" "$folder/page"; then
  echo "oauthctl-session: docs/oauthctl.md is current"
elif [ -n "$check" ]; then
  diff -u "$page" "$folder/page" >&2 || true
  echo "oauthctl-session: docs/oauthctl.md is not current, run scripts/oauthctl-session.sh" >&2
  exit 1
else
  cp "$folder/page" "$page"
  echo "oauthctl-session: docs/oauthctl.md is renewed"
fi
