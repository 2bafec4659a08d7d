#include <dlp_sdk/process_name.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "support/child_process.h"
#include "support/library_messages.h"
#include "support/log_capture.h"

namespace dlp::test {
namespace {

// Looks the name up and checks that the one message names the pid and the result.
std::string nameOf(pid_t pid) {
    LogCapture log;
    std::string name = getProcessNameByPid(pid);
    expectRecords(log, {processNameMessage(pid, name)});
    return name;
}

TEST(ProcessNameTest, NamesAProcessByTheFirstWordOfItsCommandLine) {
    ChildProcess app("com.vux.android.gallery3d");
    EXPECT_EQ(nameOf(app.pid()), "com.vux.android.gallery3d");

    // sleep adds up all its arguments, so numbers keep the child alive.
    ChildProcess withArguments("com.hancom.office:viewer", {"1", "2"});
    EXPECT_EQ(nameOf(withArguments.pid()), "com.hancom.office:viewer");

    EXPECT_EQ(nameOf(getpid()), std::string(program_invocation_name));
}

TEST(ProcessNameTest, KeepsAtMost254BytesOfTheName) {
    std::string longName;
    for (int i = 0; i < 300; ++i) longName += static_cast<char>('a' + i % 26);
    ChildProcess app(longName);
    EXPECT_EQ(nameOf(app.pid()), longName.substr(0, 254));

    std::string exactName = longName.substr(0, 254);
    ChildProcess exact(exactName);
    EXPECT_EQ(nameOf(exact.pid()), exactName);
}

TEST(ProcessNameTest, EndedAndUnknownProcesses) {
    // A zombie still has its proc entry, but an empty command line.
    ChildProcess ended("com.vux.android.app.filbrook");
    ended.killWithoutReaping();
    EXPECT_EQ(nameOf(ended.pid()), "");

    EXPECT_EQ(nameOf(unusedPid()), "???");
    EXPECT_EQ(nameOf(-1), "???");
}

}  // namespace
}  // namespace dlp::test
