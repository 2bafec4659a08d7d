#pragma once

#include <cstdint>
#include <string>

// What `show` says about one file: the text after "FILE: ", or the error when `ok` is false.
struct FileExpiryReport {
    bool ok;
    std::string text;
};

// Reads the file's expiry through the library, and the attribute itself only to tell a file
// without an expiry from a missing file, a malformed value or a stored time of 0 or less.
FileExpiryReport reportFileExpiry(const std::string& path, int64_t now);
