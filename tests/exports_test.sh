#!/bin/sh
# Compares the dynamic symbols that the shared library defines with its public interface.
# Usage: exports_test.sh path/to/libdlp_sdk.so
set -eu

if [ $# -ne 1 ] || [ ! -f "$1" ]; then
    echo "usage: $0 path/to/libdlp_sdk.so" >&2
    exit 2
fi
library=$1
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

sort > "$work/expected" <<'EOF'
function set_dlp_file_expiry_time
function get_dlp_file_expiry_time
function set_dlp_extension
function lock_dlp
function unlock_dlp
function init_table
function set_time
function get_time
function set_expiryAfter_time
function get_expiryAfter_time
function getProcessNameByPid[abi:cxx11](int)
function getITAdminExpiryTime(int)
function getDLPAuditLogState()
function getExtensions[abi:cxx11](char const*, char)
function HashMap::makeExtensionGroups()
function HashMap::getValidMapEntryIndexForExt(std::__cxx11::basic_string<char, std::char_traits<char>, std::allocator<char> >, std::vector<MapEntry, std::allocator<MapEntry> >)
function putPendingInodeValue(unsigned long, int)
function getPidByInode(unsigned long)
function clearPendingInode(unsigned long)
function addOrUpdateMapEntry(int, char*)
function getCurrentTimeInSec()
function setExpiryforFile(int, char*, int)
function isNewFileCase(MapEntry, char*, long, int)
function getEndOfDay()
function handleDLPCommands(int, char**)
function Java_com_halvorn_android_zorvat_dlp_XattrManager_Native_1Dlp_1GetDLPFileExpiryTime
function Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExpiry
function Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExtension
function Java_com_android_server_DLPManagerService_Native_1Dlp_1LockDLP
function Java_com_android_server_DLPManagerService_Native_1Dlp_1UnlockDLP
object mProcessMap
object HashMap::mInternalProcessMap
object HashMap::mPendingInodeMap
object HashMap::mMapIterator
EOF

nm -D --defined-only "$library" > "$work/symbols"
# Any symbol kind other than code and data shows up with its nm letter.
c++filt < "$work/symbols" |
    sed -E -e 's/^[0-9a-f]+ T /function /' \
           -e 's/^[0-9a-f]+ [BD] /object /' \
           -e 's/^[0-9a-f]* ?([A-Za-z?]) /nm-kind-\1 /' |
    sort > "$work/actual"

if ! diff -u --label "public interface" --label "exported by $library" \
        "$work/expected" "$work/actual"; then
    echo "exports_test: FAILED: '-' lines are not exported, '+' lines are exported beyond the" \
         "public interface" >&2
    exit 1
fi
echo "exports_test: all $(wc -l < "$work/expected") public symbols exported, nothing else"
