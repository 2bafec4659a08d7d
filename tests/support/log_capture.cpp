#include "support/log_capture.h"

#include <android/log.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <mutex>
#include <utility>

namespace dlp::test {
namespace {

std::mutex capturedMutex;
std::vector<LogRecord> captured;

// liblog's own limit on a formatted message.
constexpr size_t kLogBufferSize = 1024;

void capture(const __android_logger_data* data, const char* message) {
    std::lock_guard<std::mutex> guard(capturedMutex);
    // A null tag is liblog's program name: the library never logs with a tag of its own.
    std::string tag = data->tag != nullptr ? data->tag : "";
    captured.push_back({data->buffer_id, data->priority,
                        tag == program_invocation_short_name ? message : "tag " + tag});
}

int printAndChangeErrno(int buffer, int priority, const char* tag, const char* format,
                        va_list arguments) {
    char message[kLogBufferSize];
    vsnprintf(message, sizeof(message), format, arguments);
    int result = __android_log_buf_write(buffer, priority, tag, message);
    errno = EDOM;
    return result;
}

}  // namespace

bool operator==(const LogRecord& left, const LogRecord& right) {
    return left.buffer == right.buffer && left.priority == right.priority &&
           left.text == right.text;
}

void PrintTo(const LogRecord& record, std::ostream* out) {
    *out << "{" << (record.buffer == LOG_ID_MAIN ? "main" : "system") << "/" << record.priority
         << " " << ::testing::PrintToString(record.text) << "}";
}

LogRecord mainError(std::string text) {
    return {LOG_ID_MAIN, ANDROID_LOG_ERROR, std::move(text)};
}
LogRecord systemDebug(std::string text) {
    return {LOG_ID_SYSTEM, ANDROID_LOG_DEBUG, std::move(text)};
}
LogRecord systemError(std::string text) {
    return {LOG_ID_SYSTEM, ANDROID_LOG_ERROR, std::move(text)};
}

LogCapture::LogCapture() {
    take();
    __android_log_set_logger(capture);
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
}

LogCapture::~LogCapture() {
    __android_log_set_logger(__android_log_stderr_logger);
    __android_log_set_minimum_priority(ANDROID_LOG_DEFAULT);
}

std::vector<LogRecord> LogCapture::take() {
    std::lock_guard<std::mutex> guard(capturedMutex);
    return std::exchange(captured, {});
}

}  // namespace dlp::test

// The library's calls reach liblog through these (the tests link with --wrap).
extern "C" int __wrap___android_log_print(int priority, const char* tag, const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    int result = dlp::test::printAndChangeErrno(LOG_ID_MAIN, priority, tag, format, arguments);
    va_end(arguments);
    return result;
}

extern "C" int __wrap___android_log_buf_print(int buffer, int priority, const char* tag,
                                              const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    int result = dlp::test::printAndChangeErrno(buffer, priority, tag, format, arguments);
    va_end(arguments);
    return result;
}
