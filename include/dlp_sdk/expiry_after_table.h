#pragma once

#include <dlp_sdk/export.h>

#include <cstdint>

// Per-container expiry-after durations, container ids 100 to 199.
extern "C" {

DLP_EXPORT int init_table();                            // 0 ready, 1 failure
DLP_EXPORT int set_time(int id, int time);              // 0 stored, 1 failure
DLP_EXPORT int get_time(int id);                        // the duration, -1 when none
DLP_EXPORT int set_expiryAfter_time(int id, int time);  // as set_time
DLP_EXPORT int get_expiryAfter_time(int id);            // as get_time, 1 instead of -1

}  // extern "C"

// Now plus the container's duration, in seconds since the epoch.
DLP_EXPORT int64_t getITAdminExpiryTime(int id);
