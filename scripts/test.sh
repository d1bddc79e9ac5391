#!/usr/bin/env bash
# Builds and runs every test, plainly and under the address and undefined-behaviour sanitizers, and
# the tests of threads under the thread sanitizer.
# Installs what is missing (scripts/packages.sh, groups build and test).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

trap '[ $? -eq 0 ] || echo "test: failed" >&2' EXIT
if [ ! -e /dev/pts/ptmx ]; then
  echo "test: /dev/pts is not mounted, which the tests of prompts need" >&2
  exit 1
fi
scripts/packages.sh build test
folder=$(scripts/build.sh tsan tsan -- threads_test | tail -n 1)
ctest --test-dir "$folder" --output-on-failure --tests-regex '^ThreadsTest'
for preset in dev asan; do
  folder=$(scripts/build.sh "$preset" "$preset" | tail -n 1)
  ctest --test-dir "$folder" --output-on-failure --parallel "$(nproc)"
done
echo "test: passed, plain and under sanitizers"
