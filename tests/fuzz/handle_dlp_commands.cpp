// One command vector per input, its arguments split at newlines. Runs only inside
// tools/dlp-sandbox: commands 2 and 3 reach the fixed database path. The path of command 2 or 4
// becomes a stamped file of the scratch directory whose name ends in the input's bytes.
#include <android/log.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <sstream>
#include <string>
#include <vector>

#include "command_vector.h"
#include "support/duration_database.h"
#include "support/scratch_directory.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    if (!dlp::test::databaseIsThrowaway()) {
        fprintf(stderr, "reaches /data/system/users: run it inside tools/dlp-sandbox\n");
        exit(1);
    }
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const dlp::test::ScratchDirectory directory;
    std::vector<std::string> arguments;
    std::istringstream lines(std::string(reinterpret_cast<const char*>(data), size));
    // An argv of at most 8 entries of 5000 bytes, each ending at its first NUL as the library
    // reads it.
    for (std::string line; arguments.size() < 7 && std::getline(lines, line);) {
        arguments.emplace_back(line.substr(0, 5000).c_str());
    }
    // The command as the library reads it, so that no path outside the scratch directory is used.
    const int command = arguments.empty() ? 0 : atoi(arguments[0].c_str());
    const size_t pathIndex = command == 2 ? 2 : command == 4 ? 3 : 0;
    std::string file;
    if (pathIndex != 0 && pathIndex < arguments.size()) {
        std::string name = "file.";
        for (char byte : arguments[pathIndex].substr(0, 200)) name += byte == '/' ? '_' : byte;
        arguments[pathIndex] = file = directory.file(name, time(nullptr) + 3600);
    }
    runCommandVector(std::move(arguments));
    if (!file.empty()) unlink(file.c_str());
    return 0;
}
