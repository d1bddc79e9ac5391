#!/usr/bin/env bash
# Checks that the files of oauthctl include only files of their own folder and of lower layers.
#
#   tests/oauthctl_layers_test.sh LAYER...
#
# The layers are folders of tools/oauthctl, the lowest first. Other folders may hold no source file.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/../tools/oauthctl"

wrong=0
complain() {
  echo "$*" >&2
  wrong=1
}

# The quoted includes of the files in a folder, as "FILE:LINE:PATH".
includes_of() {
  grep -rnHo --include=*.h --include=*.cpp '^#include "[^"]*' "$1" | sed 's/#include "//'
}

allowed=' '
for layer in "$@"; do
  [ -d "$layer" ] || complain "there is no folder $layer"
  allowed+="$layer "
  while IFS=: read -r file line path; do
    if [ -e "$path" ]; then
      [[ $allowed == *" ${path%/*} "* ]] || complain "$file:$line: $path is in a higher layer"
    elif [ -e "$layer/$path" ]; then
      complain "$file:$line: name the folder of $path"
    fi
  done < <(includes_of "$layer")
done

while read -r file; do
  [[ $allowed == *" ${file%/*} "* ]] || complain "$file is in no layer"
done < <(find . -mindepth 2 \( -name '*.h' -o -name '*.cpp' \) -printf '%P\n')

exit "$wrong"
