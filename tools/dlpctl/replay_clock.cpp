#include "replay_clock.h"

#include <sys/time.h>

#include <cstring>
#include <ctime>

namespace {

// Plain constants, so that a call before any static initialiser has run reads them right.
bool clockIsFrozen = false;
int64_t frozenSecond = 0;

timespec realNow() {
    // Not time() or gettimeofday(): those are the definitions below.
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    return now;
}

}  // namespace

namespace replay_clock {

void freezeAt(int64_t second) {
    frozenSecond = second;
    clockIsFrozen = true;
}

int64_t now() {
    return clockIsFrozen ? frozenSecond : static_cast<int64_t>(realNow().tv_sec);
}

}  // namespace replay_clock

// The dynamic linker binds the library's calls to these definitions of the executable, which
// must therefore be visible outside it.
#define REPLAY_CLOCK_VISIBLE __attribute__((visibility("default")))

extern "C" REPLAY_CLOCK_VISIBLE time_t time(time_t* result) noexcept {
    time_t second = static_cast<time_t>(replay_clock::now());
    if (result != nullptr) *result = second;
    return second;
}

extern "C" REPLAY_CLOCK_VISIBLE int gettimeofday(timeval* __restrict result,
                                                 void* __restrict zone) noexcept {
    if (clockIsFrozen) {
        result->tv_sec = static_cast<time_t>(frozenSecond);
        result->tv_usec = 0;
    } else {
        timespec now = realNow();
        result->tv_sec = now.tv_sec;
        result->tv_usec = now.tv_nsec / 1000;
    }
    // The obsolete time-zone argument reads as UTC, as the C library leaves it.
    if (zone != nullptr) memset(zone, 0, sizeof(struct timezone));
    return 0;
}
