#!/usr/bin/env bash
# Runs the end-to-end tests of the example authorization server, with client libraries that others
# wrote, a real browser, and hostile and simultaneous requests.
#
#   scripts/test-authserver.sh [--screenshots] [--sanitizers] [NAME...]
#
# --screenshots renews the screenshots in docs/. --sanitizers builds the server with the address and
# undefined-behaviour sanitizers. If a NAME is given, only tests/authserver/NAME.test.mjs runs.
# Installs what is missing (scripts/packages.sh, groups build, test, authserver and e2e), and the
# modules of package-lock.json below the build folder. Each test file runs in a private /var
# (scripts/lib/private-var.sh), and the processes that it starts end with it.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

preset=release options=(-DZEVOOAUTH_BUILD_TESTS=OFF)
screenshots=
while [[ ${1-} == -* ]]; do
  case $1 in
    --screenshots) screenshots=$PWD/docs ;;
    --sanitizers) preset=asan options=() ;; # shares the build of scripts/test.sh
    *)
      echo "usage: scripts/test-authserver.sh [--screenshots] [--sanitizers] [NAME...]" >&2
      exit 2
      ;;
  esac
  shift
done

# Check this first, because installing and building take minutes.
scripts/lib/private-var.sh unshare --pid --fork --mount-proc true
scripts/packages.sh build test authserver e2e

# The tests look for modules beside them, so they run in a copy beside the modules.
tests=$(scripts/lib/build-folder.sh "authserver-tests-$preset")
if ! cmp --silent tests/authserver/package-lock.json "$tests/installed.json"; then
  rm -f "$tests/installed.json"
  cp tests/authserver/package.json tests/authserver/package-lock.json "$tests"
  # npm must also trust the certificate authorities of this machine.
  if ! (cd "$tests" && NODE_EXTRA_CA_CERTS=/etc/ssl/certs/ca-certificates.crt \
    npm ci --ignore-scripts --no-audit --no-fund --no-update-notifier \
    --fetch-retry-mintimeout=1000 --fetch-retry-maxtimeout=5000) \
    >"$tests/npm.log" 2>&1; then
    cat "$tests/npm.log" >&2
    echo "test-authserver: could not install the modules of tests/authserver/package-lock.json" >&2
    exit 1
  fi
  cp tests/authserver/package-lock.json "$tests/installed.json"
  echo "test-authserver: installed the modules of tests/authserver/package-lock.json"
fi
build=$(scripts/build.sh "$preset" "$preset" "${options[@]}" \
  -DZEVOOAUTH_BUILD_AUTHSERVER=ON -- authserver oauthctl | tail -n 1)
rm -f "$tests"/*.mjs
cp tests/authserver/*.mjs "$tests"

files=("${@/%/.test.mjs}")
[ $# -gt 0 ] || mapfile -t files < <(cd "$tests" && ls -- *.test.mjs)
started=$SECONDS
export PATH=$PATH:/usr/sbin
export AUTHSERVER_BUILD=$build AUTHSERVER_SOURCE=$PWD/examples/authserver
export AUTHSERVER_SCREENSHOTS=${screenshots:-$tests/screenshots}
mkdir -p "$AUTHSERVER_SCREENSHOTS"
rm -f "$tests"/*.tap
export tests
# Each file runs in its own /var with its own processes, because the path of the database is fixed.
# As many files run at once as there are cores. The longest ones start first.
run_file() { # FILE
  # shellcheck disable=SC2016 # the inner shell expands these
  if ! scripts/lib/private-var.sh unshare --pid --fork --kill-child --mount-proc bash -c '
    export HOME=/var/tmp TMPDIR=/var/tmp
    cd "$tests" && exec node --test --test-reporter=tap "$1"' test-authserver "$1" \
    >"$tests/$1.tap" 2>&1; then
    cat "$tests/$1.tap"
    return 1
  fi
  echo "test-authserver: $1 passed"
}
export -f run_file
mapfile -t files < <(printf '%s\n' "${files[@]}" | awk '{ print !/^(browser|busy_database)/, $0 }' |
  sort | cut -d ' ' -f 2)
printf '%s\n' "${files[@]}" |
  setsid xargs --max-procs="$(nproc)" --replace bash -euo pipefail -c 'run_file {}' &
runner=$!
trap 'kill -KILL -- "-$runner" 2>/dev/null || true' EXIT # also ends all processes of the tests
if ! wait "$runner"; then
  echo "test-authserver: failed" >&2
  exit 1
fi

if [ $# -eq 0 ]; then
  # shellcheck disable=SC2016 # these are backticks of Markdown
  grep -oP '^\| .*\| `\K[^`]+(?=` \|$)' docs/authserver.md | sort -u >"$tests/named.txt"
  sed -nE 's/^ *ok [0-9]+ - //p' "$tests"/*.tap | sort -u >"$tests/passed.txt"
  unheld=$(comm -23 "$tests/named.txt" "$tests/passed.txt")
  if [ -n "$unheld" ]; then
    echo "test-authserver: docs/authserver.md names tests that did not pass: $unheld" >&2
    exit 1
  fi
  echo "test-authserver: all $(wc -l <"$tests/named.txt") tests that docs/authserver.md names have passed"
fi
echo "test-authserver: passed in $((SECONDS - started)) s, under node $(node --version)"
