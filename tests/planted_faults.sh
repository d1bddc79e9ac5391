#!/usr/bin/env bash
# Plants the faults of planted_faults.txt one at a time, and says for each which test catches it.
#
#   tests/planted_faults.sh [ID...]
#
# Without an ID all faults are planted. Builds in a copy that it removes; the checkout stays as it
# is. Takes about a quarter of an hour. The exit code is 1 if a fault is missed, and 2 if one cannot
# be planted.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

fail() {
  echo "planted_faults: error: $*" >&2
  exit 2
}

# --- Read the list ---

ids=() # in the order of the list
declare -A sentence file find put
while IFS= read -r line; do
  case $line in
    '' | '#'*) ;;
    '- '*) find[$id]+=${line:2}$'\n' ;;
    '+ '*) put[$id]+=${line:2}$'\n' ;;
    src/*) file[$id]=$line ;;
    *': '*)
      id=${line%%: *}
      [ -z "${sentence[$id]:-}" ] || fail "two faults are called $id"
      ids+=("$id")
      sentence[$id]=${line#*: }
      put[$id]=
      ;;
    *) fail "planted_faults.txt: cannot read this line: $line" ;;
  esac
done <tests/planted_faults.txt

if [ $# -gt 0 ]; then
  for id in "$@"; do
    [ -n "${sentence[$id]:-}" ] || fail "there is no fault $id"
  done
  ids=("$@")
fi

# Prints the file with the fault in it. The text to find may be a part of a line, so it has no line
# end after it, and a deleted line leaves an empty one.
planted() { # ID
  local text wanted=${find[$1]%$'\n'} before after
  text=$(<"${file[$1]}")
  before=${text%%"$wanted"*}
  [ "$before" != "$text" ] || fail "$1: ${file[$1]} does not have the text to find"
  after=${text#*"$wanted"}
  [[ $after != *"$wanted"* ]] || fail "$1: ${file[$1]} has the text to find more than once"
  printf '%s\n' "$before${put[$1]%$'\n'}$after"
}
unplantable=0
for id in "${ids[@]}"; do (planted "$id") >/dev/null || unplantable=$((unplantable + 1)); done
[ "$unplantable" -eq 0 ] || fail "adapt $unplantable faults in planted_faults.txt to src"

# --- Copy and build ---

work=$(mktemp -d)
# The tests' databases are files. Keep them in memory if possible.
TMPDIR=$(mktemp -d -p /dev/shm 2>/dev/null || mktemp -d)
chmod 711 "$TMPDIR" # tests of other users' rights enter it
export TMPDIR
declare -A running=() # process id -> program
stop_programs() {
  if [ "${#running[@]}" -gt 0 ]; then
    { kill "${!running[@]}" && wait "${!running[@]}"; } 2>/dev/null || true
  fi
  running=()
}
trap 'stop_programs; rm -rf "$work" "$TMPDIR"' EXIT

mkdir "$work/checkout"
tar --create --exclude=./build --exclude=./.git --exclude=node_modules . |
  tar --extract --directory "$work/checkout"
cd "$work/checkout"
export CCACHE_BASEDIR=$work CCACHE_NOHASHDIR=1 # each copy has another name

build() {
  cmake --build "$work/build" -- --quiet >"$work/build.log" 2>&1
}
# Programs are not linked again when only the library has changed.
cmake --preset dev -B "$work/build" -DZEVOOAUTH_BUILD_TOOLS=OFF -DCMAKE_LINK_DEPENDS_NO_SHARED=ON \
  >/dev/null
build || { cat "$work/build.log" >&2; fail "the tests cannot be built"; }

# --- Run the tests ---

# The first failure in a program's log. If the program crashed, it is the test that ran last.
first_failure() { # PROGRAM
  local log=$work/$1.log
  sed -nE 's/^\[  FAILED  \] ([A-Za-z0-9_\/]+\.[A-Za-z0-9_\/]+).*/\1/p' "$log" | head -n 1 |
    grep . || sed -nE 's/^\[ RUN      \] (.*)/\1 (crashed)/p' "$log" | tail -n 1 |
    grep . || echo "$1"
}

# Runs the programs side by side until one fails. True if one fails; $failure then names the test.
caught_by_program() { # PROGRAM...
  local program ended code most
  for program in "$@" ''; do
    # After the last program, wait for all.
    most=$([ -n "$program" ] && nproc || echo 1)
    while [ "${#running[@]}" -ge "$most" ]; do
      code=0
      wait -n -p ended "${!running[@]}" || code=$?
      if [ "$code" -ne 0 ]; then
        failure=$(first_failure "${running[$ended]}")
        unset "running[$ended]"
        stop_programs
        return 0
      fi
      unset "running[$ended]"
    done
    [ -n "$program" ] || return 1
    timeout 600 "$work/build/tests/$program" --gtest_fail_fast >"$work/$program.log" 2>&1 &
    running[$!]=$program
  done
}

# Does the same for tests that are not in a test program, for example scripts.
caught_by_script() {
  ! ctest --test-dir "$work/build" --stop-on-failure --parallel "$(nproc)" \
    --tests-regex '^(DatabaseExchange|ReadmeExample|ReferencePages|PublicHeader|SharedLibrary)\.' \
    >"$work/ctest.log" 2>&1 || return 1
  failure=$(sed -nE 's|^ *[0-9]+/[0-9]+ Test +#[0-9]+: ([^ ]+) .*\*\*\*.*|\1|p' "$work/ctest.log" |
    head -n 1)
}

# Run every program without a fault: it must pass. Later, run the quick programs first.
mapfile -t programs < <(cd "$work/build/tests" && printf '%s\n' *_test)
for program in "${programs[@]}"; do
  started=$(date +%s%N)
  ! caught_by_program "$program" || fail "$failure fails without a fault"
  echo "$(($(date +%s%N) - started)) $program"
done >"$work/durations"
! caught_by_script || fail "$failure fails without a fault"
mapfile -t programs < <(sort -n "$work/durations" | cut -d ' ' -f 2)
echo "planted_faults: ${#programs[@]} test programs pass without a fault" >&2

caught=0
for id in "${ids[@]}"; do
  cp "${file[$id]}" "$work/original"
  planted "$id" >"$work/planted"
  cat "$work/planted" >"${file[$id]}"
  build || { cat "$work/build.log" >&2; fail "$id does not compile"; }
  if caught_by_program "${programs[@]}" || caught_by_script; then
    caught=$((caught + 1))
    verdict="caught by $failure"
  else
    verdict=missed
  fi
  echo "$id: ${sentence[$id]} -> $verdict"
  cat "$work/original" >"${file[$id]}"
done

echo "planted_faults: $caught of ${#ids[@]} caught"
[ "$caught" -eq "${#ids[@]}" ]
