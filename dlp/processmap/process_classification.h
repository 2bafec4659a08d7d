#pragma once

#include <dlp_sdk/process_map.h>

#include "primitives/library_lock.h"

namespace dlp {

// HashMap::isRejectedPid without copies of the entry or of the process name: it runs on every
// file a process creates.
bool isRejectedProcess(HashMap& map, int pid, const MapEntry& entry) REQUIRES(libraryLock);

}  // namespace dlp
