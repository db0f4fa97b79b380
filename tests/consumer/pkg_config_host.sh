#!/usr/bin/env bash
# Builds the consumer hosts with nothing but pkg-config, as a non-CMake build would.
set -euo pipefail
prefix=$1
here=$(cd "$(dirname "$0")" && pwd)
out=$(mktemp -d)
export PKG_CONFIG_PATH="$prefix/lib/pkgconfig:$prefix/lib64/pkgconfig:$prefix/lib/x86_64-linux-gnu/pkgconfig"
flags=$(pkg-config --cflags --libs kel_images)  # a separate step, so that a failure stops here
cc -std=c99 -Werror "$here/host.c" $flags -o "$out/c_host"
c++ -std=c++17 -Werror "$here/host.cpp" $flags -o "$out/cpp_host"
LD_LIBRARY_PATH="$prefix/lib" "$out/c_host"
LD_LIBRARY_PATH="$prefix/lib" "$out/cpp_host"
rm -rf "$out"
echo "pkg-config consumers: ok"
