#!/usr/bin/env bash
# Builds the consumer hosts with nothing but pkg-config, as a non-CMake build would.
set -euo pipefail
prefix=$1
here=$(cd "$(dirname "$0")" && pwd)
out=$(mktemp -d)
export PKG_CONFIG_PATH="$prefix/lib/pkgconfig:$prefix/lib64/pkgconfig:$prefix/lib/x86_64-linux-gnu/pkgconfig"
cc -std=c99 "$here/host.c" $(pkg-config --cflags --libs kel_images) -o "$out/c_host"
c++ -std=c++17 "$here/host.cpp" $(pkg-config --cflags --libs kel_images) -o "$out/cpp_host"
LD_LIBRARY_PATH="$prefix/lib" "$out/c_host"
LD_LIBRARY_PATH="$prefix/lib" "$out/cpp_host"
rm -rf "$out"
echo "pkg-config consumers: ok"
