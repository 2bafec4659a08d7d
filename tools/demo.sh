#!/usr/bin/env bash
# Builds the library and dlpctl, then runs dlpctl's built-in example, which goes through the
# private sandbox so that the fixed database path never touches the machine's own /data. Pass
# --verbose to see the library's log.
set -euo pipefail
cd "$(dirname "$0")/.."

options=()
for argument; do
    case $argument in
        --verbose) options+=(--log) ;;
        *)
            echo "usage: $0 [--verbose]" >&2
            exit 2
            ;;
    esac
done

tools/setup.sh
build=${DLP_BUILD_DIR:-build}
cmake -S . -B "$build" -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build "$build" -j "$(nproc)" --target dlpctl >/dev/null
exec "$build/tools/dlpctl/dlpctl" "${options[@]}" demo
