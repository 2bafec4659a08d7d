#pragma once

#include <dlp_sdk/export.h>

#include <cstdint>

// Wall-clock seconds since the epoch.
DLP_EXPORT int64_t getCurrentTimeInSec();

// 23:59:59 of the current local day, in seconds since the epoch.
DLP_EXPORT int64_t getEndOfDay();
