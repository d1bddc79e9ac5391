#!/usr/bin/env bash
# Checks the code: formatting, shell scripts, clang-tidy, the tests in any order and for an ordinary
# user, and the branch coverage of src/.
#
#   scripts/check.sh             checks all of this
#   scripts/check.sh --changed   checks formatting, shell scripts and clang-tidy, for the files that
#                                changed since the branch left main, or on main since its last
#                                commit; for a header, clang-tidy checks the source of the same name
#
# Installs what is missing (scripts/packages.sh, groups build, test, check and authserver).
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

required_branches=95 # percent

case $#:${1-} in
  0: | 1:--changed) mode=${1-} ;;
  *)
    echo "usage: scripts/check.sh [--changed]" >&2
    exit 2
    ;;
esac

# If root runs the tests, they run as an ordinary user of a namespace. This user owns root's files,
# so it can enter the folder of the checkout, but it does not have root's rights.
user=()
[ "$(id -u)" -ne 0 ] || user=(unshare --user --map-user=65534 --map-group=65534)
if [ -z "$mode" ] && ! "${user[@]}" true; then
  echo "check: this machine does not let root make a namespace to run tests as an ordinary user" >&2
  exit 1
fi

trap '[ $? -eq 0 ] || echo "check: failed" >&2' EXIT
scripts/packages.sh build test check authserver

# These files are checked.
if [ -n "$mode" ]; then
  base=HEAD
  [ "$(git branch --show-current)" = main ] || base=$(git merge-base main HEAD)
  mapfile -t files < <({
    git diff --name-only --diff-filter=d "$base"
    git ls-files --others --exclude-standard
  } | sort -u)
else
  mapfile -t files < <(find .ci bench include platform examples scripts src tests tools -type f |
    sort)
fi
of_kind() { # PATTERN
  [ "${#files[@]}" -eq 0 ] || printf '%s\n' "${files[@]}" | grep -E "$1" || true
}

mapfile -t sources < <(of_kind '\.(c|cpp|h)$')
[ "${#sources[@]}" -eq 0 ] || clang-format --dry-run -Werror "${sources[@]}"
echo "check: ${#sources[@]} sources are formatted"

mapfile -t scripts < <(of_kind '\.(sh|bash)$|^\.ci/run$')
[ "${#scripts[@]}" -eq 0 ] || shellcheck "${scripts[@]}"
echo "check: ${#scripts[@]} shell scripts are sound"

# This build is only configured, because clang-tidy needs the compiler's commands, but no compiled
# files. It has no commands for the fuzz targets and the benchmark, which have their own builds.
folder=$(scripts/lib/build-folder.sh tidy)
cmake --preset dev -B "$folder" -DZEVOOAUTH_BUILD_AUTHSERVER=ON \
  -DCMAKE_DISABLE_PRECOMPILE_HEADERS=ON >/dev/null # each source must include what it needs
mapfile -t units < <(for source in "${sources[@]}"; do
  [ ! -e "${source%.*}.cpp" ] || echo "${source%.*}.cpp"
done | sort -u | grep -vE '^(tests/fuzz|bench)/')
# The largest sources come first, so that no core is idle at the end.
[ "${#units[@]}" -eq 0 ] || stat --printf '%s %n\n' "${units[@]}" | sort --numeric-sort --reverse |
  cut -d ' ' -f 2 | xargs --max-procs="$(nproc)" --max-args=1 \
  clang-tidy --quiet -p "$folder" --warnings-as-errors='*' 2> >(grep -v ' generated\.$' >&2)
echo "check: clang-tidy finds nothing in ${#units[@]} sources"
if [ -n "$mode" ]; then
  echo "check: passed for what has changed"
  exit
fi

# Run the tests of the plain build with the coverage build's library, which counts its branches.
tests=$(scripts/build.sh dev dev | tail -n 1)
folder=$(scripts/build.sh coverage coverage -- zevooauth | tail -n 1)
find "$folder" -name '*.gcda' -delete
LD_LIBRARY_PATH=$folder scripts/lib/run-test-programs.sh "$tests" 1 "${user[@]}"
echo "check: tests pass in any order, in one process, for an ordinary user"
# Do not count the branch that the compiler adds after each call for a possible exception.
gcovr --root . --filter src/ --exclude-throw-branches --exclude-unreachable-branches \
  --print-summary --fail-under-branch "$required_branches" "$folder/CMakeFiles/zevooauth.dir"
echo "check: at least $required_branches % of the branches in src/ are covered"
echo "check: passed"
