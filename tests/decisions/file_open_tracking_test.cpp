#include <dlp_sdk/file_open_tracking.h>
#include <gtest/gtest.h>

#include "support/log_capture.h"

namespace dlp::test {

// What the unit records shows in file_open_tracking.trace; a null path only here.
TEST(addOrUpdateMapEntry, RefusesNullPath) {
    LogCapture log;
    EXPECT_FALSE(addOrUpdateMapEntry(4242, nullptr));
    EXPECT_EQ(log.take(), std::vector<LogRecord>{systemError(
                                  "DLP_LIBDLP : <addOrUpdateMapEntry> file path is null. return "
                                  "false")});
}

}  // namespace dlp::test
