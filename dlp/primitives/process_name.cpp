#include <dlp_sdk/process_name.h>

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>

#include "primitives/platform_log.h"
#include "primitives/unique_fd.h"

std::string getProcessNameByPid(int pid) {
    // One buffer for the path and then the name: the name keeps at most 254 bytes.
    char buffer[255] = {};
    snprintf(buffer, sizeof(buffer), "/proc/%d/cmdline", pid);
    dlp::UniqueFd file(open(buffer, O_RDONLY | O_CLOEXEC));
    if (!file.ok()) {
        snprintf(buffer, sizeof(buffer), "???");
    } else {
        ssize_t length = read(file.get(), buffer, sizeof(buffer) - 1);
        if (length < 0) {
            snprintf(buffer, sizeof(buffer), "???");
        } else {
            buffer[length] = '\0';
        }
    }
    std::string name(buffer);
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <getProcessNameByPid> pid[%d], processName[%s]", pid,
                     name.c_str());
    return name;
}
