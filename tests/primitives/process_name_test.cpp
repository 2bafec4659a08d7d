#include <dlp_sdk/process_name.h>
#include <gtest/gtest.h>
#include <sys/mount.h>

#include <climits>

#include "named_process.h"
#include "support/duration_database.h"
#include "support/log_capture.h"

namespace dlp::test {

TEST(getProcessNameByPid, TheFirstArgumentOfTheCommandLine) {
    if (!databaseIsThrowaway()) GTEST_SKIP() << "mounts over /proc: runs only in tools/dlp-sandbox";
    // Every child carries a second argument, its sleep time.
    NamedProcess app("com.vux.android.gallery3d");
    NamedProcess longName(std::string(254, 'a') + std::string(46, 'b'));
    NamedProcess zombie("com.hancom.office.viewer");
    zombie.killWithoutReaping();
    NamedProcess unreadable("com.vux.android.app.filbrook");
    // A command line that opens but cannot be read: the memory file reads address 0, EIO.
    std::string proc = "/proc/" + std::to_string(unreadable.pid());
    ASSERT_EQ(
            mount((proc + "/mem").c_str(), (proc + "/cmdline").c_str(), nullptr, MS_BIND, nullptr),
            0);
    const std::pair<int, std::string> rows[] = {{app.pid(), "com.vux.android.gallery3d"},
                                                {longName.pid(), std::string(254, 'a')},
                                                {zombie.pid(), ""},
                                                {unreadable.pid(), "???"},
                                                {INT_MAX, "???"},
                                                {-1, "???"},
                                                {INT_MIN, "???"}};
    for (const auto& [pid, name] : rows) EXPECT_EQ(getProcessNameByPid(pid), name) << pid;
    EXPECT_EQ(umount2((proc + "/cmdline").c_str(), MNT_DETACH), 0);

    LogCapture log;
    getProcessNameByPid(-1);
    EXPECT_EQ(log.take(), std::vector<LogRecord>{systemDebug(
                                  "DLP_LIBDLP : <getProcessNameByPid> pid[-1], processName[???]")});
}

}  // namespace dlp::test
