#pragma once

#include <functional>

namespace dlp::test {

// Runs `call` on another thread while this one holds the library lock, and `whileHeld` here once
// that thread sleeps on a futex. True when the call waited for the lock instead of finishing.
bool waitsForLibraryLock(
        const std::function<void()>& call, const std::function<void()>& whileHeld = [] {});

}  // namespace dlp::test
