#!/usr/bin/env bash
# Installs a build into a temporary folder, compiles a program against it with CMake and with
# pkg-config, and runs both.
#
#   install_test.sh BUILD VERSION COMPILER [FLAG...]
set -euo pipefail

build=$1 version=$2 compiler=$3 flags="${*:4}"
source=$(cd "$(dirname "$0")" && pwd)/install
folder=$(mktemp --directory --tmpdir zevooauth-install-XXXXXX)
trap 'rm -rf "$folder"' EXIT
cd "$folder"

cmake --install "$build" --prefix "$folder/tree" >install.log

(cd tree && find . ! -type d ! -path './share/doc/*' | sort) |
  sed 's/Targets-[a-z]*/Targets-BUILD_TYPE/' >installed
diff -u - installed <<END
./bin/oauthctl
./include/zevooauth/oauth_clientInfo.h
./include/zevooauth/oauth_db_basic.h
./include/zevooauth/oauth_grantCode.h
./include/zevooauth/oauth_log.h
./include/zevooauth/oauth_token.h
./include/zevooauth/oauth_utils.h
./lib/cmake/ZevoOAuth/ZevoOAuthConfig.cmake
./lib/cmake/ZevoOAuth/ZevoOAuthConfigVersion.cmake
./lib/cmake/ZevoOAuth/ZevoOAuthTargets-BUILD_TYPE.cmake
./lib/cmake/ZevoOAuth/ZevoOAuthTargets.cmake
./lib/libzevooauth.so
./lib/libzevooauth.so.1
./lib/libzevooauth.so.$version
./lib/pkgconfig/zevooauth.pc
./share/bash-completion/completions/oauthctl
./share/man/man1/oauthctl.1
END
test -s tree/share/doc/zevooauth/docs/operations.md
test -s tree/share/doc/zevooauth/CHANGELOG.md
dead=$(cd tree/share/doc/zevooauth && grep -roP '\]\(\K[^):#]+' --include='*.md' . |
  while IFS=: read -r page target; do
    [ -e "$(dirname "$page")/$target" ] || echo "$page links to $target"
  done)
if [ -n "$dead" ]; then
  echo "install: links that lead nowhere: $dead" >&2
  exit 1
fi
cmake --install "$build" --prefix "$folder/host" --component standins >>install.log
(cd host && find . ! -type d | sort) >installed
diff -u - installed <<'END'
./lib/libzevocgi.so.6
./lib/libzevocore.so.6
END
for program in tree/bin/oauthctl tree/lib/libzevooauth.so host/lib/*.so.6; do
  if readelf --dynamic "$program" | grep -E 'RPATH|RUNPATH'; then
    echo "install: $program looks for libraries where it was built" >&2
    exit 1
  fi
done

mv tree moved # no file in it may depend on its old place
export LD_LIBRARY_PATH=$folder/moved/lib:$folder/host/lib
expected="alice 64"

CXXFLAGS=$flags cmake -G Ninja -S "$source" -B by-cmake -DCMAKE_CXX_COMPILER="$compiler" \
  -DCMAKE_PREFIX_PATH="$folder/moved" >cmake.log
cmake --build by-cmake >>cmake.log
test "$(by-cmake/consumer)" = "$expected"

export PKG_CONFIG_PATH=$folder/moved/lib/pkgconfig
test "$(pkg-config --modversion zevooauth)" = "$version"
# xargs removes the escapes of pkg-config.
mapfile -t options < <(pkg-config --cflags --libs zevooauth | xargs printf '%s\n')
# shellcheck disable=SC2086 # each flag is one word
"$compiler" -std=c++17 $flags "$source/consumer.cpp" "${options[@]}" -o by-pkg-config
test "$(./by-pkg-config)" = "$expected"
echo "install: a program compiles against the installed library by CMake and by pkg-config"
