#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace dlp::test {

// The attribute as the kernel stores it, read and written without the library.
std::vector<unsigned char> readRawAttribute(const std::string& path);
void writeRawAttribute(const std::string& path, const std::vector<unsigned char>& value);

// 16 bytes, the expiry signed little-endian in bytes 0-7.
void writeExpiryAttribute(const std::string& path, int64_t expiry);
// The stored expiry, or nothing when the file carries no attribute. Any other length fails.
std::optional<int64_t> readExpiryAttribute(const std::string& path);

}  // namespace dlp::test
