#pragma once

#include <android-base/errno_restorer.h>
#include <android/log.h>

// Callers read errno after logging, so a message must never change it. A message that liblog
// would drop is not formatted at all: the platform's own test, the one liblog applies itself,
// decides first, since most of these calls sit on every file open and create.

// The attribute, device and store primitives write every message, success included, to the main
// buffer at priority 6, with no tag.
#define DLP_PRIMITIVE_LOG(...)                                                            \
    do {                                                                                  \
        ::android::base::ErrnoRestorer errnoRestorer;                                     \
        if (__android_log_is_loggable(ANDROID_LOG_ERROR, nullptr, ANDROID_LOG_VERBOSE)) { \
            __android_log_print(ANDROID_LOG_ERROR, nullptr, __VA_ARGS__);                 \
        }                                                                                 \
    } while (0)

// Everything else goes to the system buffer, no tag.
#define DLP_SYSTEM_LOG(priority, ...)                                                 \
    do {                                                                              \
        ::android::base::ErrnoRestorer errnoRestorer;                                 \
        if (__android_log_is_loggable((priority), nullptr, ANDROID_LOG_VERBOSE)) {    \
            __android_log_buf_print(LOG_ID_SYSTEM, (priority), nullptr, __VA_ARGS__); \
        }                                                                             \
    } while (0)

#define DLP_SYSTEM_DEBUG(...) DLP_SYSTEM_LOG(ANDROID_LOG_DEBUG, __VA_ARGS__)
#define DLP_SYSTEM_ERROR(...) DLP_SYSTEM_LOG(ANDROID_LOG_ERROR, __VA_ARGS__)
