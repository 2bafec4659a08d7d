#pragma once

#include <cstdint>
#include <optional>
#include <string>

// Seconds since the epoch (optionally negative), or "+DURATION" after `now`, DURATION a whole
// number with an optional unit s, m, h or d. Nothing for any other text or a value beyond 64 bits.
std::optional<int64_t> parseExpiry(const std::string& text, int64_t now);

// "1d 2h 3m 4s" with the leading zero units left out; "0s" for 0.
std::string formatDuration(uint64_t seconds);

// "EXPIRY (LOCAL TIME ZONE, in DURATION)", or "..., expired DURATION ago)" when it is not later
// than `now`.
std::string describeExpiry(int64_t expiry, int64_t now);
