#include <dlp_sdk/expiry_attribute.h>

#include <endian.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cinttypes>
#include <cstdint>
#include <cstring>

#include "primitives/expiry_time.h"
#include "primitives/platform_log.h"

namespace {

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";
// Signed 64-bit little-endian expiry in bytes 0-7; bytes 8-15 are reserved and written as zero.
constexpr size_t kExpiryValueSize = 16;

void encodeExpiry(int64_t expiry, unsigned char (&value)[kExpiryValueSize]) {
    memset(value, 0, sizeof(value));
    uint64_t bits = htole64(static_cast<uint64_t>(expiry));
    memcpy(value, &bits, sizeof(bits));
}

int64_t decodeExpiry(const unsigned char (&value)[kExpiryValueSize]) {
    uint64_t bits;
    memcpy(&bits, value, sizeof(bits));
    return static_cast<int64_t>(le64toh(bits));
}

}  // namespace

int set_dlp_file_expiry_time(const char* path, int64_t expiry) {
    // A null path fails like a call that the kernel refused.
    int result = -1;
    if (path != nullptr) {
        unsigned char value[kExpiryValueSize];
        encodeExpiry(expiry, value);
        result = setxattr(path, kExpiryAttribute, value, sizeof(value), 0);
    } else {
        errno = EINVAL;
    }
    if (result == 0) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :  set xattr is successful!!");
        return 0;
    }
    int error = errno;
    DLP_PRIMITIVE_LOG("DLP_LIBDLP :  Error: setxattr(%s, setxattr error - %d, %d, %s\n",
                      path != nullptr ? path : "(null)", result, error, strerror(error));
    return -1;
}

int64_t get_dlp_file_expiry_time(const char* path) {
    unsigned char value[kExpiryValueSize];
    int result = -1;
    if (path != nullptr) {
        result = static_cast<int>(getxattr(path, kExpiryAttribute, value, sizeof(value)));
    } else {
        errno = EINVAL;
    }
    int error = errno;
    if (result == -1 && error == ENODATA) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :   in get_dlp_file_expiry_time normal file (%s)\n", path);
        return dlp::kNoExpiry;
    }
    if (result != static_cast<int>(kExpiryValueSize)) {
        DLP_PRIMITIVE_LOG(
                "DLP_LIBDLP :  in get_dlp_file_expiry_time Error: getxattr(%s, getxattr error - "
                "%d, %d, %s\n",
                path != nullptr ? path : "(null)", result, error, strerror(error));
        return dlp::kNoExpiry;
    }
    int64_t expiry = decodeExpiry(value);
    DLP_PRIMITIVE_LOG("DLP_LIBDLP :  in get_dlp_file_expiry_time getxattr OK: [%" PRId64 "]\n",
                      expiry);
    if (expiry > 0) return expiry;
    DLP_PRIMITIVE_LOG("DLP_LIBDLP :  dlp expiry time is <= 0 retunring -1");
    return dlp::kNoExpiry;
}
