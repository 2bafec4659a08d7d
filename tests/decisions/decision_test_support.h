#pragma once

#include <dlp_sdk/commands.h>
#include <dlp_sdk/file_open_tracking.h>
#include <gtest/gtest.h>
#include <linux/magic.h>
#include <sys/statfs.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <vector>

#include "support/log_capture.h"

namespace dlp::test {

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";

// The value as the kernel stores it: 16 bytes, the expiry little-endian in bytes 0-7.
inline void writeExpiryAttribute(const std::string& path, int64_t expiry) {
    unsigned char value[16] = {};
    for (int i = 0; i < 8; ++i) {
        value[i] = static_cast<unsigned char>(static_cast<uint64_t>(expiry) >> (8 * i));
    }
    ASSERT_EQ(setxattr(path.c_str(), kExpiryAttribute, value, sizeof(value), 0), 0)
            << path << ": errno " << errno;
}

// The stored expiry, or nothing when the file carries no attribute. Any other length fails.
inline std::optional<int64_t> readExpiryAttribute(const std::string& path) {
    unsigned char value[64] = {};
    ssize_t length = getxattr(path.c_str(), kExpiryAttribute, value, sizeof(value));
    if (length < 0 && errno == ENODATA) return std::nullopt;
    EXPECT_EQ(length, 16) << path << ": errno " << errno;
    uint64_t bits = 0;
    for (int i = 0; i < 8; ++i) bits |= static_cast<uint64_t>(value[i]) << (8 * i);
    return static_cast<int64_t>(bits);
}

// A directory of its own under the temporary directory, removed with its content.
class ScratchDirectory {
  public:
    ScratchDirectory() {
        std::string pattern = std::filesystem::temp_directory_path() / "dlp-decisions-XXXXXX";
        if (mkdtemp(pattern.data()) == nullptr) ADD_FAILURE() << "mkdtemp: errno " << errno;
        path_ = pattern;
    }
    ~ScratchDirectory() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    ScratchDirectory(const ScratchDirectory&) = delete;
    ScratchDirectory& operator=(const ScratchDirectory&) = delete;

    // Creates an empty file (and its directories) and returns its path.
    std::string file(const std::string& name) const {
        std::filesystem::path path = std::filesystem::path(path_) / name;
        std::filesystem::create_directories(path.parent_path());
        std::ofstream{path};
        return path;
    }
    std::string stampedFile(const std::string& name, int64_t expiry) const {
        std::string path = file(name);
        writeExpiryAttribute(path, expiry);
        return path;
    }
    // A link whose target refuses user attributes: every write through it fails.
    std::string unwritableFile(const std::string& name) const {
        std::string path = std::filesystem::path(path_) / name;
        std::filesystem::create_symlink("/proc/self/comm", path);
        return path;
    }

  private:
    std::string path_;
};

// Runs one command vector as the framework sends it; argv[0] is never read.
inline int runCommand(std::vector<std::string> words) {
    words.insert(words.begin(), "dlp");
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    return handleDLPCommands(static_cast<int>(words.size()), argv.data());
}

// The clock value that the fixed-time runs freeze; nothing under a running clock.
inline std::optional<long> frozenNow() {
    const char* value = std::getenv("DLP_FROZEN_NOW");
    if (value == nullptr) return std::nullopt;
    return std::strtol(value, nullptr, 10);
}

// The database of durations lives under /data/system/users: tests that reach it run only where
// that is a throwaway tmpfs, as the sandbox provides, never against a real device's data.
inline bool databaseDirectoryIsThrowaway() {
    struct statfs fileSystem {};
    return statfs("/data/system/users", &fileSystem) == 0 && fileSystem.f_type == TMPFS_MAGIC;
}

#define SKIP_UNLESS_DATABASE_IS_THROWAWAY()                                                   \
    do {                                                                                      \
        if (!::dlp::test::databaseDirectoryIsThrowaway()) {                                   \
            GTEST_SKIP() << "reaches /data/system/users: runs only inside tools/dlp-sandbox"; \
        }                                                                                     \
    } while (0)

// Fixed-time tests run only in the ctest entries that freeze the clock under faketime.
#define SKIP_UNLESS_CLOCK_IS_FROZEN()                                                           \
    do {                                                                                        \
        if (!::dlp::test::frozenNow()) GTEST_SKIP() << "needs the frozen clock of its own run"; \
        ASSERT_EQ(getCurrentTimeInSec(), *::dlp::test::frozenNow()) << "clock not frozen";      \
    } while (0)

// How "%d" shows a 64-bit time.
inline std::string low32(int64_t value) {
    return std::to_string(static_cast<int32_t>(value));
}

// For a message that prints a clock reading taken inside the call: how many system-buffer
// messages match it for any second from `first` to `last`.
template <typename MessageForSecond>
size_t countForSecondsBetween(const LogCapture& capture, int priority, long first, long last,
                              MessageForSecond messageForSecond) {
    size_t found = 0;
    for (long second = first; second <= last; ++second) {
        found += capture.count(kSystemBuffer, priority, messageForSecond(second));
    }
    return found;
}

}  // namespace dlp::test
