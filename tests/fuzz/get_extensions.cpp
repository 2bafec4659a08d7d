// The first byte is the delimiter, the rest the list: the tokens joined again give the list.
#include <android/log.h>
#include <dlp_sdk/process_map.h>

#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const char delimiter = static_cast<char>(data[0]);
    const std::string list(reinterpret_cast<const char*>(data) + 1, size - 1);
    const std::vector<std::string> tokens = getExtensions(list.c_str(), delimiter);
    // The list ends at its first NUL, as the library reads it.
    const std::string text = list.c_str();
    if (text.empty() != tokens.empty()) abort();
    std::string joined;
    for (size_t i = 0; i < tokens.size(); ++i) {
        if (i > 0) joined += delimiter;
        joined += tokens[i];
    }
    if (joined != text) abort();
    return 0;
}
