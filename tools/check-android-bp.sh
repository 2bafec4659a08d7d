#!/usr/bin/env bash
# Android.bp must be as bpfmt formats it and list in srcs the same sources as CMake's library
# target, which a configured CMake build writes to BUILD_DIR/dlp_sdk_sources.txt.
# Usage: tools/check-android-bp.sh BUILD_DIR
set -euo pipefail
cd "$(dirname "$0")/.."
build=$1

formatting=$(bpfmt -d Android.bp)
if [[ -n $formatting ]]; then
  printf '%s\n' "$formatting"
  echo "check-android-bp: Android.bp differs from what bpfmt makes of it" >&2
  exit 1
fi

# The module's srcs, one quoted name a line or all on the srcs line (bpfmt keeps one name there).
android_bp_sources=$(awk '
  /^    srcs: \[/ { in_srcs = 1 }
  in_srcs {
    line = $0
    while (match(line, /"[^"]*"/)) {
      print substr(line, RSTART + 1, RLENGTH - 2)
      line = substr(line, RSTART + RLENGTH)
    }
  }
  in_srcs && /\]/ { in_srcs = 0 }' Android.bp | sort)
cmake_sources=$(sort "$build/dlp_sdk_sources.txt")

if ! diff -u --label "CMake's DLP_SDK_SOURCES" --label "srcs of Android.bp" \
    <(printf '%s\n' "$cmake_sources") <(printf '%s\n' "$android_bp_sources"); then
  echo "check-android-bp: the srcs of Android.bp differ from CMake's library sources" >&2
  exit 1
fi
echo "check-android-bp: Android.bp is formatted and lists CMake's" \
  "$(wc -l <<<"$cmake_sources") sources"
