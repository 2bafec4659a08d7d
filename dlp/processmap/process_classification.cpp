#include "processmap/process_classification.h"

#include <dlp_sdk/clock.h>

#include "primitives/platform_log.h"
#include "primitives/process_name.h"
#include "processmap/process_map_internal.h"

namespace {

void removeIfExpired(HashMap& map, const MapEntry& entry) REQUIRES(dlp::libraryLock) {
    if (entry.value_expiry <= getCurrentTimeInSec()) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::checkAndDeleteProcessEntry> removing map entry for expired "
                "file creation for Pid[%d]",
                entry.value_pid);
        map.remove(entry.value_pid);
    }
}

bool isWhitelisted(HashMap& map, std::string_view processName, const MapEntry& entry)
        REQUIRES(dlp::libraryLock) {
    if (processName == FILE_MANAGER_PACKAGE || processName == GALLERY_PACKAGE) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with filbrook or Gallery "
                "process");
        removeIfExpired(map, entry);
        if (processName == FILE_MANAGER_PACKAGE) {
            DLP_SYSTEM_DEBUG(
                    "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with filbrook");
            map.mFileManagerPid = entry.value_pid;
        }
        return true;
    }
    // The office suite runs several processes, all named after its package.
    if (processName.substr(0, HANCOM_OFFICE_PACKAGE.size()) == HANCOM_OFFICE_PACKAGE) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with Hancom process");
        return true;
    }
    return false;
}

}  // namespace

namespace dlp {

bool isRejectedProcess(HashMap& map, int pid, const MapEntry& entry) {
    if (map.mRejectList.count(pid) != 0) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isRejectedPid> pid [%d] belongs to rejected process", pid);
        return true;
    }
    char buffer[kProcessNameBufferSize];
    std::string_view processName = readProcessName(pid, buffer);
    if (isWhitelisted(map, processName, entry)) return false;
    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <HashMap::isRejectedPid> pid [%d] does not belongs to whitelisted "
            "application process adding to reject list",
            pid);
    map.mRejectList.emplace(pid, processName);
    return true;
}

}  // namespace dlp

bool HashMap::isRejectedPid(int pid, MapEntry entry) {
    return dlp::isRejectedProcess(*this, pid, entry);
}

bool HashMap::isWhitelistedProcess(std::string processName, MapEntry entry) {
    return isWhitelisted(*this, processName, entry);
}

void HashMap::checkAndDeleteProcessEntry(MapEntry entry) {
    removeIfExpired(*this, entry);
}
