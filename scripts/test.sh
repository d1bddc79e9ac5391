#!/usr/bin/env bash
# Builds and runs the tests.
#
#   scripts/test.sh           runs all tests, plain and under the address and undefined-behaviour
#                             sanitizers, and the tests of threads under the thread sanitizer
#   scripts/test.sh --plain   runs all tests, without sanitizers
#   scripts/test.sh --quick   runs the plain tests without the slow ones, between two edits
#
# Installs what is missing (scripts/packages.sh, groups build and test).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

case $#:${1-} in
  0: | 1:--plain | 1:--quick) mode=${1-} ;;
  *)
    echo "usage: scripts/test.sh [--plain | --quick]" >&2
    exit 2
    ;;
esac
trap '[ $? -eq 0 ] || echo "test: failed" >&2' EXIT
if [ ! -e /dev/pts/ptmx ]; then
  echo "test: /dev/pts is not mounted, but the tests of prompts need it" >&2
  exit 1
fi
scripts/packages.sh build test

# Run more tests at once than there are cores, because many wait for a lock, the disk or a process.
run_tests() { # FOLDER OPTION...
  ctest --test-dir "$1" --output-on-failure --parallel $((3 * $(nproc))) "${@:2}"
}

if [ "$mode" = --quick ]; then
  folder=$(scripts/build.sh dev dev | tail -n 1)
  if ! run_tests "$folder" --label-exclude slow --progress >"$folder/quick.log"; then
    grep -vE '^ +Start +[0-9]+: | Passed +[0-9.]+ sec$' "$folder/quick.log"
    exit 1
  fi
  echo "test: passed in $SECONDS s, $(sed -n 's/^100% tests passed, .* out of //p' "$folder/quick.log")" \
    "quick tests; scripts/test.sh runs the slow ones too"
  exit
fi
folder=$(scripts/build.sh dev dev | tail -n 1)
run_tests "$folder"
if [ "$mode" = --plain ]; then
  echo "test: passed, plain"
  exit
fi
folder=$(scripts/build.sh tsan tsan -- threads_test | tail -n 1)
run_tests "$folder" --tests-regex '^ThreadsTest'
folder=$(scripts/build.sh asan asan | tail -n 1)
run_tests "$folder"
echo "test: passed, plain and under sanitizers"
