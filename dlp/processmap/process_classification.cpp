#include <dlp_sdk/clock.h>
#include <dlp_sdk/process_name.h>

#include "primitives/platform_log.h"
#include "processmap/process_map_internal.h"

bool HashMap::isRejectedPid(int pid, MapEntry entry) {
    if (mRejectList.count(pid) != 0) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isRejectedPid> pid [%d] belongs to rejected process", pid);
        return true;
    }
    std::string processName = getProcessNameByPid(pid);
    if (isWhitelistedProcess(processName, std::move(entry))) return false;
    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <HashMap::isRejectedPid> pid [%d] does not belongs to whitelisted "
            "application process adding to reject list",
            pid);
    mRejectList.emplace(pid, std::move(processName));
    return true;
}

bool HashMap::isWhitelistedProcess(std::string processName, MapEntry entry) {
    if (processName == FILE_MANAGER_PACKAGE || processName == GALLERY_PACKAGE) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with filbrook or Gallery "
                "process");
        int pid = entry.value_pid;
        checkAndDeleteProcessEntry(std::move(entry));
        if (processName == FILE_MANAGER_PACKAGE) {
            DLP_SYSTEM_DEBUG(
                    "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with filbrook");
            mFileManagerPid = pid;
        }
        return true;
    }
    // The office suite runs several processes, all named after its package.
    if (std::string_view(processName).substr(0, HANCOM_OFFICE_PACKAGE.size()) ==
        HANCOM_OFFICE_PACKAGE) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with Hancom process");
        return true;
    }
    return false;
}

void HashMap::checkAndDeleteProcessEntry(MapEntry entry) {
    if (entry.value_expiry <= getCurrentTimeInSec()) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::checkAndDeleteProcessEntry> removing map entry for expired "
                "file creation for Pid[%d]",
                entry.value_pid);
        remove(entry.value_pid);
    }
}
