#!/usr/bin/env bash
# Measures every operation of the library, and the same work written by hand, the floor (bench/).
#
#   scripts/bench.sh                  writes instructions, times and footprint into
#                                     docs/performance.md
#   scripts/bench.sh --instructions   counts instructions only; fails if the ratio of an operation
#                                     to its floor is more than 5 % above bench/recorded_ratios.txt
#   scripts/bench.sh --record         counts instructions only; records the ratios in that file
#
# Installs what is missing (scripts/packages.sh, groups build and bench). Works on its own database
# in /var/tmp.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

recorded=bench/recorded_ratios.txt
note=docs/performance.md
plot=docs/performance.svg

# String functions use only what every x86-64 processor has, so that all machines count the same.
plain_processor=glibc.cpu.hwcaps=-AVX,-AVX2,-AVX_Fast_Unaligned_Load,-BMI2,-ERMS,-MOVBE
plain_processor+=,-SSSE3,-SSE4_1,-SSE4_2

# MODE FILE: writes the counts of "bench MODE" to FILE, as lines of
# "<operation>|<library>|<floor>|<prepared>".
count_instructions() {
  local dumps
  dumps=$(mktemp -d -p "$work")
  GLIBC_TUNABLES=$plain_processor valgrind -q --tool=callgrind --instr-atstart=no \
    --collect-atstart=no --combine-dumps=yes --callgrind-out-file="$dumps/%p" \
    "$folder/bench/bench" "$1" >"$work/order"
  # Read "totals:", because "summary:" is right only in the first dump of a process.
  cat "$dumps"/* | awk -v order="$work/order" '
    /^desc: Trigger: Client Request: / { sub(/^.*Request: /, ""); split($0, label, "/") }
    /^totals: / && label[1] != "" { count[label[1], label[2]] = $2 / label[3]; label[1] = "" }
    END {
      while ((getline name < order) > 0)
        printf "%s|%.0f|%.0f|%.0f\n", name, count[name, "library"], count[name, "floor"],
          count[name, "prepared"]
    }' >"$2"
}

# Writes the counted ratios to the file, and keeps its comments and the ratios to reach.
record() {
  awk -F' *[|] *' -v OFS='|' '
    FNR == NR && /^#/ { print; next }
    FNR == NR { reach[$1] = $3; next }
    { printf "%-40s | %7.3f | %s\n", $1, $2 / $3, ($1 in reach) ? reach[$1] : "-" }
  ' "$recorded" "$work/instructions" >"$work/recorded"
  cp "$work/recorded" "$recorded"
  echo "bench: recorded the ratios in $recorded"
}

compare() {
  awk -F' *[|] *' '
    FNR == NR { if (!/^#/) recorded[$1] = $2; next }
    !($1 in recorded) { print "bench: " $1 ": no ratio is recorded"; failed = 1; next }
    {
      ratio = $2 / $3
      grown = 100 * (ratio / recorded[$1] - 1)
      if (grown > 5) failed = 1
      printf "bench: %-40s %8.3f, recorded %8.3f%s\n", $1, ratio, recorded[$1],
        (grown > 5) ? sprintf(": GROWN by %.0f %%", grown) : ""
      delete recorded[$1]
    }
    END {
      for (name in recorded) { print "bench: " name ": recorded, but not measured"; failed = 1 }
      exit failed
    }' "$recorded" "$work/instructions" || {
    echo "bench: FAILED: a ratio may be at most 5 % above $recorded (scripts/bench.sh --record)" >&2
    exit 1
  }
  echo "bench: no ratio has grown by more than 5 %"
}

# Every table is printed with these functions. grouped() puts blanks between thousands.
awk_functions='
  function grouped(number, text) {
    text = sprintf("%.0f", number)
    while (match(text, /[0-9][0-9][0-9][0-9]( |$)/))
      text = substr(text, 1, RSTART) " " substr(text, RSTART + 1)
    return text
  }
  function digits3(number) {
    if (number >= 100) return grouped(number)
    return sprintf(number < 10 ? "%.2f" : "%.1f", number)
  }'

machine() {
  local processor system compiler disk
  processor=$(sed -n 's/^model name[[:space:]]*: //p' /proc/cpuinfo | head -n 1)
  system=$(sed -n 's/^PRETTY_NAME="\(.*\)"$/\1/p' /etc/os-release)
  compiler=$(c++ --version | head -n 1)
  disk=$(findmnt --noheadings --output FSTYPE --target /var/tmp)
  echo "Measured on $(date --utc +%F): ${processor:-$(uname -m)}, $(nproc) cores, $system, $compiler," \
    "SQLite $(pkg-config --modversion sqlite3), JsonCpp $(pkg-config --modversion jsoncpp), $disk."
}

operation_table() {
  echo '| operation | library | floor | ratio | reach | library, µs | floor, µs | ratio | syncs |'
  echo '|---|--:|--:|--:|--:|--:|--:|--:|--:|'
  awk -F' *[|] *' "$awk_functions"'
    FILENAME ~ /recorded/ { reach[$1] = $3; next }
    FILENAME ~ /times$/ { time[$1] = $2; next }
    FILENAME ~ /footprint$/ { syncs[$1] = $2; next }
    $4 == 0 {
      library = time[$1 "/library"]
      floor = time[$1 "/floor"]
      printf "| %s | %s | %s | %.3f | %s | %s | %s | %.2f | %d |\n", $1, grouped($2), grouped($3),
        $2 / $3, ($1 in reach) ? reach[$1] : "-", digits3(library), digits3(floor),
        library / floor, syncs[$1 "/library"]
      if (syncs[$1 "/library"] != syncs[$1 "/floor"]) {
        print "bench: " $1 ": the floor syncs " syncs[$1 "/floor"] " times" >"/dev/stderr"
        exit 1
      }
    }' "$recorded" "$work/times" "$work/footprint" "$work/instructions"
}

held_table() {
  echo -n '| store held open | library | floor | statements prepared once '
  echo '| library, µs | floor, µs | prepared, µs |'
  echo '|---|--:|--:|--:|--:|--:|--:|'
  awk -F' *[|] *' "$awk_functions"'
    FILENAME ~ /times$/ { time[$1] = $2; next }
    $4 > 0 {
      printf "| %s | %s | %s | %s | %s | %s | %s |\n", $1, grouped($2), grouped($3), grouped($4),
        digits3(time[$1 "/library"]), digits3(time[$1 "/floor"]), digits3(time[$1 "/prepared"])
    }' "$work/times" "$work/instructions"
}

# Prints how the instructions of each operation grow from its smallest size to its largest.
slope_table() {
  echo '| instructions for one row more | library | floor |'
  echo '|---|--:|--:|'
  awk -F'[|]' "$awk_functions"'
    match($1, / at [0-9]+ rows$/) {
      name = substr($1, 1, RSTART - 1)
      rows = substr($1, RSTART + 4) + 0
      if (!(name in least)) { order[++names] = name; least[name] = most[name] = rows }
      if (rows <= least[name]) { least[name] = rows; library0[name] = $2; floor0[name] = $3 }
      if (rows >= most[name]) { most[name] = rows; library1[name] = $2; floor1[name] = $3 }
    }
    END {
      for (i = 1; i <= names; ++i) {
        name = order[i]
        span = most[name] - least[name]
        printf "| %s, %d to %d rows | %s | %s |\n", name, least[name], most[name],
          digits3((library1[name] - library0[name]) / span),
          digits3((floor1[name] - floor0[name]) / span)
      }
    }' "$work/instructions" "$work/sizes"
}

memory_table() {
  echo '| memory | library | floor |'
  echo '|---|--:|--:|'
  awk -F'[|]' "$awk_functions"'
    { allocations[$1] = $3; peak[$1] = $4; bytes[$1] = $2 }
    END {
      verify = "verify at 1000 rows"
      read = "read all at 10000 rows"
      printf "| allocations of construct, verify, destroy | %s | %s |\n",
        grouped(allocations[verify "/library"]), grouped(allocations[verify "/floor"])
      printf "| allocations of reading all of 10000 rows | %s | %s |\n",
        grouped(allocations[read "/library"]), grouped(allocations[read "/floor"])
      printf "| peak of reading all of 10000 rows, whose text has %s KiB | %s KiB | %s KiB |\n",
        grouped(bytes["text of 10000 rows"] / 1024), grouped(peak[read "/library"] / 1024),
        grouped(peak[read "/floor"] / 1024)
    }' "$work/footprint"
}

draw() {
  awk -F'[|]' -v OFS='\t' 'match($1, / at [0-9]+ rows$/) {
    print substr($1, 1, RSTART - 1), substr($1, RSTART + 4) + 0, $2, $3
  }' "$work/instructions" "$work/sizes" | sort -t $'\t' -k 1,1 -k 2,2n >"$work/sizes.tsv"
  gnuplot -e "data='$work/sizes.tsv'; out='$plot'" bench/plot.gp
}

# Replaces the text between the two marks of the page.
refresh() {
  {
    sed '/^<!-- measured -->$/q' "$note"
    echo && machine
    echo && operation_table
    echo && held_table
    echo && slope_table
    echo && memory_table
    echo && sed -n '/^<!-- end of what was measured -->$/,$p' "$note"
  } >"$work/note"
  cp "$work/note" "$note"
}

case $#:${1-} in
  0:) mode=all ;;
  1:--instructions | 1:--record) mode=$1 ;;
  *)
    echo "usage: scripts/bench.sh [--instructions | --record]" >&2
    exit 2
    ;;
esac
scripts/packages.sh build bench
folder=$(scripts/build.sh bench bench | tail -n 1)
work=$folder/measured
rm -rf "$work" && mkdir "$work"

count_instructions --instructions "$work/instructions"
case $mode in
  --instructions) compare ;;
  --record) record ;;
  all)
    count_instructions --sizes "$work/sizes"
    "$folder/bench/bench" --benchmark_min_time=0.05 | tr '\t' '|' >"$work/times"
    "$folder/bench/footprint" | tr '\t' '|' >"$work/footprint"
    draw
    refresh
    echo "bench: refreshed $note and $plot"
    ;;
esac
