#include "support/scratch_directory.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/xattr.h>

#include <cerrno>
#include <filesystem>
#include <fstream>

namespace dlp::test {

namespace {

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";

}  // namespace

ScratchDirectory::ScratchDirectory() {
    // The build tree: a tmpfs /tmp may refuse user attributes.
    std::string pattern = std::filesystem::current_path() / "scratch-XXXXXX";
    if (mkdtemp(pattern.data()) == nullptr) ADD_FAILURE() << "mkdtemp: errno " << errno;
    path_ = pattern;
}

ScratchDirectory::~ScratchDirectory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

std::string ScratchDirectory::file(const std::string& name, std::optional<int64_t> expiry) const {
    std::filesystem::path path = std::filesystem::path(path_) / name;
    std::filesystem::create_directories(path.parent_path());
    std::ofstream{path};
    if (expiry) writeAttribute(path, expiryValue(*expiry));
    return path;
}

std::vector<unsigned char> readAttribute(const std::string& path) {
    std::vector<unsigned char> value(64);
    ssize_t size = getxattr(path.c_str(), kExpiryAttribute, value.data(), value.size());
    value.resize(size < 0 ? 0 : size);
    return value;
}

void writeAttribute(const std::string& path, const std::vector<unsigned char>& value) {
    EXPECT_EQ(setxattr(path.c_str(), kExpiryAttribute, value.data(), value.size(), 0), 0)
            << path << ": errno " << errno;
}

std::vector<unsigned char> expiryValue(int64_t expiry) {
    std::vector<unsigned char> value(16, 0);
    for (int i = 0; i < 8; ++i) value[i] = static_cast<unsigned char>(uint64_t(expiry) >> (8 * i));
    return value;
}

}  // namespace dlp::test
