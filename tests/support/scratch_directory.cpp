#include "support/scratch_directory.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cerrno>
#include <filesystem>
#include <fstream>

#include "support/expiry_attribute_bytes.h"

namespace dlp::test {

ScratchDirectory::ScratchDirectory() {
    std::string pattern = std::filesystem::temp_directory_path() / "dlp-test-XXXXXX";
    if (mkdtemp(pattern.data()) == nullptr) ADD_FAILURE() << "mkdtemp: errno " << errno;
    path_ = pattern;
}

ScratchDirectory::~ScratchDirectory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

std::string ScratchDirectory::file(const std::string& name) const {
    std::filesystem::path path = std::filesystem::path(path_) / name;
    std::filesystem::create_directories(path.parent_path());
    std::ofstream{path};
    return path;
}

std::string ScratchDirectory::stampedFile(const std::string& name, int64_t expiry) const {
    std::string path = file(name);
    writeExpiryAttribute(path, expiry);
    return path;
}

std::string ScratchDirectory::unwritableFile(const std::string& name) const {
    std::string path = std::filesystem::path(path_) / name;
    std::filesystem::create_symlink("/proc/self/comm", path);
    return path;
}

}  // namespace dlp::test
