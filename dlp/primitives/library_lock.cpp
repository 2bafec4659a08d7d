#include "primitives/library_lock.h"

namespace dlp {

LibraryLock libraryLock;

}  // namespace dlp
