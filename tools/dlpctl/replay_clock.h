#pragma once

#include <cstdint>

// The wall clock of this program and of the library it has loaded. The program defines `time`
// and `gettimeofday`, so the library's own calls read this clock too.
namespace replay_clock {

// From now on the clock reads `second`, fixed.
void freezeAt(int64_t second);

// The second in force: the frozen one, or the real wall clock's.
int64_t now();

}  // namespace replay_clock
