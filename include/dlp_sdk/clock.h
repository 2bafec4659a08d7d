#pragma once

#include <dlp_sdk/export.h>

// Wall-clock seconds since the epoch.
DLP_EXPORT long getCurrentTimeInSec();

// 23:59:59 of the current local day, in seconds since the epoch.
DLP_EXPORT long getEndOfDay();
