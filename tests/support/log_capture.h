#pragma once

#include <ostream>
#include <string>
#include <utility>
#include <vector>

namespace dlp::test {

struct LogRecord {
    int buffer;
    int priority;
    std::string text;
};
bool operator==(const LogRecord& left, const LogRecord& right);
void PrintTo(const LogRecord& record, std::ostream* out);

// Buffer ids and priorities as liblog reports them: __android_log_print writes to main, the rest
// to system.
constexpr int kMainBuffer = 0;
constexpr int kSystemBuffer = 3;
constexpr int kDebug = 3;
constexpr int kError = 6;

// The three kinds of message the library writes.
inline LogRecord mainError(std::string text) {
    return {kMainBuffer, kError, std::move(text)};
}
inline LogRecord systemDebug(std::string text) {
    return {kSystemBuffer, kDebug, std::move(text)};
}
inline LogRecord systemError(std::string text) {
    return {kSystemBuffer, kError, std::move(text)};
}

// Captures every message the library sends to liblog while it is alive (one at a time).
class LogCapture {
  public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogRecord> records() const;
    void clear();
    // How many captured messages equal `record` in buffer, priority and text.
    size_t count(const LogRecord& record) const;
    // Messages whose text contains `fragment`, in order.
    std::vector<LogRecord> matching(const std::string& fragment) const;
};

// Expects exactly `expected` to have been captured, in order, then clears the capture. A failure
// names the caller's line.
void expectRecords(LogCapture& log, const std::vector<LogRecord>& expected,
                   const char* file = __builtin_FILE(), int line = __builtin_LINE());
// The same for the messages whose text contains `fragment`; the others are cleared unchecked.
void expectRecords(LogCapture& log, const std::string& fragment,
                   const std::vector<LogRecord>& expected, const char* file = __builtin_FILE(),
                   int line = __builtin_LINE());

}  // namespace dlp::test
