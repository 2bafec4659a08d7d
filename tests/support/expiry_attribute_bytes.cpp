#include "support/expiry_attribute_bytes.h"

#include <gtest/gtest.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>

namespace dlp::test {

namespace {

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";

}  // namespace

std::vector<unsigned char> readRawAttribute(const std::string& path) {
    std::vector<unsigned char> value(64);
    ssize_t size = getxattr(path.c_str(), kExpiryAttribute, value.data(), value.size());
    EXPECT_GE(size, 0) << path << ": " << strerror(errno);
    value.resize(size < 0 ? 0 : size);
    return value;
}

void writeRawAttribute(const std::string& path, const std::vector<unsigned char>& value) {
    EXPECT_EQ(setxattr(path.c_str(), kExpiryAttribute, value.data(), value.size(), 0), 0)
            << path << ": " << strerror(errno);
}

void writeExpiryAttribute(const std::string& path, int64_t expiry) {
    std::vector<unsigned char> value(16, 0);
    for (int i = 0; i < 8; ++i) value[i] = static_cast<unsigned char>(uint64_t(expiry) >> (8 * i));
    writeRawAttribute(path, value);
}

std::optional<int64_t> readExpiryAttribute(const std::string& path) {
    if (getxattr(path.c_str(), kExpiryAttribute, nullptr, 0) < 0 && errno == ENODATA) return {};
    std::vector<unsigned char> value = readRawAttribute(path);
    EXPECT_EQ(value.size(), 16u) << path;
    uint64_t bits = 0;
    for (size_t i = 0; i < 8 && i < value.size(); ++i) bits |= uint64_t(value[i]) << (8 * i);
    return static_cast<int64_t>(bits);
}

}  // namespace dlp::test
