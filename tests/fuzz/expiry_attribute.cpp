// Any attribute value, read back: the expiry only from a 16-byte value holding a time above 0.
#include <android/log.h>
#include <dlp_sdk/expiry_attribute.h>
#include <sys/xattr.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "support/scratch_directory.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    __android_log_set_logger([](const __android_logger_data*, const char*) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const dlp::test::ScratchDirectory directory;
    static const std::string stamped = directory.file("stamped");
    const char* file = stamped.c_str();
    removexattr(file, "user.zorvat_dlp");
    // Values the file system refuses (too long) leave the file without the attribute.
    int64_t expected = -1;
    if (setxattr(file, "user.zorvat_dlp", data, size, 0) == 0 && size == 16) {
        uint64_t bits = 0;
        for (size_t i = 0; i < 8; ++i) bits |= static_cast<uint64_t>(data[i]) << (8 * i);
        if (static_cast<int64_t>(bits) > 0) expected = static_cast<int64_t>(bits);
    }
    if (get_dlp_file_expiry_time(file) != expected) abort();
    return 0;
}
