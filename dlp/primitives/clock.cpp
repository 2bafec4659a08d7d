#include <dlp_sdk/clock.h>

#include <sys/time.h>

#include <ctime>

int64_t getCurrentTimeInSec() {
    timeval now{};
    gettimeofday(&now, nullptr);
    return now.tv_sec;
}

int64_t getEndOfDay() {
    time_t now = time(nullptr);
    tm local{};
    localtime_r(&now, &local);
    local.tm_hour = 23;
    local.tm_min = 59;
    local.tm_sec = 59;
    // Let mktime decide daylight saving for 23:59:59, which may differ from now's.
    local.tm_isdst = -1;
    return static_cast<int64_t>(mktime(&local));
}
