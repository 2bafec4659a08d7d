#include "expiry_text.h"

#include <charconv>
#include <cstring>
#include <ctime>

std::optional<int64_t> parseExpiry(const std::string& text, int64_t now) {
    bool relative = !text.empty() && text[0] == '+';
    const char* first = text.data() + (relative ? 1 : 0);
    const char* last = text.data() + text.size();
    int64_t value = 0;
    auto [end, error] = std::from_chars(first, last, value);
    if (error != std::errc()) return std::nullopt;
    if (!relative) return end == last ? std::optional<int64_t>(value) : std::nullopt;

    // A duration: a whole number and an optional unit.
    static const char kUnits[] = "smhd";
    static const int64_t kUnitSeconds[] = {1, 60, 3600, 86400};
    int64_t unitSeconds = 1;
    if (end != last) {
        const char* unit = end + 1 == last ? strchr(kUnits, *end) : nullptr;
        if (unit == nullptr || *end == '\0') return std::nullopt;
        unitSeconds = kUnitSeconds[unit - kUnits];
    }
    int64_t expiry = 0;
    if (*first == '-' || __builtin_mul_overflow(value, unitSeconds, &value) ||
        __builtin_add_overflow(now, value, &expiry)) {
        return std::nullopt;
    }
    return expiry;
}

std::string formatDuration(uint64_t seconds) {
    const uint64_t parts[] = {seconds / 86400, seconds / 3600 % 24, seconds / 60 % 60,
                              seconds % 60};
    const char units[] = {'d', 'h', 'm', 's'};
    std::string text;
    for (size_t i = 0; i < 4; ++i) {
        if (text.empty() && parts[i] == 0 && i < 3) continue;
        if (!text.empty()) text += ' ';
        text += std::to_string(parts[i]) + units[i];
    }
    return text;
}

std::string describeExpiry(int64_t expiry, int64_t now) {
    char when[64] = "beyond the calendar";
    time_t seconds = static_cast<time_t>(expiry);
    tm local{};
    // A 32-bit time_t ends in 2038: a later expiry is not cut to a date of the past.
    if (seconds == expiry && localtime_r(&seconds, &local) != nullptr) {
        strftime(when, sizeof(when), "%Y-%m-%d %H:%M:%S %Z", &local);
    }
    // Unsigned differences are exact here: the later minus the earlier of two 64-bit values.
    std::string distance = expiry > now ? "in " + formatDuration(static_cast<uint64_t>(expiry) -
                                                                 static_cast<uint64_t>(now))
                                        : "expired " +
                                                  formatDuration(static_cast<uint64_t>(now) -
                                                                 static_cast<uint64_t>(expiry)) +
                                                  " ago";
    return std::to_string(expiry) + " (" + when + ", " + distance + ")";
}
