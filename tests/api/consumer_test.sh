#!/usr/bin/env bash
# Installs the build into a scratch prefix and builds an application against
# it twice, with pkg-config and with find_package(tessel), as users would.
#   consumer_test.sh BUILD_DIR SOURCE_DIR CXX "EXTRA_FLAGS"
set -euo pipefail
build=$1 src=$2 cxx=$3 flags=${4:-}
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
prefix="$work/prefix"

cmake --install "$build" --prefix "$prefix" >"$work/install.log"
libdir=$(dirname "$(find "$prefix" -name 'libtessel.so.6' | head -n 1)")
[ -n "$libdir" ] || { echo "libtessel.so.6 was not installed"; exit 1; }
[ -L "$libdir/libtessel.so" ] || { echo "no libtessel.so development link"; exit 1; }
[ -f "$prefix/include/tessel/tessel.h" ] || { echo "no <tessel/tessel.h>"; exit 1; }
soname=$(objdump -p "$libdir/libtessel.so.6" | awk '$1 == "SONAME" {print $2}')
[ "$soname" = libtessel.so.6 ] || { echo "SONAME is '$soname'"; exit 1; }

export PKG_CONFIG_PATH="$libdir/pkgconfig"
# shellcheck disable=SC2046,SC2086
"$cxx" -std=c++17 $flags -o "$work/app" "$src/tests/api/consumer/app.cc" $(pkg-config --cflags --libs tessel)
LD_LIBRARY_PATH="$libdir" "$work/app"

cmake -S "$src/tests/api/consumer" -B "$work/cmake" -DCMAKE_PREFIX_PATH="$prefix" \
  -DCMAKE_CXX_COMPILER="$cxx" -DCMAKE_CXX_FLAGS="$flags" -DCMAKE_EXE_LINKER_FLAGS="$flags" >"$work/cmake.log" \
  || { cat "$work/cmake.log"; exit 1; }
cmake --build "$work/cmake" >"$work/build.log" || { cat "$work/build.log"; exit 1; }
LD_LIBRARY_PATH="$libdir" "$work/cmake/consumer"
