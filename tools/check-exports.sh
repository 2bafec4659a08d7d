#!/usr/bin/env bash
# Checks what a build of the library exports against dlp/exports.map: each defined dynamic symbol
# matches one entry of the map and each entry one symbol (an entry that matches nothing is how a
# symbol silently turns local), and every symbol is code or data. With a second build of the
# library, also checks that both export the same functions and data once the standard library's
# ABI tag and inline namespace are set aside.
# Usage: tools/check-exports.sh LIBRARY [OTHER_LIBRARY]
set -euo pipefail
shopt -s inherit_errexit

if (($# < 1 || $# > 2)); then
  echo "usage: $0 LIBRARY [OTHER_LIBRARY]" >&2
  exit 2
fi
map=$(dirname "$0")/../dlp/exports.map

# The global entries of the map. C++ entries match the demangled name, the others the symbol
# itself; a quoted entry is taken literally, an unquoted one is a glob pattern, as the linker does.
entries=()
entry_is_cxx=()
entry_is_literal=()
section=
in_cxx=0
while IFS= read -r line; do
  line=${line#"${line%%[![:space:]]*}"}
  line=${line%"${line##*[![:space:]]}"}
  case $line in
    '' | '{') ;;
    'global:') section=global ;;
    'local:') section=local ;;
    'extern "C++" {') in_cxx=1 ;;
    '};')
      if ((in_cxx)); then in_cxx=0; else section=; fi
      ;;
    *';')
      entry=${line%;}
      [[ $section == global ]] || continue
      if [[ $entry == \"*\" ]]; then
        entry=${entry#\"}
        entries+=("${entry%\"}")
        entry_is_literal+=(1)
      else
        entries+=("$entry")
        entry_is_literal+=(0)
      fi
      entry_is_cxx+=("$in_cxx")
      ;;
    *)
      echo "check-exports: cannot read this line of $map: $line" >&2
      exit 2
      ;;
  esac
# Comments go first, also those that span lines.
done < <(sed -zE 's:/\*([^*]|\*+[^*/])*\*+/::g' "$map")

# Prints "kind name" for each defined dynamic symbol of the library, kind being function or data,
# name demangled with the standard library's tag and namespace set aside; fails on any mismatch
# with the map.
exports_of() {
  local library=$1 listing
  listing=$(nm -D --defined-only --format=posix "$library")
  local -a symbols kinds demangled
  mapfile -t symbols < <(awk '{ print $1 }' <<<"$listing")
  mapfile -t kinds < <(awk '{ print $2 }' <<<"$listing")
  mapfile -t demangled < <(printf '%s\n' "${symbols[@]}" | c++filt)
  local -a entry_matches
  local i j name matched failed=0
  for i in "${!entries[@]}"; do entry_matches[i]=0; done
  for i in "${!symbols[@]}"; do
    matched=0
    for j in "${!entries[@]}"; do
      name=${symbols[i]}
      if ((entry_is_cxx[j])); then name=${demangled[i]}; fi
      if ((entry_is_literal[j])); then
        [[ $name == "${entries[j]}" ]] || continue
      else
        # shellcheck disable=SC2053 # the entry is a glob pattern
        [[ $name == ${entries[j]} ]] || continue
      fi
      ((++matched))
      ((++entry_matches[j]))
    done
    if ((matched != 1)); then
      echo "check-exports: $library: ${demangled[i]} matches $matched entries of the map" >&2
      failed=1
    fi
    case ${kinds[i]} in
      T) echo "function ${demangled[i]}" ;;
      B | D) echo "data ${demangled[i]}" ;;
      *)
        echo "check-exports: $library: ${demangled[i]} is of kind ${kinds[i]}, not code or data" >&2
        failed=1
        ;;
    esac
  done
  for j in "${!entries[@]}"; do
    if ((entry_matches[j] != 1)); then
      echo "check-exports: $library: entry ${entries[j]} matches ${entry_matches[j]} symbols" >&2
      failed=1
    fi
  done
  ((!failed)) || return 1
}

set_standard_library_aside() {
  sed -e 's/std::__cxx11::/std::/g' -e 's/std::__1::/std::/g' -e 's/\[abi:cxx11\]//g' | sort
}

# The map's patterns take either width of a 64-bit integer; each ABI must export its own: long on
# the 64-bit ABIs, as they always have, long long on the 32-bit ones.
check_64_bit_parameters() {
  local library=$1 exports=$2 int64 name
  case $(od -An -j4 -N1 -tu1 "$library" | tr -d ' ') in
    1) int64='long long' ;;
    2) int64=long ;;
    *)
      echo "check-exports: $library is not an ELF library" >&2
      return 1
      ;;
  esac
  for name in "putPendingInodeValue(unsigned $int64, int)" "getPidByInode(unsigned $int64)" \
      "clearPendingInode(unsigned $int64)" "isNewFileCase(MapEntry, char*, $int64, int)"; do
    if ! grep -qxF "function $name" <<<"$exports"; then
      echo "check-exports: $library does not export $name" >&2
      return 1
    fi
  done
}

library=$1
first=$(exports_of "$library")
check_64_bit_parameters "$library" "$first"
echo "check-exports: $library exports the ${#entries[@]} entries of dlp/exports.map, nothing else"
if (($# == 2)); then
  other=$2
  second=$(exports_of "$other")
  check_64_bit_parameters "$other" "$second"
  echo "check-exports: $other exports the ${#entries[@]} entries of dlp/exports.map, nothing else"
  if ! diff -u --label "$library" --label "$other" <(set_standard_library_aside <<<"$first") \
      <(set_standard_library_aside <<<"$second"); then
    echo "check-exports: $library and $other export different functions or data" >&2
    exit 1
  fi
  echo "check-exports: both export the same functions and data"
fi
