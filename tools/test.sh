#!/usr/bin/env bash
# The project's test command: installs what is missing, builds everything, checks the formatting,
# Android.bp and a libc++ build's exports, and runs every test, then again under sanitizers, and the
# fuzzers (tools/sanitizers.sh).
set -euo pipefail
cd "$(dirname "$0")/.."

tools/setup.sh

build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_TESTS=ON
cmake --build "$build" -j "$(nproc)"

tools/check-format.sh
tools/check-android-bp.sh "$build"
tools/check-libcxx-exports.sh "$build"

(cd "$build" && ctest --output-on-failure -j "$(nproc)")

# Every hot-path benchmark once, briefly: it fails when a case no longer takes its road.
DLP_BUILD_DIR=$build tools/benchmark.sh --quick >/dev/null

# The tests again under sanitizers, and the fuzzers.
tools/sanitizers.sh
