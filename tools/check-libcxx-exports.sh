#!/usr/bin/env bash
# Builds the library a second time with clang, libc++ and lld, as the platform builds it, and checks
# that it exports the same functions and data as the libstdc++ build in BUILD_DIR. Only the library
# is built, in BUILD_DIR/libcxx.
# Usage: tools/check-libcxx-exports.sh BUILD_DIR
set -euo pipefail
cd "$(dirname "$0")/.."
build=$1
libcxx_build=$build/libcxx

cmake -S . -B "$libcxx_build" -DCMAKE_BUILD_TYPE=Release -DCMAKE_CXX_COMPILER=clang++ \
  -DCMAKE_CXX_FLAGS=-stdlib=libc++ -DCMAKE_SHARED_LINKER_FLAGS=-fuse-ld=lld >/dev/null
cmake --build "$libcxx_build" --target dlp_sdk -j "$(nproc)"

# Without this the comparison could pass with two libstdc++ builds.
if ! readelf -d "$libcxx_build/libdlp_sdk.so" | grep -q 'NEEDED.*\[libc++\.so'; then
  echo "check-libcxx-exports: $libcxx_build/libdlp_sdk.so is not linked with libc++" >&2
  exit 1
fi
tools/check-exports.sh "$build/libdlp_sdk.so" "$libcxx_build/libdlp_sdk.so"
