#!/usr/bin/env bash
# The project's test command: installs what is missing, builds everything, checks the formatting,
# Android.bp and a libc++ build's exports, and runs every test on each Android ABI
# (tools/test-abi.sh), then natively again under sanitizers, and the fuzzers (tools/sanitizers.sh).
set -euo pipefail
cd "$(dirname "$0")/.."

tools/setup.sh

build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_TESTS=ON
cmake --build "$build" -j "$(nproc)"

tools/check-format.sh
tools/check-android-bp.sh "$build"
tools/check-libcxx-exports.sh "$build"

# Every test on each Android ABI: x86_64 is the build above, the others are cross-built.
for abi in x86_64 x86 arm64 armv7; do
  DLP_BUILD_DIR=$build tools/test-abi.sh "$abi"
done

# Every hot-path benchmark once, briefly: it fails when a case no longer takes its road.
DLP_BUILD_DIR=$build tools/benchmark.sh --quick >/dev/null

# The tests again under sanitizers, and the fuzzers.
tools/sanitizers.sh
