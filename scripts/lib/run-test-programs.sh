#!/usr/bin/env bash
# Runs the test programs of a build, each in as many processes as there are cores, its tests in any
# order.
#
#   scripts/lib/run-test-programs.sh FOLDER [COMMAND...]
#
# FOLDER holds the build. COMMAND, such as an emulator, starts each program.
set -euo pipefail

if [ $# -eq 0 ]; then
  echo "usage: scripts/lib/run-test-programs.sh FOLDER [COMMAND...]" >&2
  exit 2
fi
cd "$1"
shift
export shards
shards=$(nproc)

run_shard() { # [COMMAND...] PROGRAM SHARD: says what the program said only if it fails
  local log=${*: -2:1}.${*: -1}.log
  GTEST_SHARD_INDEX=${*: -1} GTEST_TOTAL_SHARDS=$shards timeout 1200 "${@:1:$#-1}" \
    --gtest_shuffle --gtest_brief=1 >"$log" 2>&1 || { cat "$log" && return 1; }
}
export -f run_shard

alone=tests/contention_test # starts many processes itself
for program in tests/*_test; do
  [ "$program" != "$alone" ] || continue
  for ((shard = 0; shard < shards; ++shard)); do
    printf '%s\0' "$program" "$shard"
  done
done | xargs --null --max-procs=$((3 * shards)) --max-args=2 \
  bash -euo pipefail -c 'run_shard "$@"' run-shard "$@"
shards=1 run_shard "$@" "$alone" 0
