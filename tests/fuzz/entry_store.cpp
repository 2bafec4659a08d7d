// The process map's entry rules, one step per line: an operation (p put, a addExtension, r remove,
// g get), a pid byte, an expiry byte, then a path whose extension the step uses.
#include <android/log.h>
#include <dlp_sdk/process_map.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>

#include "primitives/library_lock.h"
#include "primitives/path_extension.h"
#include "support/process_map_reset.h"

namespace {

constexpr size_t kLongestPath = 64;

std::string extensionOf(const std::string& path) {
    std::string extension = getExtensionFromPath(path.c_str());
    // The text after the last "." (the whole path without one), ASCII-lower-cased.
    std::string expected = path.substr(path.find_last_of('.') + 1);
    for (char& byte : expected) {
        if (byte >= 'A' && byte <= 'Z') byte = static_cast<char>(byte - 'A' + 'a');
    }
    if (extension != expected) abort();
    return extension;
}

// One entry per extension per pid, each with the pid, a protected extension and no negative expiry.
void checkEntries() REQUIRES(dlp::libraryLock) {
    for (const auto& [pid, entries] : HashMap::mInternalProcessMap) {
        if (entries.empty()) abort();
        std::set<std::string> extensions;
        for (const MapEntry& entry : entries) {
            if (entry.value_pid != pid || entry.value_expiry < 0 ||
                !extensions.insert(entry.value_extension).second ||
                mProcessMap.isValidExtension(entry.value_extension) == 0) {
                abort();
            }
        }
    }
}

// `found` is the empty entry or one of the pid's entries, its extension "unzip" for a zip.
void checkFound(int pid, const MapEntry& found) REQUIRES(dlp::libraryLock) {
    if (found.value_pid == -1 && found.value_extension == "no_extension" &&
        found.value_expiry == -1 && found.value_opentime == -1) {
        return;
    }
    auto slot = HashMap::mInternalProcessMap.find(pid);
    if (slot == HashMap::mInternalProcessMap.end()) abort();
    for (const MapEntry& entry : slot->second) {
        if (entry.value_pid == found.value_pid && entry.value_expiry == found.value_expiry &&
            entry.value_opentime == found.value_opentime &&
            (entry.value_extension == found.value_extension ||
             (found.value_extension == "unzip" && entry.value_extension == "zip"))) {
            return;
        }
    }
    abort();
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    dlp::LibraryLockGuard guard;
    dlp::test::resetProcessMap();
    const std::string input(reinterpret_cast<const char*>(data), size);
    for (size_t start = 0; start < size;) {
        size_t end = std::min(input.find('\n', start), size);
        const std::string line = input.substr(start, end - start);
        start = end + 1;
        if (line.size() < 3) continue;
        const int pid = static_cast<unsigned char>(line[1]) % 4;
        const long expiry = static_cast<signed char>(line[2]) * 1000L;
        const std::string path = line.substr(3, kLongestPath).c_str();
        const std::string extension = extensionOf(path);
        switch (static_cast<unsigned char>(line[0]) % 4) {
            case 0: {  // p
                const bool valid = expiry >= 0 && mProcessMap.isValidExtension(extension) != 0;
                if (mProcessMap.put(pid, MapEntry{pid, extension, expiry, expiry / 2}) != valid) {
                    abort();
                }
                if (valid &&
                    HashMap::mInternalProcessMap[pid].back().value_extension != extension) {
                    abort();
                }
                break;
            }
            case 1:  // a
                mProcessMap.addExtension(extension);
                break;
            case 2:  // r
                mProcessMap.remove(pid);
                if (HashMap::mInternalProcessMap.count(pid) != 0) abort();
                break;
            default:  // g
                checkFound(pid, mProcessMap.get(pid, extension));
        }
        checkEntries();
    }
    dlp::test::resetProcessMap();
    return 0;
}
