#pragma once

#include <cstdint>

#include "primitives/library_lock.h"

// The store's entry points for callers that already hold the library lock.
namespace dlp {

int getTimeLocked(int id) REQUIRES(libraryLock);
int setTimeLocked(int id, int time) REQUIRES(libraryLock);
// get_expiryAfter_time: the duration, or 1 when none can be read.
int expiryAfterTimeLocked(int id) REQUIRES(libraryLock);
// getITAdminExpiryTime: now plus the container's duration.
int64_t adminExpiryTimeLocked(int id) REQUIRES(libraryLock);

}  // namespace dlp
