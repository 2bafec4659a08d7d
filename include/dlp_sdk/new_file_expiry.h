#pragma once

#include <dlp_sdk/clock.h>
#include <dlp_sdk/export.h>
#include <dlp_sdk/process_map.h>

// Decides and stamps the expiry of a file that `pid` has created. -1 for a null path, the
// positive errno of a failed write, else 0.
DLP_EXPORT int setExpiryforFile(int pid, char* path, int containerId);

// True when `entry` must not lend its expiry to a new file of `pid`. `path` is not read.
DLP_EXPORT bool isNewFileCase(MapEntry entry, char* path, int64_t currentTime, int pid);
