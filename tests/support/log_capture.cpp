#include "support/log_capture.h"

#include <android/log.h>

#include <mutex>

namespace dlp::test {

namespace {

std::mutex capturedMutex;
std::vector<LogRecord> captured;

void captureMessage(const __android_logger_data* data, const char* message) {
    std::lock_guard<std::mutex> guard(capturedMutex);
    captured.push_back(LogRecord{data->buffer_id, data->priority, message});
}

}  // namespace

LogCapture::LogCapture() {
    clear();
    __android_log_set_logger(captureMessage);
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
}

LogCapture::~LogCapture() {
    __android_log_set_logger(__android_log_stderr_logger);
    __android_log_set_minimum_priority(ANDROID_LOG_DEFAULT);
}

std::vector<LogRecord> LogCapture::records() const {
    std::lock_guard<std::mutex> guard(capturedMutex);
    return captured;
}

void LogCapture::clear() {
    std::lock_guard<std::mutex> guard(capturedMutex);
    captured.clear();
}

size_t LogCapture::count(int buffer, int priority, const std::string& text) const {
    size_t found = 0;
    for (const LogRecord& record : records()) {
        if (record.buffer == buffer && record.priority == priority && record.text == text) ++found;
    }
    return found;
}

std::vector<LogRecord> LogCapture::matching(const std::string& fragment) const {
    std::vector<LogRecord> found;
    for (const LogRecord& record : records()) {
        if (record.text.find(fragment) != std::string::npos) found.push_back(record);
    }
    return found;
}

}  // namespace dlp::test
