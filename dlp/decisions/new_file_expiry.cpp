#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/new_file_expiry.h>

#include <cerrno>
#include <cinttypes>
#include <cstdint>
#include <cstring>

#include "primitives/library_lock.h"
#include "primitives/path_extension.h"
#include "primitives/platform_log.h"
#include "primitives/process_name.h"
#include "processmap/entry_store.h"
#include "processmap/process_classification.h"
#include "processmap/process_map_internal.h"
#include "store/expiry_after_table.h"

namespace {

// An expiry from now to now + 20 s was put there by this very file event; any other expiry was
// set on purpose by the file manager and stays.
constexpr uint64_t kFreshExpiryWindow = 21;
constexpr uint64_t kInheritableAge = 599;

bool isExpiryAlreadySet(const char* path, int64_t now, const char* caseName,
                        const char* alreadySetCaseName) {
    int64_t current = get_dlp_file_expiry_time(path);
    // Unsigned on purpose, and free of overflow: an expiry already in the past counts as set.
    uint64_t difference = static_cast<uint64_t>(current) - static_cast<uint64_t>(now);
    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <setExpiryforFile> %s -- current time[%d], expiry_time[%d], time "
            "diff[%d]",
            caseName, static_cast<int>(now), static_cast<int>(current),
            static_cast<int>(difference));
    if (current != dlp::kNoExpiry && difference >= kFreshExpiryWindow) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <setExpiryforFile> %s -- DLP expiry time is already set by Filbrook "
                "ignoring the case",
                alreadySetCaseName);
        return true;
    }
    return false;
}

// 0, or the errno that the failed write left.
int writeExpiry(const char* path, int64_t expiry) {
    int result = set_dlp_file_expiry_time(path, expiry);
    if (result >= 0) return 0;
    int error = errno != 0 ? errno : EIO;
    DLP_SYSTEM_ERROR(
            "DLP_LIBDLP : <setExpiryforFile> Error: setxattr(%s, setxattr error - %d, %d, %s\n",
            path, result, error, strerror(error));
    return error;
}

int stampZipCopy(int pid, const char* path, int64_t now) {
    if (isExpiryAlreadySet(path, now, "support 2.7 Zip copy", "support for 2.7 zip")) return 0;
    MapEntry last;
    {
        dlp::LibraryLockGuard guard;
        last = mProcessMap.getLastOpenedEntry(pid);
    }
    int64_t expiry;
    if (last.value_extension == "zip") {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <setExpiryforFile> support for 2.7 zip -- last opened entry is zip "
                "inheriting");
        expiry = last.value_expiry;
    } else {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <setExpiryforFile> zip file created from Filbrook. Set End of day");
        expiry = getEndOfDay();
    }
    // The attribute primitive reports its own failure; a zip copy always succeeds.
    set_dlp_file_expiry_time(path, expiry);
    return 0;
}

bool isNewFileCaseLocked(const MapEntry& entry, int64_t currentTime, int pid)
        REQUIRES(dlp::libraryLock) {
    int64_t openTime = entry.value_opentime;
    if (dlp::isRejectedProcess(mProcessMap, pid, entry)) {
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <isNewFileCase> pid[%d] passed is in reject list do new file case",
                pid);
        return true;
    }
    // currentTime - openTime > 599, as the arithmetic without overflow would answer.
    return currentTime > openTime &&
           static_cast<uint64_t>(currentTime) - static_cast<uint64_t>(openTime) > kInheritableAge;
}

}  // namespace

int setExpiryforFile(int pid, char* path, int containerId) {
    if (path == nullptr) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <setExpiryforFile> file path is null. return -1");
        return -1;
    }
    std::string extension = getExtensionFromPath(path);
    int64_t callTime = getCurrentTimeInSec();
    char name[dlp::kProcessNameBufferSize];
    if (extension == "zip" && dlp::readProcessName(pid, name) == FILE_MANAGER_PACKAGE) {
        return stampZipCopy(pid, path, callTime);
    }

    int64_t lookupTime = getCurrentTimeInSec();
    MapEntry related;
    bool inherits = false;
    bool fileManagerCase = false;
    int64_t newFileExpiry = 0;
    {
        dlp::LibraryLockGuard guard;
        related = mProcessMap.get(pid, std::move(extension));
        if (related.value_pid == pid && related.value_expiry != dlp::kNoExpiry) {
            inherits = !isNewFileCaseLocked(related, callTime, pid);
            // Read after the classification, which may just have recorded the file manager.
            fileManagerCase = mProcessMap.mFileManagerPid == pid ||
                              related.value_extension == dlp::kUnpackedFromZipExtension;
        }
        if (!inherits) {
            newFileExpiry =
                    lookupTime + static_cast<int64_t>(dlp::expiryAfterTimeLocked(containerId));
        }
    }

    if (inherits) {
        if (fileManagerCase &&
            isExpiryAlreadySet(path, callTime, "Filbrook support case", "Filbrook support case")) {
            return 0;
        }
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <setExpiryforFile> INHERITING CASE. expiry time[%d] for the file[%s]",
                static_cast<int>(related.value_expiry), path);
        return writeExpiry(path, related.value_expiry);
    }

    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <setExpiryforFile> NEWFILE CASE. pid[%d], file_path[%s]. Set IT admin's "
            "expiry[%" PRId64 "]",
            pid, path, newFileExpiry);
    int result = writeExpiry(path, newFileExpiry);
    if (result == 0) DLP_SYSTEM_DEBUG("DLP_LIBDLP : <setExpiryforFile> setxattr OK\n");
    return result;
}

bool isNewFileCase(MapEntry entry, char* /*path*/, int64_t currentTime, int pid) {
    dlp::LibraryLockGuard guard;
    return isNewFileCaseLocked(entry, currentTime, pid);
}
