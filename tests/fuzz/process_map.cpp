// The process map's rules, one step per line: an operation byte (put, replace the administrator's
// list, remove, get), a pid byte, an expiry byte, then a path whose extension the step uses (a
// list, for the administrator's, that must split into tokens which join into it again).
#include <android/log.h>
#include <dlp_sdk/process_map.h>

#include <cstdint>
#include <cstdlib>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "primitives/library_lock.h"
#include "primitives/path_extension.h"
#include "support/process_map_reset.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    dlp::LibraryLockGuard guard;
    dlp::test::resetProcessMap();
    std::istringstream lines(std::string(reinterpret_cast<const char*>(data), size));
    for (std::string line; std::getline(lines, line);) {
        if (line.size() < 3) continue;
        const int pid = static_cast<unsigned char>(line[1]) % 4;
        const int64_t expiry = static_cast<signed char>(line[2]) * int64_t{1000};
        const std::string path = line.substr(3).c_str();
        const std::string extension = getExtensionFromPath(path.c_str());
        // The text after the last "." of the whole path, or the whole path, ASCII-lower-cased.
        std::string expected = path.substr(path.find_last_of('.') + 1);
        for (char& byte : expected) byte = byte >= 'A' && byte <= 'Z' ? byte - 'A' + 'a' : byte;
        if (extension != expected) abort();
        const unsigned char operation = static_cast<unsigned char>(line[0]) % 4;
        if (operation == 0) mProcessMap.put(pid, MapEntry{pid, extension, expiry, 1});
        if (operation == 1) {
            const std::vector<std::string> tokens = getExtensions(path.c_str(), ',');
            std::string joined;
            for (size_t i = 0; i < tokens.size(); ++i) joined += (i == 0 ? "" : ",") + tokens[i];
            if (joined != path) abort();
            for (const std::string& token : tokens) mProcessMap.addExtension(token);
        }
        if (operation == 2) mProcessMap.remove(pid);
        // A look-up gives the pid's own entry or the empty one.
        const int found = operation == 3 ? mProcessMap.get(pid, extension).value_pid : pid;
        if (found != -1 && found != pid) abort();
        // One entry per extension per pid, each its pid's, protected and not expired below 0.
        for (const auto& [key, entries] : HashMap::mInternalProcessMap) {
            std::set<std::string> seen;
            for (const MapEntry& entry : entries) {
                if (entry.value_pid != key || entry.value_expiry < 0 ||
                    !seen.insert(entry.value_extension).second ||
                    mProcessMap.isValidExtension(entry.value_extension) == 0) {
                    abort();
                }
            }
        }
    }
    dlp::test::resetProcessMap();
    return 0;
}
