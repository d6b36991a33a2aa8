#!/usr/bin/env bash
# Installs the built library into a scratch prefix, then builds a host program against it
# twice, through the CMake package and through pkg-config, and runs both.
# Usage: check-install.sh BUILD_DIR WORK_DIR
set -euo pipefail
build=$(cd "$1" && pwd)
mkdir -p "$2"
work=$(cd "$2" && pwd)
here=$(cd "$(dirname "$0")" && pwd)
rm -rf "$work"
mkdir -p "$work"
prefix="$work/prefix"
cmake --install "$build" --prefix "$prefix" >/dev/null
# The consumer is built without sanitizers; the library under test may have them.
sanitize=$(grep -q 'CORVEL_SANITIZE:BOOL=ON' "$build/CMakeCache.txt" && echo "-fsanitize=address,undefined" || true)
cmake -S "$here/consumer" -B "$work/cmake" -DCMAKE_PREFIX_PATH="$prefix" \
  -DCMAKE_CXX_FLAGS="$sanitize" >/dev/null
cmake --build "$work/cmake" >/dev/null
# Both lines share a left edge: one column, joined by a line feed.
expected=$'A heading\nFirst line|## Title\n'
export LD_LIBRARY_PATH="$prefix/lib:${LD_LIBRARY_PATH:-}"
got=$("$work/cmake/consumer"; echo x)
[[ "${got%x}" == "$expected" ]] || { echo "cmake consumer printed: ${got%x}"; exit 1; }
libdir=$(ls -d "$prefix"/lib*/pkgconfig | head -1)
flags=$(PKG_CONFIG_PATH="$libdir" pkg-config --cflags --libs Corvelbase)
# shellcheck disable=SC2086
c++ $sanitize "$here/consumer/main.cpp" $flags -o "$work/pkgconfig-consumer"
got=$(LD_LIBRARY_PATH="$(dirname "$libdir")" "$work/pkgconfig-consumer"; echo x)
[[ "${got%x}" == "$expected" ]] || { echo "pkg-config consumer printed: ${got%x}"; exit 1; }
echo "installed library found through CMake and pkg-config"
