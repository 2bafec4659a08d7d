#pragma once

#include <ostream>
#include <string>
#include <vector>

namespace dlp::test {

struct LogRecord {
    int buffer;
    int priority;
    std::string text;
};
bool operator==(const LogRecord& left, const LogRecord& right);
void PrintTo(const LogRecord& record, std::ostream* out);

// The three kinds of message: the primitives' (main buffer, error), the others' (system buffer).
LogRecord mainError(std::string text);
LogRecord systemDebug(std::string text);
LogRecord systemError(std::string text);

// Every message the library logs while it lives, one capture at a time. Each message also
// leaves errno changed, as liblog before Android 11 could: the library must restore it itself.
class LogCapture {
  public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    // The messages so far, which are then forgotten.
    std::vector<LogRecord> take();
};

}  // namespace dlp::test
