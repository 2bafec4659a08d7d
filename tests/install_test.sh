#!/usr/bin/env bash
# Installs the built library into a scratch prefix and builds an outside program against it, the
# way users link it: every exported header on its own, -ldlp_sdk, nothing from the source tree.
set -euo pipefail
build_dir=$1
prefix=$(mktemp -d)
trap 'rm -rf "$prefix"' EXIT

cmake --install "$build_dir" --prefix "$prefix" >/dev/null
test -f "$prefix/lib/libdlp_sdk.so"

for header in "$prefix"/include/dlp_sdk/*.h; do
  echo "#include <dlp_sdk/$(basename "$header")>" | g++ -std=c++17 -Wall -Wextra -Werror \
    -I"$prefix/include" -x c++ -fsyntax-only -
done

cat >"$prefix/consumer.cpp" <<'CPP'
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/process_map.h>
#include <cstdio>
int main(int, char** argv) {
    std::vector<std::string> tokens = getExtensions("pdf,docx", ',');
    long expiry = get_dlp_file_expiry_time(argv[0]);
    bool valid = mProcessMap.mDefaultExtensions.size() == 25;
    std::printf("%zu %ld %d\n", tokens.size(), expiry, valid ? getDLPAuditLogState() : -1);
    return tokens.size() == 2 && expiry == -1 && valid ? 0 : 1;
}
CPP
g++ -std=c++17 -I"$prefix/include" "$prefix/consumer.cpp" -L"$prefix/lib" -ldlp_sdk \
  -Wl,-rpath,"$prefix/lib" -o "$prefix/consumer"
output=$("$prefix/consumer" 2>/dev/null)
[ "$output" = "2 -1 0" ] || { echo "consumer printed '$output'"; exit 1; }

# The program runs from the prefix, against the installed library, its sandbox beside it.
test -x "$prefix/bin/dlp-sandbox"
touch "$prefix/unstamped"
output=$("$prefix/bin/dlpctl" show "$prefix/unstamped")
[ "$output" = "$prefix/unstamped: no expiry" ] || { echo "dlpctl printed '$output'"; exit 1; }
echo "installed library links and runs, and so does dlpctl"
