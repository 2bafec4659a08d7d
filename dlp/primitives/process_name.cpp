#include "primitives/process_name.h"

#include <dlp_sdk/process_name.h>

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstring>

#include "primitives/platform_log.h"

namespace {

using dlp::kProcessNameBufferSize;
constexpr char kUnreadableName[] = "???";

// "/proc/<pid>/cmdline" without snprintf: this runs on every file a whitelisted app creates.
void formatCommandLinePath(int pid, char (&path)[kProcessNameBufferSize]) {
    constexpr std::string_view kPrefix = "/proc/", kSuffix = "/cmdline";
    char* digitsEnd = std::to_chars(path + kPrefix.size(), path + sizeof(path), pid).ptr;
    kPrefix.copy(path, kPrefix.size());
    *std::copy(kSuffix.begin(), kSuffix.end(), digitsEnd) = '\0';
}

}  // namespace

namespace dlp {

std::string_view readProcessName(int pid, char (&buffer)[kProcessNameBufferSize]) {
    formatCommandLinePath(pid, buffer);
    android::base::unique_fd file(open(buffer, O_RDONLY | O_CLOEXEC));
    ssize_t length = file.ok() ? read(file.get(), buffer, kProcessNameBufferSize - 1) : -1;
    if (length < 0) {
        memcpy(buffer, kUnreadableName, sizeof(kUnreadableName));
    } else {
        buffer[length] = '\0';
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <getProcessNameByPid> pid[%d], processName[%s]", pid, buffer);
    return buffer;
}

}  // namespace dlp

std::string getProcessNameByPid(int pid) {
    char buffer[kProcessNameBufferSize];
    return std::string(dlp::readProcessName(pid, buffer));
}
