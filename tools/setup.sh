#!/usr/bin/env bash
# Installs the Debian packages that building and testing the library need; skips what is there.
set -euo pipefail

packages=(
  build-essential cmake pkg-config clang-format
  android-liblog-dev android-libbase-dev libsqlite3-dev sqlite3
  libgtest-dev libgmock-dev libbenchmark-dev
  libfuse3-dev fuse3 faketime util-linux mount attr
  openjdk-17-jdk-headless junit5
  clang lld libc++-dev libc++abi-dev blueprint-tools
  clang-14 libclang-rt-14-dev llvm-14
)

missing=()
for package in "${packages[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$package" 2>/dev/null | grep -q '^install ok installed$'; then
    missing+=("$package")
  fi
done

if ((${#missing[@]} == 0)); then
  exit 0
fi
if ((EUID != 0)); then
  echo "setup: missing packages ${missing[*]}; run as root to install them" >&2
  exit 1
fi
echo "setup: installing ${missing[*]}"
export DEBIAN_FRONTEND=noninteractive
apt-get update -qq
apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
