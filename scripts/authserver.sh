#!/usr/bin/env bash
# Starts the example authorization server on this machine, with a user and a client to try it with.
#
#   scripts/authserver.sh [--port N]     uses port 8080 if no other is given
#
# Installs what is missing (scripts/packages.sh, groups build and authserver). The server's files
# lie in a private /var (scripts/lib/private-var.sh). Ctrl-C ends the server and removes them.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/.."

port=8080
if [ $# -eq 2 ] && [ "$1" = --port ] && [[ $2 =~ ^[0-9]+$ ]]; then
  port=$2
elif [ $# -ne 0 ]; then
  echo "usage: scripts/authserver.sh [--port N]" >&2
  exit 2
fi

answers() { (: <"/dev/tcp/127.0.0.1/$port") 2>/dev/null; }

need_free_port() {
  if answers; then
    echo "authserver: another program uses port $port" >&2
    exit 1
  fi
}

serve() {
  local password verifier challenge client id secret server
  local callback=$AUTHSERVER_ISSUER/album.html
  password=$(head -c 9 /dev/urandom | basenc --base64url)
  verifier=$(head -c 32 /dev/urandom | basenc --base64url | tr -d '=')
  challenge=$(printf %s "$verifier" | sha256sum | cut -c 1-64 | tr a-f A-F |
    basenc --base16 --decode | basenc --base64url | tr -d '=')

  "$AUTHSERVER_SETUP" init "$AUTHSERVER_FOLDER" --issuer "$AUTHSERVER_ISSUER"
  "$AUTHSERVER_SETUP" add-user "$AUTHSERVER_FOLDER" alice --display-name 'Alice Miller' \
    <<<"$password"
  client=$("$AUTHSERVER_SETUP" add-client --redirect-uri "$callback" --scope 'read profile' \
    --name 'Photo album')
  id=$(grep -oP '"client_id" : "\K\w+' <<<"$client")
  secret=$(grep -oP '"client_secret" : "\K\w+' <<<"$client")

  need_free_port
  lighttpd -D -f "${AUTHSERVER_SETUP%/*}/lighttpd.conf" &
  server=$!
  trap 'kill "$server" 2>/dev/null || true' INT TERM
  until answers; do
    if ! kill -0 "$server" 2>/dev/null; then
      echo "authserver: the web server did not start on port $port" >&2
      exit 1
    fi
    sleep 0.1
  done

  cat <<TEXT

Open this address in a browser, and log in as alice with the password $password :

  $AUTHSERVER_ISSUER/authorize?response_type=code&client_id=$id&redirect_uri=${callback//\//%2F}&state=anything&code_challenge=$challenge&code_challenge_method=S256

Take the code from the address that the browser shows then, and exchange it for tokens:

  curl -u $id:$secret -d grant_type=authorization_code \\
    -d redirect_uri=$callback -d code_verifier=$verifier \\
    -d code=CODE $AUTHSERVER_ISSUER/token

Then read the user's data with the access token, inspect the token, and get the next one:

  curl -H 'Authorization: Bearer ACCESS_TOKEN' $AUTHSERVER_ISSUER/userinfo
  curl -u $id:$secret -d token=ACCESS_TOKEN $AUTHSERVER_ISSUER/introspect
  curl -u $id:$secret -d grant_type=refresh_token \\
    -d refresh_token=REFRESH_TOKEN $AUTHSERVER_ISSUER/token

authserver: running on $AUTHSERVER_ISSUER until Ctrl-C
TEXT
  while kill -0 "$server" 2>/dev/null; do wait "$server" || true; done # a signal ends a wait
  echo "authserver: the server has ended, and its files are removed"
}

# The last command of this script runs it again in the private /var, with this variable set.
if [ "${AUTHSERVER_FOLDER-}" = /var/authserver ]; then
  port=$AUTHSERVER_PORT
  serve
  exit
fi

# Check this first, because building takes a minute.
if [ "$port" -gt 65535 ] || [ "$port" -lt "$([ "$(id -u)" -eq 0 ] && echo 1 || echo 1024)" ]; then
  echo "authserver: you cannot use port $port" >&2
  exit 1
fi
need_free_port
scripts/lib/private-var.sh true
scripts/packages.sh build authserver
build=$(scripts/build.sh release release -DZEVOOAUTH_BUILD_AUTHSERVER=ON \
  -DZEVOOAUTH_BUILD_TESTS=OFF -- authserver | tail -n 1)
PATH=$PATH:/usr/sbin \
  AUTHSERVER_PORT=$port \
  AUTHSERVER_ISSUER=http://127.0.0.1:$port \
  AUTHSERVER_SOURCE=$PWD/examples/authserver \
  AUTHSERVER_PROGRAMS=$build/examples/authserver/cgi \
  AUTHSERVER_SETUP=$build/examples/authserver/authserver_setup \
  AUTHSERVER_FOLDER=/var/authserver \
  exec scripts/lib/private-var.sh scripts/authserver.sh
