// One command vector per input, its arguments split at newlines. Runs only inside
// tools/dlp-sandbox: commands 2 and 3 reach the fixed database path. The path of command 2 or 4
// becomes a stamped file of the scratch directory whose name ends in the input's bytes.
#include <android/log.h>
#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_attribute.h>
#include <fcntl.h>
#include <linux/magic.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string>
#include <vector>

#include "fuzz/scratch_directory.h"

namespace {

constexpr size_t kMostArguments = 8;
constexpr size_t kLongestArgument = 5000;

std::string scratchFileEndingIn(const std::string& argument) {
    std::string name = "file.";
    for (char byte : argument) {
        if (byte != '/') name += byte;
    }
    std::string path = dlp::fuzz::scratchDirectory() + "/" + name;
    int descriptor = open(path.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600);
    if (descriptor >= 0) {
        close(descriptor);
        set_dlp_file_expiry_time(path.c_str(), time(nullptr) + 3600);
    }
    return path;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    struct statfs fileSystem {};
    if (statfs("/data/system/users", &fileSystem) != 0 || fileSystem.f_type != TMPFS_MAGIC) {
        fprintf(stderr, "reaches /data/system/users: run it inside tools/dlp-sandbox\n");
        exit(1);
    }
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    std::vector<std::string> arguments{"dlp"};
    const char* cursor = reinterpret_cast<const char*>(data);
    const char* end = cursor + size;
    while (cursor < end && arguments.size() < kMostArguments) {
        const char* next = std::find(cursor, end, '\n');
        // An argument ends at its first NUL, as the library reads it.
        std::string argument(cursor, std::min<size_t>(next - cursor, kLongestArgument));
        arguments.emplace_back(argument.c_str());
        cursor = next + 1;
    }
    const int command = arguments.size() > 1 ? atoi(arguments[1].c_str()) : 0;
    const size_t pathIndex = command == 2 ? 3 : command == 4 ? 4 : 0;
    std::string file;
    if (pathIndex != 0 && pathIndex < arguments.size()) {
        file = scratchFileEndingIn(arguments[pathIndex]);
        arguments[pathIndex] = file;
    }
    std::vector<char*> argv;
    for (std::string& argument : arguments) argv.push_back(argument.data());
    handleDLPCommands(static_cast<int>(argv.size()), argv.data());
    if (!file.empty()) unlink(file.c_str());
    return 0;
}
