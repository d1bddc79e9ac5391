#!/usr/bin/env bash
# Builds the API reference: the public headers, docs/reference and the operator's pages as HTML.
# An undocumented member, a broken reference and a link to a missing page are errors.
# Installs what is missing (scripts/packages.sh, group docs). The last line of the output tells
# where the first page is.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."
[ $# -eq 0 ] || { echo "usage: scripts/docs.sh" >&2 && exit 2; }

scripts/packages.sh docs
folder=$(scripts/lib/build-folder.sh reference)
rm -rf "${folder:?}"/*
# Work in another folder, because doxygen cannot follow a link in a path with a blank.
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cp -r include docs "$work"
cd "$work"
{
  cat docs/reference/Doxyfile
  echo "OUTPUT_DIRECTORY = \"$folder\""
} | doxygen - || { echo "docs: failed, see above" >&2 && exit 1; }

dead=$(cd "$folder" && grep -oE '<a [^>]*href="[^"#:]+["#]' ./*.html |
  sed -E 's/^([^:]*):.*href="(.*)["#]$/\1 \2/' | sort -u |
  while read -r page target; do
    [ -e "$target" ] || echo "docs: $page links to $target, which does not exist"
  done)
if [ -n "$dead" ]; then
  echo "$dead" >&2
  exit 1
fi
echo "docs: $folder/index.html"
