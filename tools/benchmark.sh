#!/usr/bin/env bash
# Prints what the hot paths cost: file open and file create, and lookups among many processes.
set -euo pipefail
cd "$(dirname "$0")/.."

tools/setup.sh
build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_BENCHMARKS=ON >/dev/null
cmake --build "$build" -j "$(nproc)" --target hot_paths_benchmark >/dev/null
exec tools/dlp-sandbox "$build/hot_paths_benchmark" "$@"
