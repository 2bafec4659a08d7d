#pragma once

// Expiry times are seconds since the epoch; only values greater than 0 count.
#include <cstdint>

namespace dlp {

// Stands for no expiry wherever an expiry is read or looked up.
constexpr int64_t kNoExpiry = -1;

}  // namespace dlp
