#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>

#include <cstdlib>
#include <cstring>

#include "primitives/library_lock.h"
#include "primitives/path_extension.h"
#include "primitives/platform_log.h"
#include "processmap/extension_rules.h"
#include "processmap/process_map_internal.h"
#include "store/expiry_after_table.h"

namespace {

enum Command {
    DLP_CMD_PROCESS_REMOVE = 1,
    DLP_CMD_FILE_EXPIRY_SET = 2,
    DLP_CMD_EXPIRY_AFTER_SET = 3,
    DLP_CMD_FILE_OPEN = 4,
    DLP_CMD_EXTENSION_SET = 5,
    DLP_CMD_LOG_STATE_SET = 6,
};

// Longer texts are refused: cutting them would name another file or another extension.
constexpr size_t kLongestPath = 4095;
constexpr size_t kLongestExtensionList = 999;

int expectedArgumentCount(int command) {
    switch (command) {
        case DLP_CMD_PROCESS_REMOVE:
            return 3;
        case DLP_CMD_FILE_EXPIRY_SET:
        case DLP_CMD_FILE_OPEN:
            return 5;
        default:
            return 4;
    }
}

bool hasNullArgument(int argc, char** argv) {
    if (argv == nullptr) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <handleDLPCommands> FATAL: argument vector is null");
        return true;
    }
    for (int i = 1; i < argc; ++i) {
        if (argv[i] == nullptr) {
            DLP_SYSTEM_ERROR("DLP_LIBDLP : <handleDLPCommands> FATAL: argument [%d] is null", i);
            return true;
        }
    }
    return false;
}

bool isPathTooLong(const char* path) {
    size_t length = strnlen(path, kLongestPath + 1);
    if (length <= kLongestPath) return false;
    DLP_SYSTEM_ERROR(
            "DLP_LIBDLP : <handleDLPCommands> FATAL: file path of %zu bytes or more is too long",
            length);
    return true;
}

int stampFile(int containerId, char* path, const char* expiryText) {
    if (isPathTooLong(path)) return -1;
    long expiry = strtol(expiryText, nullptr, 0);
    std::string extension = getExtensionFromPath(path);
    {
        dlp::LibraryLockGuard guard;
        if (mProcessMap.isValidExtension(std::move(extension)) == 0) {
            DLP_SYSTEM_ERROR(
                    "DLP_LIBDLP : <handleDLPCommands> extension passed is not valid. setting IT "
                    "Admin set Expiry");
            expiry = dlp::adminExpiryTimeLocked(containerId);
        }
    }
    int result = set_dlp_file_expiry_time(path, expiry);
    if (result < 0) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <handleDLPCommands> Error: setxattr failed with error %d\n",
                         result);
        return result;
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <handleDLPCommands> setxattr OK\n");
    return 0;
}

int storeDuration(int containerId, int duration) {
    int result = set_expiryAfter_time(containerId, duration);
    if (result != 0) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> Error: set_expiryAfter_time failed with error "
                "%d\n",
                result);
        return -1;
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <handleDLPCommands> set_expiryAfter_time OK\n");
    return 0;
}

int recordFileOpen(int pid, char* path) {
    if (isPathTooLong(path)) return -1;
    if (!addOrUpdateMapEntry(pid, path)) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> Error: addOrUpdateMapEntry failed with error "
                "%d\n",
                0);
        return -1;
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <handleDLPCommands> addOrUpdateMapEntry OK\n");
    return 0;
}

int replaceExtensionList(const char* list) {
    size_t length = strnlen(list, kLongestExtensionList + 1);
    if (length > kLongestExtensionList) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> FATAL: extension list of %zu bytes or more is "
                "too long",
                length);
        return -1;
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <handleDLPCommands> Extension recieved : %s\n", list);
    std::vector<std::string> extensions = getExtensions(list, ',');
    dlp::LibraryLockGuard guard;
    dlp::replaceExtensionList(std::move(extensions));
    return 0;
}

int setLogState(int containerId, int logState) {
    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <handleDLPCommands> setDLPExpiryAfter command [ContainerId = %d, "
            "logState = %d]",
            containerId, logState);
    dlp::LibraryLockGuard guard;
    dlp::setAuditLogState(logState);
    return 0;
}

int removeProcess(int pid) {
    dlp::LibraryLockGuard guard;
    mProcessMap.remove(pid);
    return 0;
}

}  // namespace

int handleDLPCommands(int argc, char** argv) {
    if (argc < 2) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> FATAL: argument passed should at least contain "
                "the command type. number of arguments passed = %d",
                argc);
        return -1;
    }
    if (hasNullArgument(argc, argv)) return -1;
    int command = atoi(argv[1]);
    if (command < DLP_CMD_PROCESS_REMOVE || command > DLP_CMD_LOG_STATE_SET) return -1;
    int expected = expectedArgumentCount(command);
    if (argc != expected) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> FATAL: adifferent number of paramerter given "
                "[%d] != expected %d",
                argc, expected);
        return -1;
    }
    switch (command) {
        case DLP_CMD_PROCESS_REMOVE:
            return removeProcess(atoi(argv[2]));
        case DLP_CMD_FILE_EXPIRY_SET:
            return stampFile(atoi(argv[2]), argv[3], argv[4]);
        case DLP_CMD_EXPIRY_AFTER_SET:
            return storeDuration(atoi(argv[2]), atoi(argv[3]));
        case DLP_CMD_FILE_OPEN:
            return recordFileOpen(atoi(argv[3]), argv[4]);
        case DLP_CMD_EXTENSION_SET:
            return replaceExtensionList(argv[3]);
        default:
            return setLogState(atoi(argv[2]), atoi(argv[3]));
    }
}
