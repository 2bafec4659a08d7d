#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>

#include "primitives/library_lock.h"
#include "primitives/path_extension.h"
#include "primitives/platform_log.h"
#include "processmap/process_map_internal.h"

bool addOrUpdateMapEntry(int pid, char* path) {
    if (path == nullptr) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <addOrUpdateMapEntry> file path is null. return false");
        return false;
    }
    std::string extension = getExtensionFromPath(path);
    int64_t expiry = get_dlp_file_expiry_time(path);
    int64_t now = getCurrentTimeInSec();
    if (expiry <= now) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <HashMap::addOrUpdateMapEntry> curTime[%d], "
                "entryInMap.value_expiry[%d] ignoring add to map",
                static_cast<int>(now), static_cast<int>(expiry));
        return true;
    }
    MapEntry entry{pid, std::move(extension), expiry, getCurrentTimeInSec()};
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <addOrUpdateMapEntry> addOrUpdate for file[%s]", path);
    dlp::LibraryLockGuard guard;
    mProcessMap.put(pid, std::move(entry));
    return true;
}
