#!/usr/bin/env bash
# Checks that the programs and libraries of a release are hardened: they can be loaded at any
# address, are bound and write-protected before they run, cannot execute the stack, and check stacks
# and buffers.
#
#   hardening_test.sh --built FOLDER...        also checks the run paths, and the compiler's options
#                                              in the debug information
#   hardening_test.sh --installed FOLDER...    also checks that there is no run path
set -euo pipefail

mode=$1
shift
checked=0 failures=0

fail() { # FILE TEXT
  echo "FAILED: $1 $2" >&2
  failures=$((failures + 1))
}

expect() { # FILE TEXT PATTERN REASON
  grep -qE "$3" <<<"$2" || fail "$1" "$4"
}

linked() { # FILE OUTPUT_OF_READELF
  expect "$1" "$2" '^ *Type: +DYN' 'cannot be loaded at any address'
  if grep -q '^ *INTERP' <<<"$2"; then
    expect "$1" "$2" '\(FLAGS_1\).* PIE' 'is no position-independent program'
  fi
  expect "$1" "$2" '^ *GNU_RELRO ' 'has no part that is write-protected'
  expect "$1" "$2" '\((FLAGS|FLAGS_1)\).*(BIND_NOW|NOW)' 'is not bound before it runs'
  expect "$1" "$2" '^ *GNU_STACK .* RW +0x' 'may execute its stack'
  if [ "$mode" = --installed ] && grep -E '\((RPATH|RUNPATH)\)' <<<"$2" >&2; then
    fail "$1" 'looks for libraries where it was built'
  fi
}

# Checks that the file calls no function of the C library that _FORTIFY_SOURCE always replaces.
calls() { # FILE
  local asked
  asked=$(readelf --dyn-syms --wide "$1" | awk '$7 == "UND" { sub(/@.*/, "", $8); print $8 }')
  if grep -xE 'f?printf|sn?printf|v?syslog|vfprintf' <<<"$asked" >&2; then
    fail "$1" 'calls these functions unchecked'
  fi
  case ${1##*/} in
    oauthctl | libzevooauth.so.*)
      expect "$1" "$asked" '^__[a-z]+_chk$' 'checks no buffer'
      expect "$1" "$asked" '^__stack_chk_fail$' 'checks no stack'
      ;;
  esac
}

compiled() { # FILE OUTPUT_OF_READELF
  local units unit option options=(-fstack-protector-strong -fstack-clash-protection)
  ! grep -qE 'Machine: .*(X86-64|80386)' <<<"$2" || options+=(-fcf-protection)
  units=$(readelf --debug-dump=info --dwarf-depth=1 --wide "$1" 2>/dev/null |
    sed -nE 's/.*DW_AT_producer.*: (GNU C.*)/\1/p' | sort -u)
  [ -n "$units" ] || fail "$1" 'does not tell what it was compiled with'
  while IFS= read -r unit; do
    for option in "${options[@]}"; do
      [[ "$unit " == *" $option"[\ =]* ]] || fail "$1" "is compiled without $option: $unit"
    done
  done <<<"$units"
}

while IFS= read -r -d '' file; do
  said=$(readelf --file-header --program-headers --dynamic --wide "$file" 2>/dev/null) || continue
  checked=$((checked + 1))
  linked "$file" "$said"
  calls "$file"
  [ "$mode" = --installed ] || compiled "$file" "$said"
done < <(find "$@" -name CMakeFiles -prune -o -type f \( -perm -u=x -o -name '*.so.*' \) -print0)

[ "$checked" -gt 0 ] || { echo "hardening: there is no program in $*" >&2 && exit 1; }
[ "$failures" -eq 0 ] || exit 1
[ "$mode" = --installed ] || for folder; do
  "$(dirname "$0")/run_path_test.sh" "$folder" readelf
done
echo "hardening: $checked programs and libraries are hardened"
