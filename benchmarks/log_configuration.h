#pragma once

namespace dlp::benchmarks {

// How liblog is set up while a library case runs.
enum class LogConfiguration {
    kSilenced,  // the starting logger, minimum priority SILENT: no message is formatted
    kDefault,   // liblog as it starts; on a host its logger writes every message to stderr
    kSink,      // every message formatted and handed to a logger that drops it
};

inline constexpr LogConfiguration kLogConfigurations[] = {
        LogConfiguration::kSilenced, LogConfiguration::kDefault, LogConfiguration::kSink};

const char* logConfigurationName(LogConfiguration configuration);

// Keeps liblog's starting minimum priority: call before anything changes it.
void rememberStartingLogSettings();

void applyLogConfiguration(LogConfiguration configuration);

}  // namespace dlp::benchmarks
