#!/usr/bin/env bash
# Runs the test programs of a build, with the tests of each program in any order. Each program runs
# in as many processes as there are cores, except one that starts many processes itself.
#
#   scripts/lib/run-test-programs.sh FOLDER [COMMAND...]
#
# FOLDER has the build. COMMAND, for example an emulator, starts each program.
set -euo pipefail

if [ $# -eq 0 ]; then
  echo "usage: scripts/lib/run-test-programs.sh FOLDER [COMMAND...]" >&2
  exit 2
fi
cd "$1"
shift
export shards
shards=$(nproc)

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
done | xargs --null --max-procs=$((3 * shards)) --max-args=2 \
  bash -euo pipefail -c 'run_shard "$@"' run-shard "$@"
shards=1 run_shard "$@" "$alone" 0
