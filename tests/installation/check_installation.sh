#!/bin/sh
# usage: check_installation.sh BUILD_FOLDER PROJECT_FOLDER COMPILER    Installs the build into a fresh folder, moves that
# folder, and builds a foreign project against it, once by the CMake package and once by pkg-config.
set -eu
build=$1 project=$2 compiler=$3
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
expected='120 1 fileindex_photo'

run() { "$@" >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }; }
check() { [ "$("$@")" = "$expected" ] || { echo "wrong answer from $*"; exit 1; }; }

run cmake --install "$build" --prefix "$work/first"
mv "$work/first" "$work/moved"
run cmake -G Ninja -S "$project" -B "$work/cmake" -DCMAKE_PREFIX_PATH="$work/moved" -DCMAKE_CXX_COMPILER="$compiler"
run cmake --build "$work/cmake" -j2
check "$work/cmake/uses_fileindex"

PKG_CONFIG_PATH=$(dirname "$(find "$work/moved" -name libfileindex.pc)")
LD_LIBRARY_PATH=$(dirname "$PKG_CONFIG_PATH")
export PKG_CONFIG_PATH LD_LIBRARY_PATH
flags=$(pkg-config --cflags --libs libfileindex)
# shellcheck disable=SC2086
run "$compiler" -std=c++20 "$project/main.cpp" -o "$work/by_pkg_config" $flags
check "$work/by_pkg_config"
