#!/usr/bin/env bash
# Builds and runs every test, plainly and under the address and undefined-behaviour sanitizers, and
# the tests of threads under the thread sanitizer.
# Installs what is missing (scripts/packages.sh, groups build and test); ends with CTest's summary.
set -euo pipefail
cd "$(dirname "$0")/.."

scripts/packages.sh build test
folder=$(scripts/build.sh tsan tsan -- threads_test | tail -n 1)
ctest --test-dir "$folder" --output-on-failure --tests-regex '^ThreadsTest'
for preset in dev asan; do
  folder=$(scripts/build.sh "$preset" "$preset" | tail -n 1)
  ctest --test-dir "$folder" --output-on-failure --parallel "$(nproc)"
done
