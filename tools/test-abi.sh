#!/usr/bin/env bash
# Builds the library and its tests for one Android ABI and runs the GoogleTest programs, the traces
# and the other tests inside tools/dlp-sandbox. x86_64 is the native build; the others are built by
# Debian's cross compilers (cmake/toolchain-ABI.cmake) in build-abi/ABI, beside a native device
# stand-in. Code the kernel cannot run itself runs under qemu-user, registered with binfmt_misc in
# a private user namespace, so that a test may start programs of its ABI; the machine's binfmt_misc
# stays untouched. The tests then see DLP_EMULATOR set. The last line printed is
# "ABI: N passed, M failed, K skipped", counting GoogleTest cases and the other tests; exit 0 means
# everything passed.
# Usage: tools/test-abi.sh x86_64|x86|arm64|armv7
set -euo pipefail

# Inside the user namespace: registers the emulator, then runs the command.
if [[ ${1:-} == --emulated ]]; then
  binfmt=$2/binfmt_misc
  mkdir -p "$binfmt"
  mount -t binfmt_misc dlp-binfmt "$binfmt"
  # F: the emulator is opened now, so that it runs behind the sandbox's new root too.
  printf '%s' "$3" >"$binfmt/register"
  shift 3
  exec "$@"
fi
cd "$(dirname "$0")/.."

# The start of each ABI's executables (ELF class, data, version, padding, type, machine) and the
# mask binfmt_misc compares it under.
readonly padding='\x00\x00\x00\x00\x00\x00\x00\x00\x00'
readonly elf_mask='\xff\xff\xff\xff\xff\xff\xff\x00\xff\xff\xff\xff\xff\xff\xff\xff\xfe\xff\xff\xff'
abi=${1:-}
case $abi in
  x86_64) ;;
  x86) emulator=i386 header="\x7fELF\x01\x01\x01$padding\x02\x00\x03\x00" ;;
  arm64) emulator=aarch64 header="\x7fELF\x02\x01\x01$padding\x02\x00\xb7\x00" ;;
  armv7) emulator=arm header="\x7fELF\x01\x01\x01$padding\x02\x00\x28\x00" ;;
  *)
    echo "usage: $0 x86_64|x86|arm64|armv7" >&2
    exit 2
    ;;
esac

native=${DLP_BUILD_DIR:-build}
cmake -S . -B "$native" -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_TESTS=ON >/dev/null
if [[ $abi == x86_64 ]]; then
  build=$native
  cmake --build "$build" -j "$(nproc)"
else
  build=build-abi/$abi
  cmake --build "$native" -j "$(nproc)" --target zmk_dlp_stand_in
  cmake -S . -B "$build" -DCMAKE_TOOLCHAIN_FILE="cmake/toolchain-$abi.cmake" \
    -DCMAKE_BUILD_TYPE=Release -DDLP_BUILD_TESTS=ON --no-warn-unused-cli \
    -DDLP_DEVICE_STAND_IN="$PWD/$native/tools/zmk_dlp_stand_in/zmk_dlp_stand_in" >/dev/null
  cmake --build "$build" -j "$(nproc)"
fi

results=$PWD/$build/test-results
rm -rf "$results"
mkdir -p "$results"
runner=()
if [[ $abi != x86_64 ]] && ! "$build/tools/dlpctl/dlpctl" --help >/dev/null 2>&1; then
  echo "test-abi: the kernel does not run $abi code: running it under qemu-$emulator-static"
  export DLP_EMULATOR=qemu-$emulator-static
  runner=(unshare --user --map-root-user --mount --propagation private --
    "$PWD/tools/test-abi.sh" --emulated "$PWD/$build"
    ":dlp-$emulator:M::$header:$elf_mask:/usr/bin/$DLP_EMULATOR:PF")
fi
status=0
(cd "$build" &&
  GTEST_OUTPUT=json:$results/ "${runner[@]}" ctest --output-on-failure -j "$(nproc)") |
  tee "$results/ctest.log" || status=$?

# Each test program's cases from its report; a test without one (a trace, a script, a program
# that crashed) counts as one, by ctest's verdict.
passed=0 failed=0 skipped=0
while read -r name verdict; do
  report=$results/$name.json
  if [[ -f $report ]]; then
    read -r case_passed case_failed case_skipped < <(jq -r '[.testsuites[].testsuite[]] |
      [map(select(.failures == null and .result != "SKIPPED")), map(select(.failures != null)),
       map(select(.failures == null and .result == "SKIPPED"))] | map(length) | @tsv' "$report")
    ((passed += case_passed, failed += case_failed, skipped += case_skipped)) || true
    [[ $verdict == Passed ]] || ((case_failed > 0)) || ((++failed))
  elif [[ $verdict == Passed ]]; then
    ((++passed))
  elif [[ $verdict == Skipped ]]; then
    ((++skipped))
  else
    ((++failed))
  fi
done < <(sed -nE 's/^ *[0-9]+\/[0-9]+ Test +#[0-9]+: ([^ ]+) \.*(\*\*\*)? *([A-Za-z]+).*/\1 \3/p' \
  "$results/ctest.log")
# Why each case was skipped, as its program said it.
awk '/: Skipped$/ { where = $1; getline; print "test-abi: skipped at " where " " $0 }' \
  "$build/Testing/Temporary/LastTest.log"
((status == 0 && failed == 0 && passed > 0)) || status=1
echo "$abi: $passed passed, $failed failed, $skipped skipped"
exit "$status"
