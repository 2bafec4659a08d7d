#pragma once

#include <dlp_sdk/export.h>

#include <stdint.h>

extern "C" {

// Writes `expiry` into the "user.zorvat_dlp" attribute of `path`. 0 on success, -1 on failure.
DLP_EXPORT int set_dlp_file_expiry_time(const char* path, int64_t expiry);

// The expiry stored on `path` when it is greater than 0, else -1.
DLP_EXPORT int64_t get_dlp_file_expiry_time(const char* path);

}  // extern "C"
