#pragma once

#include <dlp_sdk/file_open_tracking.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>

#include "support/log_capture.h"

namespace dlp::test {

// The clock value that the fixed-time runs freeze; nothing under a running clock.
inline std::optional<long> frozenNow() {
    const char* value = std::getenv("DLP_FROZEN_NOW");
    if (value == nullptr) return std::nullopt;
    return std::strtol(value, nullptr, 10);
}

// Fixed-time tests run only in the ctest entries that freeze the clock under faketime.
#define SKIP_UNLESS_CLOCK_IS_FROZEN()                                                           \
    do {                                                                                        \
        if (!::dlp::test::frozenNow()) GTEST_SKIP() << "needs the frozen clock of its own run"; \
        ASSERT_EQ(getCurrentTimeInSec(), *::dlp::test::frozenNow()) << "clock not frozen";      \
    } while (0)

// How "%d" shows a 64-bit time.
inline std::string low32(int64_t value) {
    return std::to_string(static_cast<int32_t>(value));
}

// For a message that prints a clock reading taken inside the call: how many captured messages
// match it for any second from `first` to `last`.
template <typename MessageForSecond>
size_t countForSecondsBetween(const LogCapture& capture, long first, long last,
                              MessageForSecond messageForSecond) {
    size_t found = 0;
    for (long second = first; second <= last; ++second) {
        found += capture.count(messageForSecond(second));
    }
    return found;
}

}  // namespace dlp::test
