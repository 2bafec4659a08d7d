#pragma once

#include <string>
#include <vector>

namespace dlp::test {

struct LogRecord {
    int buffer;
    int priority;
    std::string text;
};

// Captures every message the library sends to liblog while it is alive (one at a time).
class LogCapture {
  public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogRecord> records() const;
    void clear();
    // How many captured messages have exactly this buffer, priority and text.
    size_t count(int buffer, int priority, const std::string& text) const;
    bool contains(int buffer, int priority, const std::string& text) const {
        return count(buffer, priority, text) > 0;
    }
    // Messages whose text contains `fragment`, in order.
    std::vector<LogRecord> matching(const std::string& fragment) const;
};

// Buffers as liblog reports them: __android_log_print writes to main, the rest to system.
constexpr int kMainBuffer = 0;
constexpr int kSystemBuffer = 3;
constexpr int kDebug = 3;
constexpr int kError = 6;

}  // namespace dlp::test
