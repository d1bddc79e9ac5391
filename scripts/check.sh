#!/usr/bin/env bash
# What a machine can say about the code: formatting, shell scripts, clang-tidy, tests in any order
# and for an ordinary user, branch coverage of src/.
# Installs what is missing (scripts/packages.sh, groups build, test, check and authserver).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

required_branches=95 # percent

# Root's files, without root's rights: a user who need not be let into the folder they lie in.
user=()
[ "$(id -u)" -ne 0 ] || user=(unshare --user --map-user=65534 --map-group=65534)
if ! "${user[@]}" true; then
  echo "check: this machine does not let root make a namespace, for the tests of an ordinary user" >&2
  exit 1
fi

trap '[ $? -eq 0 ] || echo "check: failed" >&2' EXIT
scripts/packages.sh build test check authserver

mapfile -t sources < <(find include src platform examples tools tests -name '*.cpp' -o -name '*.h' | sort)
clang-format --dry-run -Werror "${sources[@]}" bench/*.{c,cpp,h}
echo "check: sources are formatted"

shellcheck .ci/run scripts/*.sh tests/*.sh tools/oauthctl/oauthctl.bash
echo "check: shell scripts are sound"

folder=$(scripts/build.sh dev dev -DZEVOOAUTH_BUILD_AUTHSERVER=ON | tail -n 1)
# The fuzz targets are another compiler's build: there are no commands for them in this one.
printf '%s\n' "${sources[@]}" | grep '\.cpp$' | grep -v '^tests/fuzz/' |
  xargs --max-procs="$(nproc)" --max-args=1 clang-tidy --quiet -p "$folder" --warnings-as-errors='*' \
    2> >(grep -v ' generated\.$' >&2)
echo "check: clang-tidy has nothing to say"

for program in "$folder"/tests/*_test; do
  "${user[@]}" "$program" --gtest_shuffle --gtest_brief=1 | grep -v '^Running main'
done
echo "check: tests pass in any order, in one process, for an ordinary user"

folder=$(scripts/build.sh coverage coverage | tail -n 1)
find "$folder" -name '*.gcda' -delete
# Without the look at the library's imports: counting branches brings in some of its own.
ctest --test-dir "$folder" --parallel "$(nproc)" --output-on-failure --exclude-regex SharedLibrary \
  >"$folder/ctest.log" || { cat "$folder/ctest.log" && exit 1; }
# What a throw could do after every call is not a branch that anybody wrote.
gcovr --root . --filter src/ --exclude-throw-branches --exclude-unreachable-branches \
  --print-summary --fail-under-branch "$required_branches" "$folder/CMakeFiles/zevooauth.dir"
echo "check: at least $required_branches % of the branches in src/ are covered"
echo "check: passed"
