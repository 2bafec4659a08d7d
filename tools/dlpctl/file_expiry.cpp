#include "file_expiry.h"

#include <dlp_sdk/expiry_attribute.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>

#include "expiry_text.h"

namespace {

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";
constexpr ssize_t kExpiryValueSize = 16;

FileExpiryReport systemError() {
    return {false, strerror(errno)};
}

}  // namespace

FileExpiryReport reportFileExpiry(const std::string& path, int64_t now) {
    int64_t expiry = get_dlp_file_expiry_time(path.c_str());
    if (expiry > 0) return {true, describeExpiry(expiry, now)};

    unsigned char value[kExpiryValueSize];
    ssize_t size = getxattr(path.c_str(), kExpiryAttribute, value, sizeof(value));
    // A longer value does not fit: ask for its size alone.
    if (size < 0 && errno == ERANGE) size = getxattr(path.c_str(), kExpiryAttribute, nullptr, 0);
    if (size < 0) return errno == ENODATA ? FileExpiryReport{true, "no expiry"} : systemError();
    if (size != kExpiryValueSize) {
        return {false, "bad expiry value (" + std::to_string(size) + " bytes)"};
    }
    // The library reads a stored time of 0 or less as no expiry; show which time it was.
    uint64_t bits = 0;
    for (int i = 7; i >= 0; --i) bits = bits << 8 | value[i];
    return {true, "no expiry (stored " + std::to_string(static_cast<int64_t>(bits)) + ")"};
}
