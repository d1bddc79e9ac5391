#!/usr/bin/env bash
# Installs the Debian packages of the named groups that are missing.
#
#   scripts/packages.sh GROUP...
#
# Groups: build test powerpc check fuzz bench package bare docs abi authserver e2e drawings
set -euo pipefail

declare -A groups=(
  [build]="g++ cmake ninja-build pkg-config libsqlite3-dev libjsoncpp-dev libboost-dev nettle-dev libcli11-dev libsmartcols-dev"
  [test]="binutils libgtest-dev libgmock-dev"
  [powerpc]="g++-powerpc-linux-gnu qemu-user qemu-user-static dpkg-dev make m4 tcl"
  [check]="clang-format clang-tidy gcovr shellcheck"
  [fuzz]="clang libclang-rt-dev"
  [bench]="libbenchmark-dev valgrind gnuplot-nox"
  [package]="build-essential debhelper lintian"
  [bare]="debootstrap"
  [docs]="doxygen"
  [abi]="abigail-tools"
  [authserver]="libcgicc-dev libctemplate-dev libsodium-dev lighttpd"
  [e2e]="ca-certificates nodejs npm chromium fonts-liberation sqlite3"
  [drawings]="mscgen"
)

if [ $# -eq 0 ]; then
  echo "usage: scripts/packages.sh GROUP..." >&2
  exit 2
fi
for group in "$@"; do
  if [ -z "${groups[$group]-}" ]; then
    echo "packages: there is no group $group" >&2
    exit 2
  fi
done
# A package may provide another one: a newer nodejs provides npm.
there=$(dpkg-query --show --showformat='${db:Status-Status}, ${Package}, ${Provides}\n' |
  sed -n 's/^installed, //p' | tr ',' '\n' | sed 's/(.*//; s/ //g')
missing=()
for group in "$@"; do
  for package in ${groups[$group]}; do
    grep -qxF "$package" <<<"$there" || missing+=("$package")
  done
done

if [ ${#missing[@]} -eq 0 ]; then
  echo "packages: everything for $* is installed"
  exit 0
fi
if [ "$(id -u)" -ne 0 ]; then
  echo "packages: run this as root: apt-get install --no-install-recommends ${missing[*]}" >&2
  exit 1
fi
echo "packages: installing ${missing[*]}"
export DEBIAN_FRONTEND=noninteractive
install() { apt-get install -qq --yes --no-install-recommends "${missing[@]}" >/dev/null; }
# The lists of packages may be old or missing. In this case update them and try again.
if ! install 2>/dev/null && ! { apt-get update -qq && install; }; then
  echo "packages: could not install ${missing[*]}" >&2
  exit 1
fi
echo "packages: installed ${#missing[@]} for $*"
