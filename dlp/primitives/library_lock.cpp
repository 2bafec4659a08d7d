#include "primitives/library_lock.h"

namespace dlp {

std::unique_lock<std::recursive_mutex> lockLibraryState() {
    // Built on first use, which may come from another object's static construction; never
    // destroyed, so threads still calling in while the process exits find it intact.
    static std::recursive_mutex* libraryStateMutex = new std::recursive_mutex;
    return std::unique_lock<std::recursive_mutex>(*libraryStateMutex);
}

}  // namespace dlp
