#include "sandbox_check.h"

#include <linux/magic.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <sstream>

namespace {

constexpr const char* kSandboxName = "dlp-sandbox";

bool isExecutable(const std::string& path) {
    return access(path.c_str(), X_OK) == 0;
}

}  // namespace

bool insideSandbox() {
    struct statfs fileSystem {};
    return statfs("/data/system/users", &fileSystem) == 0 && fileSystem.f_type == TMPFS_MAGIC;
}

std::string programPath() {
    char path[PATH_MAX];
    ssize_t length = readlink("/proc/self/exe", path, sizeof(path) - 1);
    return length > 0 ? std::string(path, static_cast<size_t>(length)) : std::string();
}

std::string findSandbox() {
    std::string program = programPath();
    std::string candidate = program.substr(0, program.rfind('/') + 1) + kSandboxName;
    if (!program.empty() && isExecutable(candidate)) return candidate;
    candidate = std::string(DLPCTL_SOURCE_TOOLS_DIRECTORY "/") + kSandboxName;
    if (isExecutable(candidate)) return candidate;
    const char* searchPath = getenv("PATH");
    std::istringstream directories(searchPath != nullptr ? searchPath : "");
    std::string directory;
    while (std::getline(directories, directory, ':')) {
        candidate = (directory.empty() ? "." : directory) + "/" + kSandboxName;
        if (isExecutable(candidate)) return candidate;
    }
    return "";
}
