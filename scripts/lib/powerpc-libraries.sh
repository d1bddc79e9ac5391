#!/usr/bin/env bash
# Builds the libraries that the PowerPC target needs from Debian's source packages: SQLite, JsonCpp,
# GoogleTest, nettle and util-linux's libsmartcols. Boost and CLI11 are headers only, so those of
# this machine are used.
#
#   scripts/lib/powerpc-libraries.sh FOLDER
#
# A library that FOLDER has already is not built again. The system's package configuration is not
# changed: sources are fetched with another one, which is made from the system's package sources.
set -euo pipefail
cd "$(dirname "$(readlink -f "$0")")/../.."

trap '[ $? -eq 0 ] || echo "powerpc-libraries: failed" >&2' EXIT
host=powerpc-linux-gnu
mkdir -p "$1"
prefix=$(cd "$1" && pwd)
work=$prefix/work
# The library itself is built with large files and 64-bit times, too.
flags=(-O2 -D_FILE_OFFSET_BITS=64 -D_TIME_BITS=64)

fetch() { # PACKAGE: puts its source tree into $work/PACKAGE
  local apt=$work/apt
  if [ ! -e "$apt/updated" ]; then
    mkdir -p "$apt/lists/partial" "$apt/cache/archives/partial"
    # shellcheck disable=SC2016 # apt-get expands these itself
    apt-get indextargets --format 'deb-src $(REPO_URI) $(RELEASE) $(COMPONENT)' \
      'Created-By: Packages' 'Origin: Debian' | sort -u >"$apt/sources.list"
    cat >"$apt/apt.conf" <<END
Dir::Etc::SourceList "$apt/sources.list";
Dir::Etc::SourceParts "/dev/null";
Dir::State::Lists "$apt/lists";
Dir::Cache "$apt/cache";
APT::Sandbox::User "root";
END
    APT_CONFIG=$apt/apt.conf apt-get update -qq --error-on=any
    touch "$apt/updated"
  fi
  rm -rf "${work:?}/$1" "$work/download"
  mkdir "$work/download"
  (cd "$work/download" && APT_CONFIG=$apt/apt.conf apt-get source -qq "$1" >/dev/null)
  mv "$work"/download/*/ "$work/$1"
}

cross_cmake() { # PACKAGE OPTION...
  cmake -S "$work/$1" -B "$work/$1/cross" -G Ninja -DCMAKE_SYSTEM_NAME=Linux \
    -DCMAKE_SYSTEM_PROCESSOR=ppc -DCMAKE_C_COMPILER=$host-gcc -DCMAKE_CXX_COMPILER=$host-g++ \
    -DCMAKE_C_FLAGS="${flags[*]}" -DCMAKE_CXX_FLAGS="${flags[*]}" -DCMAKE_BUILD_TYPE=Release \
    -DCMAKE_INSTALL_PREFIX="$prefix" -DCMAKE_INSTALL_LIBDIR=lib "${@:2}"
  cmake --build "$work/$1/cross"
  cmake --install "$work/$1/cross"
}

# sqlite3.c is made with the native compiler, because this builds and runs helper programs. Without
# usleep(), a connection that waits for another one sleeps whole seconds, and gives up after five.
build_sqlite3() {
  (cd "$work/sqlite3" && ./configure && make sqlite3.c sqlite3.h)
  $host-gcc "${flags[@]}" -fPIC -shared -Wl,-soname,libsqlite3.so.0 -DSQLITE_THREADSAFE=1 \
    -DSQLITE_SECURE_DELETE -DSQLITE_ENABLE_COLUMN_METADATA -DSQLITE_ENABLE_UNLOCK_NOTIFY \
    -DHAVE_USLEEP=1 -DHAVE_FDATASYNC=1 \
    -o "$prefix/lib/libsqlite3.so.0" "$work/sqlite3/sqlite3.c"
  ln -sf libsqlite3.so.0 "$prefix/lib/libsqlite3.so"
  cp "$work/sqlite3/sqlite3.h" "$prefix/include/"
}

build_libjsoncpp() {
  cross_cmake libjsoncpp -DJSONCPP_WITH_TESTS=OFF -DJSONCPP_WITH_POST_BUILD_UNITTEST=OFF \
    -DBUILD_OBJECT_LIBS=OFF -DBUILD_STATIC_LIBS=OFF -DBUILD_SHARED_LIBS=ON
}

build_googletest() {
  cross_cmake googletest
}

build_nettle() {
  cd "$work/nettle"
  touch aclocal.m4 configure stamp-h.in # newer than their sources, so that make keeps them
  CFLAGS="${flags[*]}" ./configure --host=$host --prefix="$prefix" --libdir="$prefix/lib" \
    --disable-public-key --disable-assembler --disable-static --disable-openssl \
    --disable-documentation
  make -j"$(nproc)" libnettle.so
  make install-shared-nettle install-headers install-pkgconfig
}

build_util-linux() {
  cd "$work/util-linux"
  touch aclocal.m4 configure Makefile.in config.h.in # as above
  CFLAGS="${flags[*]}" ./configure --host=$host --prefix="$prefix" --libdir="$prefix/lib" \
    --disable-all-programs --enable-libsmartcols --disable-static --disable-nls --disable-asciidoc \
    --without-ncursesw --without-tinfo --without-systemd --without-udev
  make -j"$(nproc)" install
}

mkdir -p "$prefix/include" "$prefix/lib" "$work"
ln -sfn /usr/include/boost "$prefix/include/boost"
ln -sfn /usr/include/CLI "$prefix/include/CLI"
missing=()
for package in sqlite3 libjsoncpp googletest nettle util-linux; do
  if [ ! -e "$prefix/$package.done" ]; then
    fetch "$package"
    missing+=("$package")
  fi
done

# Build all packages at once, because a configure script keeps only one core busy.
builds=()
for package in "${missing[@]}"; do
  echo "powerpc-libraries: building $package"
  (build_"$package") >"$work/$package.log" 2>&1 &
  builds+=("$!")
done
for i in "${!builds[@]}"; do
  package=${missing[i]}
  if ! wait "${builds[i]}"; then
    tail -n 40 "$work/$package.log"
    echo "powerpc-libraries: could not build $package" >&2
    failed=yes
  else
    touch "$prefix/$package.done"
    rm -rf "${work:?}/$package"
  fi
done
[ -z "${failed-}" ] || exit 1
echo "powerpc-libraries: $prefix is ready"
