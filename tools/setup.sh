#!/usr/bin/env bash
# Installs the Debian packages that building and testing the library need, for every ABI that
# tools/test-abi.sh builds; skips what is there, and calls apt-get only when something is missing.
set -euo pipefail

packages=(
  build-essential cmake pkg-config clang-format jq
  android-liblog-dev android-libbase-dev libsqlite3-dev sqlite3
  libgtest-dev libgmock-dev libbenchmark-dev
  libfuse3-dev fuse3 faketime util-linux mount attr
  openjdk-17-jdk-headless junit5
  clang lld libc++-dev libc++abi-dev blueprint-tools
  clang-14 libclang-rt-14-dev llvm-14
  g++-i686-linux-gnu g++-aarch64-linux-gnu g++-arm-linux-gnueabihf qemu-user-static
)
# What the other ABIs' builds link with and their tests preload, for each of their architectures.
foreign_architectures=(i386 arm64 armhf)
foreign_packages=(android-liblog-dev android-libbase-dev libsqlite3-dev libgtest-dev libgmock-dev
  libfaketime)
for architecture in "${foreign_architectures[@]}"; do
  packages+=("${foreign_packages[@]/%/:$architecture}")
done

# dpkg prints one status per installed architecture of a package: each is checked for the
# architecture it is needed for, the build machine's own unless named. A package built for every
# architecture says "all".
native_architecture=$(dpkg --print-architecture)
installed=$'\n'$(dpkg-query -W -f='${Package}:${Architecture} ${Status}\n' "${packages[@]%%:*}" \
  2>/dev/null || true)
is_installed() { [[ $installed == *$'\n'"$1 install ok installed"* ]]; }
missing=()
for package in "${packages[@]}"; do
  if [[ $package == *:* ]]; then
    is_installed "$package" || missing+=("$package")
  else
    is_installed "$package:$native_architecture" || is_installed "$package:all" ||
      missing+=("$package")
  fi
done
known_architectures=" $(dpkg --print-foreign-architectures | tr '\n' ' ') "
new_architectures=()
for architecture in "${foreign_architectures[@]}"; do
  [[ $known_architectures == *" $architecture "* ]] || new_architectures+=("$architecture")
done

if ((${#missing[@]} == 0)); then
  exit 0
fi
if ((EUID != 0)); then
  echo "setup: missing packages ${missing[*]}; run as root to install them" >&2
  exit 1
fi
for architecture in "${new_architectures[@]}"; do
  dpkg --add-architecture "$architecture"
done
echo "setup: installing ${missing[*]}"
export DEBIAN_FRONTEND=noninteractive
# Another apt holding the lock is waited for, not a failure.
apt-get update -qq -o DPkg::Lock::Timeout=300
apt-get install -y -qq -o DPkg::Lock::Timeout=300 --no-install-recommends "${missing[@]}" >/dev/null
