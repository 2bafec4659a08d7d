#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>

#include <sys/time.h>

#include <cstring>

#include "decisions/path_extension.h"
#include "primitives/library_lock.h"
#include "primitives/platform_log.h"
#include "processmap/hash_map.h"

std::string getExtensionFromPath(const char* path) {
    const char* lastDot = strrchr(path, '.');
    std::string extension(lastDot != nullptr ? lastDot + 1 : path);
    for (char& byte : extension) {
        if (byte >= 'A' && byte <= 'Z') byte = static_cast<char>(byte - 'A' + 'a');
    }
    return extension;
}

long getCurrentTimeInSec() {
    timeval now{};
    gettimeofday(&now, nullptr);
    return now.tv_sec;
}

bool addOrUpdateMapEntry(int pid, char* path) {
    if (path == nullptr) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <addOrUpdateMapEntry> file path is null. return false");
        return false;
    }
    std::string extension = getExtensionFromPath(path);
    long expiry = get_dlp_file_expiry_time(path);
    long now = getCurrentTimeInSec();
    if (expiry <= now) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <HashMap::addOrUpdateMapEntry> curTime[%d], "
                "entryInMap.value_expiry[%d] ignoring add to map",
                static_cast<int>(now), static_cast<int>(expiry));
        return true;
    }
    MapEntry entry{pid, std::move(extension), expiry, getCurrentTimeInSec()};
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <addOrUpdateMapEntry> addOrUpdate for file[%s]", path);
    // The attribute is read outside the lock: it is file-system work that needs no shared state.
    auto lock = dlp::lockLibraryState();
    mProcessMap.put(pid, std::move(entry));
    return true;
}
