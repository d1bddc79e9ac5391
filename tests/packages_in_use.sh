#!/usr/bin/env bash
# Installs the packages beside this script in a bare system, and uses, upgrades and removes them.
# Run it only in a system that was made for it, because it uses the system's real database.
#
#   packages_in_use.sh VERSION
set -euo pipefail
cd "$(dirname "$0")"

version=$1
data=/var/packages/Keyloft/target/etc

fail() {
  echo "packages in use: $1" >&2
  exit 1
}

install() { # PACKAGE...: installs them as an administrator does
  if ! apt-get install --yes --no-install-recommends "$@" >install.log 2>&1; then
    tail -n 20 install.log >&2
    return 1
  fi
}

expect() { # CODE OUTPUT COMMAND...: compares the exit code and the whole standard output
  local code=0 output
  output=$("${@:3}" 2>said) || code=$?
  [ "$code" -eq "$1" ] || fail "${*:3} ended with $code, not $1: $(<said)"
  [ "$output" = "$2" ] || fail "${*:3} said: $output"
}

status_of() { dpkg-query --show --showformat='${db:Status-Status}' "$1" 2>/dev/null || true; }

# The stand-ins are installed only if they are named.
if install "./libzevooauth1_${version}"_*.deb "./oauthctl_${version}"_*.deb 2>refused; then
  fail "the packages install without the host's libraries"
fi
grep -q 'libzevocore6' refused || fail "apt does not name the host's library: $(<refused)"
install ./{libzevooauth1,oauthctl,zevooauth-standins}"_${version}"_*.deb
echo "packages in use: installed"

# An operator registers a client.
expect 3 '' oauthctl client list # there is no database yet
mkdir -p "$data"
umask 077
client=$(oauthctl client add --name 'Photo album' --redirect-uri https://album.example/callback \
  --scope 'read write')
[[ $client =~ client_id\ +([0-9a-f]{64}) ]] || fail "no client: $client"
expect 0 $'ID NAME        ENABLED REDIRECT URI           SCOPE\n'\
' 1 Photo album yes     album.example/callback read write' oauthctl client list

# A programmer compiles against the library, and the program issues a token.
install "./libzevooauth-dev_${version}"_*.deb g++ cmake ninja-build
# shellcheck disable=SC2016 # the marks of a code block
sed -n '/^```cpp$/,/^```$/{/^```/!p}' README.md >example.cpp
read -ra options <<<"$(pkg-config --cflags --libs zevooauth)"
g++ -std=c++17 example.cpp "${options[@]}" -o example
expect 0 'hello alice' ./example
cmake -G Ninja -S install -B consumer >install.log
cmake --build consumer >install.log
expect 0 'alice 64' consumer/consumer
echo "packages in use: the example compiles against the packages"

# The operator looks at the token, revokes it, disables the client, and checks and saves the data.
token=$(oauthctl token show 1 --show-secrets | sed -n 's/^access_token *//p')
[ "$(oauthctl token verify <<<"$token" | sed -n 's/^user *//p')" = alice ] || fail "no token of alice"
expect 0 'deleted 1 token' oauthctl token revoke --user alice --yes
expect 1 '' oauthctl token verify <<<"$token"
grep -qx 'oauthctl: not valid: no such access token' said ||
  fail "oauthctl token verify said: $(<said)"
expect 0 'client 1 is disabled' oauthctl client disable 1
oauthctl status >/dev/null
oauthctl check
oauthctl backup before-upgrade.db
man_page=/usr/share/man/man1/oauthctl.1.gz
if [ ! -s "$man_page" ] && ! grep -qs usr/share/man /etc/dpkg/dpkg.cfg.d/*; then
  fail "there is no manual page"
fi
echo "packages in use: oauthctl shows, revokes, checks and backs up"

# The upgrade and the removal must not change the database.
fingerprint() { find "$data" -type f -exec sha256sum {} + -exec stat --format '%n %a %u %s' {} + | sort; }
before=$(fingerprint)
listed=$(oauthctl client list)

install ./new/{libzevooauth1,libzevooauth-dev,oauthctl,zevooauth-standins}"_${version}+next"_*.deb
for package in libzevooauth1 libzevooauth-dev oauthctl zevooauth-standins; do
  [ "$(dpkg-query --show --showformat='${Version}' $package)" = "$version+next" ] ||
    fail "$package is not upgraded"
done
[ "$(fingerprint)" = "$before" ] || fail "the upgrade changed the database"
expect 0 "$listed" oauthctl client list
expect 0 'hello alice' ./example # compiled before the upgrade
before=$(fingerprint)
echo "packages in use: upgraded"

apt-get purge --yes libzevooauth1 libzevooauth-dev oauthctl zevooauth-standins >install.log 2>&1
for package in libzevooauth1 libzevooauth-dev oauthctl zevooauth-standins; do
  [ -z "$(status_of $package)" ] || fail "$package is still there: $(status_of $package)"
done
[ "$(fingerprint)" = "$before" ] || fail "the removal touched the database"
[ -z "$(find /usr -name '*zevo*' -o -name '*oauthctl*')" ] ||
  fail "left behind: $(find /usr -name '*zevo*' -o -name '*oauthctl*')"
echo "packages in use: removed, and the database is as it was"
