#!/usr/bin/env bash
# Installs the built library into a scratch prefix and builds one outside program against it both
# ways other builds find it, find_package(dlp_sdk CONFIG) and pkg-config, then runs both; every
# installed header must also compile on its own.
# Usage: install_test.sh BUILD_DIR PROJECT_VERSION
set -euo pipefail
build_dir=$1
version=$2
consumer=$(cd "$(dirname "$0")/install_consumer" && pwd)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
prefix=$work/prefix

cmake --install "$build_dir" --prefix "$prefix" >/dev/null
export PKG_CONFIG_PATH=$prefix/lib/pkgconfig
pkg-config --exact-version="$version" dlp_sdk || { echo "dlp_sdk.pc is not version $version" >&2; exit 1; }
read -ra cflags < <(pkg-config --cflags dlp_sdk)
read -ra libs < <(pkg-config --libs dlp_sdk)

for header in "$prefix"/include/dlp_sdk/*.h; do
  echo "#include <dlp_sdk/${header##*/}>" |
    g++ -std=c++17 -Wall -Wextra -Werror "${cflags[@]}" -x c++ -fsyntax-only -
done

g++ -std=c++17 -Wall -Wextra -Werror "${cflags[@]}" "$consumer/consumer.cpp" "${libs[@]}" \
  -Wl,-rpath,"$(pkg-config --variable=libdir dlp_sdk)" -o "$work/pkg-config-consumer"
cmake -S "$consumer" -B "$work/cmake-consumer" -DCMAKE_PREFIX_PATH="$prefix" \
  -DDLP_SDK_EXPECTED_VERSION="$version" >/dev/null
cmake --build "$work/cmake-consumer" >/dev/null

for program in "$work/pkg-config-consumer" "$work/cmake-consumer/consumer"; do
  if ! output=$("$program" 2>/dev/null) || [ "$output" != "2 -1 0" ]; then
    echo "${program##*/} failed, printing '$output'" >&2
    exit 1
  fi
done
# The program runs from the prefix, against the installed library, its sandbox beside it.
test -x "$prefix/bin/dlp-sandbox"
touch "$prefix/unstamped"
output=$("$prefix/bin/dlpctl" show "$prefix/unstamped")
[ "$output" = "$prefix/unstamped: no expiry" ] || { echo "dlpctl printed '$output'"; exit 1; }
echo "installed package found by CMake and by pkg-config; both consumers and dlpctl run"
