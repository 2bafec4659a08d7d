#pragma once

#include <stdio.h>
#include <stdlib.h>

#include <filesystem>
#include <string>

namespace dlp::fuzz {

// The harness's own directory under $TMPDIR, removed when the harness exits. Its path holds no
// ".", since the library takes the extension from the whole path.
inline const std::string& scratchDirectory() {
    struct Directory {
        std::string path = std::filesystem::temp_directory_path() / "dlp-fuzz-XXXXXX";
        Directory() {
            if (mkdtemp(path.data()) == nullptr) {
                perror("mkdtemp");
                abort();
            }
        }
        ~Directory() {
            std::error_code ignored;
            std::filesystem::remove_all(path, ignored);
        }
    };
    static const Directory directory;
    return directory.path;
}

}  // namespace dlp::fuzz
