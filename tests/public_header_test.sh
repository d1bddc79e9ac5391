#!/usr/bin/env bash
# A public header compiles alone, without warnings, and keeps SQLite's header to itself.
#
#   public_header_test.sh HEADER COMPILER [FLAG...]
set -euo pipefail

header=$1
shift
printf '#include "%s"\n#ifdef SQLITE_VERSION\n#error includes the SQLite header\n#endif\n' "$header" |
  "$@" -std=c++17 -Wall -Wextra -Wshadow -Werror -fsyntax-only -x c++ -
echo "$header compiles alone"
