#pragma once

#include <dlp_sdk/clock.h>
#include <dlp_sdk/export.h>

// Records that `pid` opened `path` when the file carries an expiry in the future. False only for
// a null path.
DLP_EXPORT bool addOrUpdateMapEntry(int pid, char* path);
