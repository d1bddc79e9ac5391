#!/usr/bin/env bash
# Checks that no program or library in a folder looks for libraries in the current folder: each
# entry of its run path is absolute or relative to the file itself. The loader reads an empty entry
# as the current folder, where anybody may have put a library.
#
#   run_path_test.sh FOLDER READELF
set -euo pipefail

folder=$1 readelf=$2
checked=0 failures=0
while IFS= read -r -d '' file; do
  dynamic=$("$readelf" --dynamic --wide "$file" 2>/dev/null) || continue # a script
  checked=$((checked + 1))
  path=$(sed -nE 's/.*\((RPATH|RUNPATH)\).*\[(.*)\]$/\2/p' <<<"$dynamic")
  [ -n "$path" ] || continue
  while IFS= read -r -d : entry; do
    if ! [[ $entry =~ ^(/|\$ORIGIN(/|$)) ]]; then
      echo "FAILED: $file looks in '$entry': its run path is '$path'" >&2
      failures=$((failures + 1))
    fi
  done <<<"$path:"
done < <(find "$folder" -name CMakeFiles -prune -o -type f \
  \( -perm -u=x -o -name '*.so.*' \) -print0)

[ "$checked" -gt 0 ] || { echo "run path: there is no program in $folder" >&2 && exit 1; }
[ "$failures" -eq 0 ] || exit 1
echo "run path: none of $checked programs and libraries looks in the current folder"
