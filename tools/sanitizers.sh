#!/usr/bin/env bash
# Builds the library and its tests again with clang-14 under sanitizers and runs them: every test
# under AddressSanitizer (leaks included) and UndefinedBehaviorSanitizer in build-asan, the tests
# labelled concurrency under ThreadSanitizer in build-tsan, and each libFuzzer harness of tests/fuzz
# for FUZZ_SECONDS (20) on a scratch copy of its seed corpus in build-fuzz. Any report fails it.
# Usage: tools/sanitizers.sh [asan] [tsan] [fuzz]   (all three without an argument)
set -euo pipefail
cd "$(dirname "$0")/.."

readonly suppressions=$PWD/tools/sanitizers
readonly fuzz_seconds=${FUZZ_SECONDS:-20}
# faketime's clock is preloaded ahead of the ASan runtime, which the runtime takes for a mistake.
readonly asan_options=verify_asan_link_order=0:detect_stack_use_after_return=1:\
check_initialization_order=1:strict_init_order=1
readonly tsan_options=halt_on_error=1:exitcode=66:suppressions=$suppressions/tsan.supp
export ASAN_SYMBOLIZER_PATH=/usr/lib/llvm-14/bin/llvm-symbolizer
export UBSAN_OPTIONS=print_stacktrace=1

configure() {
  local directory=$1
  shift
  cmake -S . -B "$directory" -DCMAKE_BUILD_TYPE=RelWithDebInfo -DCMAKE_CXX_COMPILER=clang++-14 \
    "$@" >/dev/null
}

# The install test builds an outside project with the system compiler: it stays uninstrumented.
run_asan() {
  configure build-asan -DDLP_BUILD_TESTS=ON -DDLP_SANITIZE=address,undefined
  cmake --build build-asan -j "$(nproc)"
  (cd build-asan && ASAN_OPTIONS=$asan_options \
    ctest --output-on-failure -j "$(nproc)" -E '^install_test$')
}

run_tsan() {
  configure build-tsan -DDLP_BUILD_TESTS=ON -DDLP_SANITIZE=thread
  local count
  count=$(cd build-tsan && ctest -N -L concurrency | sed -n 's/^Total Tests: //p')
  if ((count == 0)); then
    echo "sanitizers: WARNING: no test is labelled concurrency, ThreadSanitizer runs nothing" >&2
    return
  fi
  cmake --build build-tsan -j "$(nproc)"
  (cd build-tsan && TSAN_OPTIONS=$tsan_options \
    ctest --output-on-failure -j "$(nproc)" -L concurrency)
}

# Every harness runs in the sandbox, since the command vector reaches the fixed paths, with its
# scratch files in the build tree (a tmpfs /tmp may refuse user attributes). A finding leaves its
# input in build-fuzz/runs/<harness>/, named in the log.
run_fuzzers() {
  configure build-fuzz -DDLP_BUILD_FUZZERS=ON
  cmake --build build-fuzz -j "$(nproc)" --target dlp_fuzzers
  local runs=$PWD/build-fuzz/runs source harness run executed
  rm -rf "$runs"
  for source in tests/fuzz/*.cpp; do
    harness=$(basename "$source" .cpp)
    run=$runs/$harness
    mkdir -p "$run/corpus"
    cp tests/fuzz/corpus/"$harness"/* "$run/corpus/"
    # Scratch files go to the harness's directory in the build tree.
    if ! (cd "$run" && "$OLDPWD/tools/dlp-sandbox" "$OLDPWD/build-fuzz/tests/fuzz/${harness}_fuzzer" \
        -max_total_time="$fuzz_seconds" -rss_limit_mb=2048 -timeout=10 -print_final_stats=1 \
        -artifact_prefix="$run/" "$run/corpus" >"$run/log" 2>&1); then
      tail -n 60 "$run/log" >&2
      echo "sanitizers: fuzzing $harness failed; the whole log is $run/log" >&2
      return 1
    fi
    executed=$(sed -n 's/^stat::number_of_executed_units: *//p' "$run/log")
    echo "sanitizers: $harness: ${executed:-?} inputs in ${fuzz_seconds} s, no finding"
  done
}

(($#)) || set -- asan tsan fuzz
for step; do
  case $step in
    asan) run_asan ;;
    tsan) run_tsan ;;
    fuzz) run_fuzzers ;;
    *)
      echo "usage: $0 [asan] [tsan] [fuzz]" >&2
      exit 2
      ;;
  esac
done
