#include "support/log_capture.h"

#include <android/log.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <mutex>
#include <utility>

namespace dlp::test {

namespace {

std::mutex capturedMutex;
std::vector<LogRecord> captured;
// The library logs with a null tag, which liblog replaces by the program's name.
std::vector<std::string> otherTags;

void captureMessage(const __android_logger_data* data, const char* message) {
    std::lock_guard<std::mutex> guard(capturedMutex);
    captured.push_back(LogRecord{data->buffer_id, data->priority, message});
    if (data->tag == nullptr || std::strcmp(data->tag, program_invocation_short_name) != 0) {
        otherTags.push_back(data->tag == nullptr ? "(null)" : data->tag);
    }
}

std::vector<std::string> takeOtherTags() {
    std::lock_guard<std::mutex> guard(capturedMutex);
    return std::exchange(otherTags, {});
}

}  // namespace

bool operator==(const LogRecord& left, const LogRecord& right) {
    return left.buffer == right.buffer && left.priority == right.priority &&
           left.text == right.text;
}

void PrintTo(const LogRecord& record, std::ostream* out) {
    *out << "{buffer " << record.buffer << ", priority " << record.priority << ", "
         << ::testing::PrintToString(record.text) << "}";
}

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
    otherTags.clear();
}

size_t LogCapture::count(const LogRecord& wanted) const {
    size_t found = 0;
    for (const LogRecord& record : records()) found += record == wanted ? 1 : 0;
    return found;
}

std::vector<LogRecord> LogCapture::matching(const std::string& fragment) const {
    std::vector<LogRecord> found;
    for (const LogRecord& record : records()) {
        if (record.text.find(fragment) != std::string::npos) found.push_back(record);
    }
    return found;
}

namespace {

void compareRecords(const std::vector<LogRecord>& actual, const std::vector<LogRecord>& expected,
                    const char* file, int line) {
    for (const std::string& tag : takeOtherTags()) {
        ADD_FAILURE_AT(file, line) << "a message was logged with the tag " << tag;
    }
    if (actual == expected) return;
    auto list = [](const std::vector<LogRecord>& records) {
        std::string text;
        for (const LogRecord& record : records) text += "\n    " + ::testing::PrintToString(record);
        return text;
    };
    ADD_FAILURE_AT(file, line) << "log records:" << list(actual)
                               << "\n  expected:" << list(expected);
}

}  // namespace

void expectRecords(LogCapture& log, const std::vector<LogRecord>& expected, const char* file,
                   int line) {
    compareRecords(log.records(), expected, file, line);
    log.clear();
}

void expectRecords(LogCapture& log, const std::string& fragment,
                   const std::vector<LogRecord>& expected, const char* file, int line) {
    compareRecords(log.matching(fragment), expected, file, line);
    log.clear();
}

}  // namespace dlp::test
