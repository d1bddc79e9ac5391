#!/usr/bin/env bash
# Feeds hostile input to the library: runs every target of tests/fuzz for SECONDS seconds.
#
#   scripts/fuzz.sh SECONDS
#
# Installs what is missing (scripts/packages.sh, groups build and fuzz). Starts from the inputs in
# tests/fuzz/corpus, and from those that earlier runs kept in the build folder.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

if [ $# -ne 1 ] || ! [[ $1 =~ ^[1-9][0-9]*$ ]]; then
  echo "usage: scripts/fuzz.sh SECONDS" >&2
  exit 2
fi
export seconds=$1

scripts/packages.sh build fuzz
folder=$(scripts/build.sh fuzz fuzz | tail -n 1)/tests/fuzz
export folder

# Settings and databases are files. Keep them in memory if possible.
TMPDIR=$(mktemp -d -p /dev/shm 2>/dev/null || mktemp -d)
trap 'rm -rf "$TMPDIR"' EXIT
export TMPDIR
# Hold back only as much freed memory as fits into a processor's cache. Keep one frame for each
# allocation, because whole stacks would fill the memory. Reproduce a finding to see whole stacks.
export ASAN_OPTIONS=quarantine_size_mb=16:malloc_context_size=1

statistic() { # LOG NAME
  sed -n "s/^stat::$2: *//p" "$1"
}

run() { # TARGET
  local log=$folder/$1.log kept=tests/fuzz/corpus/$1 max
  # Short inputs are faster, but the longest input of the corpus must fit.
  max=$( (echo 1024 && stat --format %s "$kept"/*) | sort -n | tail -n 1)
  mkdir -p "$folder/$1.corpus"
  if ! "$folder/$1" -max_total_time="$seconds" -max_len="$max" -timeout=25 -rss_limit_mb=2048 \
    -print_final_stats=1 -artifact_prefix="$folder/$1." "$folder/$1.corpus" "$kept" \
    >"$log" 2>&1; then
    grep -aE '^does not hold: |runtime error: |ERROR: ' "$log" || tail -n 20 "$log"
    sed -n "s|.*Test unit written to |fuzz: reproduce by $folder/$1 |p" "$log"
    echo "fuzz: $1 found something, see $log"
    return 1
  fi
  echo "fuzz: $1: $(statistic "$log" number_of_executed_units) executions," \
    "$(statistic "$log" average_exec_per_sec) a second"
}
export -f run statistic

mapfile -t targets < <(basename --suffix=.cpp --multiple tests/fuzz/*_fuzz.cpp)
if ! printf '%s\n' "${targets[@]}" |
  xargs --max-procs="$(nproc)" --replace bash -euo pipefail -c 'run {}'; then
  echo "fuzz: failed" >&2
  exit 1
fi
total=0
for target in "${targets[@]}"; do
  total=$((total + $(statistic "$folder/$target.log" number_of_executed_units)))
done
echo "fuzz: $total executions of ${#targets[@]} targets in $seconds s each, nothing found"
