#include "primitives/process_name.h"

#include <dlp_sdk/process_name.h>

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstring>

#include "primitives/platform_log.h"

namespace {

using dlp::kProcessNameBufferSize;
constexpr char kUnreadableName[] = "???";

// "/proc/<pid>/cmdline", built by hand: this runs on every file a whitelisted app creates.
void formatCommandLinePath(int pid, char (&path)[kProcessNameBufferSize]) {
    char digits[16];
    size_t count = 0;
    // Unsigned, so that the most negative pid has a magnitude as well.
    unsigned int magnitude = pid < 0 ? 0u - static_cast<unsigned int>(pid) : pid;
    do {
        digits[count++] = static_cast<char>('0' + magnitude % 10);
        magnitude /= 10;
    } while (magnitude != 0);
    char* cursor = path;
    memcpy(cursor, "/proc/", 6);
    cursor += 6;
    if (pid < 0) *cursor++ = '-';
    while (count > 0) *cursor++ = digits[--count];
    memcpy(cursor, "/cmdline", sizeof("/cmdline"));
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
    char buffer[kProcessNameBufferSize] = {};
    return std::string(dlp::readProcessName(pid, buffer));
}
