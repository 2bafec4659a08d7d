#include "primitives/library_lock.h"

namespace dlp {

namespace {
// Constant-initialised, so it is usable before any other static object is built.
std::recursive_mutex libraryStateMutex;
}  // namespace

std::unique_lock<std::recursive_mutex> lockLibraryState() {
    return std::unique_lock<std::recursive_mutex>(libraryStateMutex);
}

}  // namespace dlp
