#include <dlp_sdk/new_file_expiry.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <string>
#include <tuple>
#include <vector>

#include "command_vector.h"
#include "named_process.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

const std::string kPrefix = "DLP_LIBDLP : <setExpiryforFile> ";

TEST(setExpiryforFile, RefusesNullPath) {
    LogCapture log;
    EXPECT_EQ(setExpiryforFile(4242, nullptr, 150), -1);
    EXPECT_EQ(log.take(),
              std::vector<LogRecord>{systemError(kPrefix + "file path is null. return -1")});
}

// A FIFO refuses user attributes with EPERM: the write's own errno comes back, although logging
// in between changes errno; the zip copy reports nothing but its attribute's own message.
TEST(setExpiryforFile, ReturnsErrnoOfRefusedWriteExceptForZipCopy) {
    FreshProcessMap map;
    ScratchDirectory directory;
    NamedProcess office("com.hancom.office.viewer"), notes("com.example.notes"),
            fileManager("com.vux.android.app.filbrook");
    ASSERT_EQ(runCommandVector({"4", "0", std::to_string(office.pid()),
                                directory.file("opened.doc", 4102444800)}),
              0);
    for (const auto& [pid, name, result] : {std::tuple(office.pid(), "inherited.doc", EPERM),
                                            std::tuple(notes.pid(), "new.pdf", EPERM),
                                            std::tuple(fileManager.pid(), "copy.zip", 0)}) {
        std::string path = directory.path() + "/" + name;
        ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
        LogCapture log;
        EXPECT_EQ(setExpiryforFile(pid, path.data(), 150), result) << name;
        LogRecord refused = systemError(kPrefix + "Error: setxattr(" + path +
                                        ", setxattr error - -1, 1, Operation not permitted\n");
        EXPECT_EQ(log.take().back() == refused, result != 0) << name;
    }
}

TEST(isNewFileCase, ComparesOpeningAgeWithoutOverflow) {
    FreshProcessMap map;
    NamedProcess office("com.hancom.office.viewer");
    const struct {
        int64_t now, openTime;
        bool newFile;
    } cases[] = {{1000000599, 1000000000, false}, {1000000600, 1000000000, true},
                 {1000000000, 1000000600, false}, {LONG_MAX, LONG_MIN, true},
                 {LONG_MIN, LONG_MAX, false},     {LONG_MIN, LONG_MIN, false}};
    for (const auto& [now, openTime, newFile] : cases) {
        MapEntry entry{office.pid(), "doc", 4102444800, openTime};
        EXPECT_EQ(isNewFileCase(entry, nullptr, now, office.pid()), newFile)
                << now << " " << openTime;
    }
}

}  // namespace
}  // namespace dlp::test
