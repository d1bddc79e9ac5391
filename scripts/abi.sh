#!/usr/bin/env bash
# Compares the library's binary interface with the baselines in abi/, for this machine and for
# PowerPC. An added function passes with a note. Any other difference fails, because programs
# compiled earlier might no longer work.
#
#   scripts/abi.sh            compares
#   scripts/abi.sh --record   makes the baselines from the current sources
#
# Installs what is missing (scripts/packages.sh, groups build, powerpc and abi), and keeps the
# libraries that it builds for the target (scripts/lib/powerpc-libraries.sh).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

case $#:${1-} in
  0: | 1:--record) mode=${1-} ;;
  *)
    echo "usage: scripts/abi.sh [--record]" >&2
    exit 2
    ;;
esac

scripts/packages.sh build powerpc abi
libraries=$(scripts/lib/build-folder.sh powerpc-libraries)
scripts/lib/powerpc-libraries.sh "$libraries"
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# FILE PRESET [OPTION...]: writes the interface of a release to FILE, from its debug information.
# Types that include/ does not define appear by name only, so that an update of another library does
# not change the description. abidw would keep the types of /usr/include, so the preset gives that
# folder another name in the debug information.
describe() {
  local folder
  folder=$(scripts/build.sh "$2" "$2" "${@:3}" -DZEVOOAUTH_BUILD_TESTS=OFF -- zevooauth |
    tail -n 1)
  abidw --headers-dir include --drop-private-types --exported-interfaces-only --no-corpus-path \
    --no-comp-dir-path --no-show-locs --no-parameter-names --no-elf-needed --type-id-style hash \
    --out-file "$1" "$folder/libzevooauth.so"
  if grep -nF -e "$PWD/" -e "$libraries/" -e /usr/ "$1" >&2; then
    echo "abi: the description names a folder of this machine" >&2
    exit 1
  fi
  if ! grep -q "<class-decl name='OAUTHDBBasic' size-in-bits='[1-9]" "$1"; then
    echo "abi: the description does not contain the classes" >&2
    exit 1
  fi
}

# BASELINE FILE: fails with a report unless programs built for BASELINE work with FILE.
compare() {
  local added=0
  if [ ! -e "$1" ]; then
    echo "abi: there is no $1, scripts/abi.sh --record makes it" >&2
    return 1
  fi
  # Ignore added functions first: any other difference is an error.
  if ! abidiff --no-added-syms "$1" "$2" >"$work/report"; then
    cat "$work/report"
    return 1
  fi
  abidiff "$1" "$2" >"$work/report" || added=$?
  case $added in
    0) echo "abi: the interface is the same as in $1" ;;
    4)
      cat "$work/report"
      echo "abi: the interface has all of $1 and more; scripts/abi.sh --record makes it the baseline"
      ;;
    *)
      cat "$work/report"
      return 1
      ;;
  esac
}

failed=
for architecture in "$(uname -m)" powerpc; do
  baseline=abi/libzevooauth.$architecture.abi
  options=(release)
  [ "$architecture" != powerpc ] || options=(powerpc-release -DPOWERPC_LIBRARIES="$libraries")
  describe "$work/now" "${options[@]}"
  if [ -n "$mode" ]; then
    mkdir -p abi
    cp "$work/now" "$baseline"
    echo "abi: recorded $baseline"
  else
    compare "$baseline" "$work/now" || failed+=" $architecture"
  fi
done
if [ -n "$failed" ]; then
  echo "abi: INCOMPATIBLE on$failed: see CONTRIBUTING.md on changing the interface" >&2
  exit 1
fi
[ -n "$mode" ] || echo "abi: programs compiled earlier go on working"
