#!/bin/sh
# Installs the build tree into a scratch prefix and builds a C host program
# against it twice: through pkg-config and through the CMake package.
set -eu
build_dir=$1
src_dir=$(cd "$(dirname "$0")" && pwd)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cmake --install "$build_dir" --prefix "$work/prefix" >/dev/null
PKG_CONFIG_PATH=$(dirname "$(find "$work/prefix" -name lumicor.pc)")
export PKG_CONFIG_PATH
cc "$src_dir/consumer.c" $(pkg-config --cflags --libs lumicor) -o "$work/consumer-pc"
libdir=$(pkg-config --variable=libdir lumicor)
LD_LIBRARY_PATH=$libdir "$work/consumer-pc"
cmake -S "$src_dir" -B "$work/cmake-build" -DCMAKE_PREFIX_PATH="$work/prefix" >/dev/null
cmake --build "$work/cmake-build" >/dev/null
LD_LIBRARY_PATH=$libdir "$work/cmake-build/consumer"
