#!/usr/bin/env bash
# Runs the test programs of a build, with the tests of each program in any order.
#
#   scripts/lib/run-test-programs.sh FOLDER PROCESSES [COMMAND...]
#
# FOLDER has the build. The tests of a program are divided among this number of processes. COMMAND,
# for example an emulator, starts each of them.
set -euo pipefail

if [ $# -lt 2 ]; then
  echo "usage: scripts/lib/run-test-programs.sh FOLDER PROCESSES [COMMAND...]" >&2
  exit 2
fi
cd "$1"
export shards=$2
shift 2

run_shard() { # [COMMAND...] PROGRAM SHARD: prints the program's output only if it fails
  local log=${*: -2:1}.${*: -1}.log
  GTEST_SHARD_INDEX=${*: -1} GTEST_TOTAL_SHARDS=$shards timeout 1200 "${@:1:$#-1}" \
    --gtest_shuffle --gtest_brief=1 >"$log" 2>&1 || { cat "$log" && return 1; }
}
export -f run_shard

alone=tests/contention_test # this program starts many processes itself
for program in tests/*_test; do
  [ "$program" != "$alone" ] || continue
  for ((shard = 0; shard < shards; ++shard)); do
    printf '%s\0' "$program" "$shard"
  done
done | xargs --null --max-procs=$((3 * $(nproc))) --max-args=2 \
  bash -euo pipefail -c 'run_shard "$@"' run-shard "$@"
shards=1 run_shard "$@" "$alone" 0
