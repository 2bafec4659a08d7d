#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <optional>

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

std::nullopt_t refuseOutOfRange(char* const* argv, int index) {
    DLP_SYSTEM_ERROR("DLP_LIBDLP : <handleDLPCommands> FATAL: argument [%d] is out of range: %s",
                     index, argv[index]);
    return std::nullopt;
}

// atoi's reading of the argument (leading blanks, a sign, the digits up to the first other byte, no
// digits reads as 0), but refused, with its message, when the value lies outside int: wrapped,
// it would name another pid or container.
std::optional<int> parseNumber(char* const* argv, int index) {
    const char* cursor = argv[index];
    while (*cursor == ' ' || (*cursor >= '\t' && *cursor <= '\r')) ++cursor;
    bool negative = *cursor == '-';
    if (*cursor == '-' || *cursor == '+') ++cursor;
    // Magnitudes up to 2^31 fit; one digit more cannot come back into range.
    constexpr unsigned long long kLargestMagnitude = 1ull + INT_MAX;
    unsigned long long magnitude = 0;
    for (; *cursor >= '0' && *cursor <= '9'; ++cursor) {
        magnitude = magnitude * 10 + static_cast<unsigned long long>(*cursor - '0');
        if (magnitude > kLargestMagnitude) break;
    }
    if (magnitude > kLargestMagnitude - (negative ? 0 : 1)) return refuseOutOfRange(argv, index);
    return negative ? static_cast<int>(0ull - magnitude) : static_cast<int>(magnitude);
}

// strtol's reading in base 0 ("0x" hexadecimal, a leading "0" octal), over 64 bits on every ABI,
// refused outside them.
std::optional<int64_t> parseExpiry(char* const* argv, int index) {
    int savedErrno = errno;
    errno = 0;
    int64_t expiry = strtoll(argv[index], nullptr, 0);
    bool outOfRange = errno == ERANGE;
    errno = savedErrno;
    if (outOfRange) return refuseOutOfRange(argv, index);
    return expiry;
}

bool isPathTooLong(const char* path) {
    size_t length = strnlen(path, kLongestPath + 1);
    if (length <= kLongestPath) return false;
    DLP_SYSTEM_ERROR(
            "DLP_LIBDLP : <handleDLPCommands> FATAL: file path of %zu bytes or more is too long",
            length);
    return true;
}

int stampFile(int containerId, char* path, int64_t expiry) {
    if (isPathTooLong(path)) return -1;
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
    std::optional<int> command = parseNumber(argv, 1);
    if (!command) return -1;
    if (*command < DLP_CMD_PROCESS_REMOVE || *command > DLP_CMD_LOG_STATE_SET) return -1;
    int expected = expectedArgumentCount(*command);
    if (argc != expected) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <handleDLPCommands> FATAL: adifferent number of paramerter given "
                "[%d] != expected %d",
                argc, expected);
        return -1;
    }
    // Every number is read before anything changes, so a refused one changes nothing.
    std::optional<int> first, second;
    std::optional<int64_t> expiry;
    switch (*command) {
        case DLP_CMD_PROCESS_REMOVE:
            if (!(first = parseNumber(argv, 2))) return -1;
            return removeProcess(*first);
        case DLP_CMD_FILE_EXPIRY_SET:
            if (!(first = parseNumber(argv, 2)) || !(expiry = parseExpiry(argv, 4))) return -1;
            return stampFile(*first, argv[3], *expiry);
        case DLP_CMD_EXPIRY_AFTER_SET:
            if (!(first = parseNumber(argv, 2)) || !(second = parseNumber(argv, 3))) return -1;
            return storeDuration(*first, *second);
        case DLP_CMD_FILE_OPEN:
            if (!(first = parseNumber(argv, 3))) return -1;
            return recordFileOpen(*first, argv[4]);
        case DLP_CMD_EXTENSION_SET:
            return replaceExtensionList(argv[3]);
        default:
            if (!(first = parseNumber(argv, 2)) || !(second = parseNumber(argv, 3))) return -1;
            return setLogState(*first, *second);
    }
}
