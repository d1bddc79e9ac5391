#!/usr/bin/env bash
# Runs the tests for the appliance: cross-compiles them for 32-bit big-endian PowerPC, runs them
# under emulation, and exchanges databases with this machine's own build.
# Installs what is missing (scripts/packages.sh, groups build, test and powerpc), and keeps the
# libraries that it builds for the target (scripts/lib/powerpc-libraries.sh) for the next time.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/test-powerpc.sh" >&2 && exit 2; }

trap '[ $? -eq 0 ] || echo "test-powerpc: failed" >&2' EXIT
scripts/packages.sh build test powerpc
libraries=$(scripts/lib/build-folder.sh powerpc-libraries)
scripts/lib/powerpc-libraries.sh "$libraries"
native=$(scripts/build.sh dev dev | tail -n 1)
folder=$(scripts/build.sh powerpc powerpc -DPOWERPC_LIBRARIES="$libraries" | tail -n 1)

# The emulator takes long to start, so all tests of a program share a few processes.
scripts/lib/run-test-programs.sh "$folder" "$(nproc)" qemu-ppc -L /usr/powerpc-linux-gnu
ctest --test-dir "$folder" --output-on-failure --parallel "$(nproc)" --label-exclude 'rule|slow'

here="$native/tests/database_exchange"
there="qemu-ppc -L /usr/powerpc-linux-gnu $folder/tests/database_exchange"
tests/database_exchange_test.sh "$here" "$there"
tests/database_exchange_test.sh "$there" "$here"
echo "test-powerpc: passed, and databases go both ways between the architectures"
