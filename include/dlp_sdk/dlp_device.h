#pragma once

#include <dlp_sdk/export.h>

extern "C" {

// Each call opens "/dev/zmk_dlp", issues one request and closes it again. 0 on success, -1 on
// failure.
DLP_EXPORT int set_dlp_extension(int id, const char* extensions);
DLP_EXPORT int lock_dlp(int id);
DLP_EXPORT int unlock_dlp(int id);

}  // extern "C"
