#include "log_configuration.h"

#include <android/log.h>

namespace dlp::benchmarks {

namespace {

int startingMinimumPriority = ANDROID_LOG_DEFAULT;

void discardMessage(const __android_logger_data*, const char*) {}

}  // namespace

const char* logConfigurationName(LogConfiguration configuration) {
    switch (configuration) {
        case LogConfiguration::kSilenced:
            return "silenced";
        case LogConfiguration::kDefault:
            return "default";
        case LogConfiguration::kSink:
            return "sink";
    }
    return "unknown";
}

void rememberStartingLogSettings() {
    startingMinimumPriority = __android_log_get_minimum_priority();
}

void applyLogConfiguration(LogConfiguration configuration) {
    // liblog cannot report its logger; a host build starts with the stderr logger, so that is
    // the one to put back.
    switch (configuration) {
        case LogConfiguration::kSilenced:
            __android_log_set_logger(__android_log_stderr_logger);
            __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
            break;
        case LogConfiguration::kDefault:
            __android_log_set_logger(__android_log_stderr_logger);
            __android_log_set_minimum_priority(startingMinimumPriority);
            break;
        case LogConfiguration::kSink:
            __android_log_set_logger(discardMessage);
            __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
            break;
    }
}

}  // namespace dlp::benchmarks
