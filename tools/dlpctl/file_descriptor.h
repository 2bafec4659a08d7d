#pragma once

#include <unistd.h>

#include <cerrno>

// Owns a descriptor and closes it on every road, leaving errno as it was.
class FileDescriptor {
  public:
    explicit FileDescriptor(int descriptor = -1) : descriptor_(descriptor) {}
    ~FileDescriptor() { reset(); }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;

    int get() const { return descriptor_; }
    void reset(int descriptor = -1) {
        if (descriptor_ >= 0) {
            int saved = errno;
            close(descriptor_);
            errno = saved;
        }
        descriptor_ = descriptor;
    }

  private:
    int descriptor_;
};
