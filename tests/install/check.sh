#!/usr/bin/env bash
# Installs the built library into a scratch prefix and builds a consumer against it, once
# through find_package(Maroset) and once through pkg-config.
set -euo pipefail
build=$1 source=$2 scratch=$3
rm -rf "$scratch" && mkdir -p "$scratch"
cmake --install "$build" --prefix "$scratch/prefix" >/dev/null
cmake -S "$source/consumer" -B "$scratch/consumer" -G Ninja \
      -DCMAKE_PREFIX_PATH="$scratch/prefix" -DCMAKE_CXX_FLAGS="${CONSUMER_FLAGS:-}" >/dev/null
cmake --build "$scratch/consumer" >/dev/null
"$scratch/consumer/consumer"
export PKG_CONFIG_PATH="$scratch/prefix/lib/pkgconfig:$scratch/prefix/lib/x86_64-linux-gnu/pkgconfig"
g++ ${CONSUMER_FLAGS:-} -o "$scratch/pc-consumer" "$source/consumer/main.cpp" $(pkg-config --cflags --libs maroset)
"$scratch/pc-consumer"
