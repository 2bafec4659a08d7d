#pragma once

#include <cstdint>
#include <string>

namespace dlp::test {

// A directory of its own under the temporary directory, removed with its content. Its path holds
// no ".", since the library takes the extension from the whole path.
class ScratchDirectory {
  public:
    ScratchDirectory();
    ~ScratchDirectory();
    ScratchDirectory(const ScratchDirectory&) = delete;
    ScratchDirectory& operator=(const ScratchDirectory&) = delete;

    const std::string& path() const { return path_; }
    // Creates an empty file (and its directories) and returns its path.
    std::string file(const std::string& name) const;
    // The same, carrying the expiry attribute.
    std::string stampedFile(const std::string& name, int64_t expiry) const;
    // A link whose target refuses user attributes: every write through it fails.
    std::string unwritableFile(const std::string& name) const;

  private:
    std::string path_;
};

}  // namespace dlp::test
