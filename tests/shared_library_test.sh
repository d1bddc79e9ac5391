#!/usr/bin/env bash
# Checks what the shared library shows to the outside: its name, the libraries it needs, what it
# exports, that it never reads the environment, and that it stays in memory once loaded.
#
#   shared_library_test.sh LIBRARY NM READELF
set -euo pipefail

library=$1 nm=$2 readelf=$3
here=$(dirname "$0")
failures=0

fail() {
  echo "FAILED: $1" >&2
  failures=$((failures + 1))
}

dynamic=$("$readelf" --dynamic --wide "$library")
soname=$(sed -n 's/.*(SONAME).*\[\(.*\)\]/\1/p' <<<"$dynamic")
[ "$soname" = libzevooauth.so.1 ] || fail "its SONAME is $soname"
for needed in libzevocore.so.6 libzevocgi.so.6; do
  grep -q "(NEEDED).*\[$needed\]" <<<"$dynamic" || fail "it does not need $needed"
done

grep -q '(FLAGS_1).* NODELETE' <<<"$dynamic" || fail "dlclose() would take it from memory"

exported=$("$nm" --dynamic --defined-only --demangle "$library" | cut -d ' ' -f 3- |
  sed 's/std::__cxx11::basic_string<char, std::char_traits<char>, std::allocator<char> >/std::string/g; s/\[abi:cxx11\]//' |
  LC_ALL=C sort -u)
diff "$here/exported_symbols.txt" - <<<"$exported" ||
  fail "its exports are not those of exported_symbols.txt"

environment=$("$nm" --dynamic --undefined-only "$library" | grep -E 'getenv' || true)
[ -z "$environment" ] || fail "it reads the environment: $environment"

[ "$failures" -eq 0 ] || exit 1
echo "shared library: name, needed libraries and $(wc -l <"$here/exported_symbols.txt") exports are right"
