#pragma once

#include <mutex>

namespace dlp {

// The process map, its iterator and the duration cache are shared by binder threads and the
// file-event thread. Every entry point that reaches them holds this lock; it is recursive because
// entry points call each other.
std::unique_lock<std::recursive_mutex> lockLibraryState();

}  // namespace dlp
