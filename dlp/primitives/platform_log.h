#pragma once

#include <android/log.h>
#include <cerrno>

namespace dlp {

// Callers read errno after logging, so a message must never change it.
class ErrnoKeeper {
  public:
    ErrnoKeeper() : saved_(errno) {}
    ~ErrnoKeeper() { errno = saved_; }
    ErrnoKeeper(const ErrnoKeeper&) = delete;
    ErrnoKeeper& operator=(const ErrnoKeeper&) = delete;

  private:
    int saved_;
};

}  // namespace dlp

// Error messages of the attribute, device and store primitives: main buffer, no tag.
#define DLP_PRINT_ERROR(...)                                          \
    do {                                                              \
        ::dlp::ErrnoKeeper dlp_errno_keeper;                          \
        __android_log_print(ANDROID_LOG_ERROR, nullptr, __VA_ARGS__); \
    } while (0)

// Everything else goes to the system buffer, no tag.
#define DLP_SYSTEM_LOG(priority, ...)                                             \
    do {                                                                          \
        ::dlp::ErrnoKeeper dlp_errno_keeper;                                      \
        __android_log_buf_print(LOG_ID_SYSTEM, (priority), nullptr, __VA_ARGS__); \
    } while (0)

#define DLP_SYSTEM_DEBUG(...) DLP_SYSTEM_LOG(ANDROID_LOG_DEBUG, __VA_ARGS__)
#define DLP_SYSTEM_ERROR(...) DLP_SYSTEM_LOG(ANDROID_LOG_ERROR, __VA_ARGS__)
