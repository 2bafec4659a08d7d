#!/usr/bin/env bash
# Builds the library and runs its built-in example in the private sandbox, where the fixed
# database path exists without touching the machine's own /data. Pass --verbose to see the
# library's log.
set -euo pipefail
cd "$(dirname "$0")/.."

tools/setup.sh
build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build "$build" -j "$(nproc)" --target dlp_demo >/dev/null
exec tools/dlp-sandbox "$build/dlp_demo" "$@"
