#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace dlp::test {

// A directory of its own, removed with its content. Its path holds no ".", since the library
// takes the extension from the whole path.
class ScratchDirectory {
  public:
    ScratchDirectory();
    ~ScratchDirectory();
    ScratchDirectory(const ScratchDirectory&) = delete;
    ScratchDirectory& operator=(const ScratchDirectory&) = delete;

    const std::string& path() const { return path_; }
    // An empty file (and its directories), carrying `expiry` when one is given.
    std::string file(const std::string& name, std::optional<int64_t> expiry = {}) const;

  private:
    std::string path_;
};

// The attribute "user.zorvat_dlp" as the kernel keeps it, without the library: raw bytes, or
// the 16-byte value with the expiry little-endian in bytes 0-7.
std::vector<unsigned char> readAttribute(const std::string& path);
void writeAttribute(const std::string& path, const std::vector<unsigned char>& value);
std::vector<unsigned char> expiryValue(int64_t expiry);

}  // namespace dlp::test
