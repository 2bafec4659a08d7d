#pragma once

#include <cstddef>
#include <string_view>

namespace dlp {

// One buffer for the /proc path and then the name: a name keeps at most 254 bytes.
constexpr size_t kProcessNameBufferSize = 255;

// getProcessNameByPid without a string on the heap, for the look-ups that run on every new file:
// the name, up to its first NUL, in the caller's buffer. Logs as getProcessNameByPid does.
std::string_view readProcessName(int pid, char (&buffer)[kProcessNameBufferSize]);

}  // namespace dlp
