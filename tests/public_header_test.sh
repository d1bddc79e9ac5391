#!/usr/bin/env bash
# Checks that a public header compiles alone without warnings, and does not include SQLite's header.
#
#   public_header_test.sh HEADER COMPILER [FLAG...]
set -euo pipefail

header=$1
shift
printf '#include "%s"\n#ifdef SQLITE_VERSION\n#error includes the SQLite header\n#endif\n' "$header" |
  "$@" -std=c++17 -Wall -Wextra -Wshadow -Werror -fsyntax-only -x c++ -
echo "$header compiles alone"
