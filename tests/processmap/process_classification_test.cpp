#include <gtest/gtest.h>

#include <ctime>

#include "named_process.h"
#include "processmap/process_map_internal.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {

using RejectList = std::map<int, std::string>;

TEST(HashMap_isRejectedPid, SortsProcessesByName) {
    // (process name, expiry from now, rejected, entries removed, recorded as the file manager)
    const std::tuple<const char*, int64_t, bool, bool, bool> rows[] = {
            // Later than now in 64 bits, earlier in the low 32.
            {"com.vux.android.gallery3d", (int64_t{1} << 32) - 10, false, false, false},
            {"com.vux.android.gallery3d", 0, false, true, false},
            {"com.vux.android.app.filbrook", 3600, false, false, true},
            {"com.vux.android.app.filbrook", 0, false, true, true},
            {"com.hancom.office.viewer", 0, false, false, false},
            {"com.hancom.offic", 3600, true, false, false},
            {"com.vux.android.app.filbrook:remote", 0, true, false, false},
            {"com.example.notes", 3600, true, false, false},
    };
    for (auto [name, expiresIn, rejected, entriesRemoved, recordedAsFileManager] : rows) {
        SCOPED_TRACE(std::string(name) + " expiring in " + std::to_string(expiresIn));
        FreshProcessMap fresh;
        NamedProcess child(name);
        const int pid = child.pid();
        const MapEntry entry{pid, "pdf", time(nullptr) + expiresIn, 1};
        LibraryLockGuard guard;
        ASSERT_TRUE(mProcessMap.put(pid, entry));
        EXPECT_EQ(mProcessMap.isRejectedPid(pid, entry), rejected);
        EXPECT_EQ(HashMap::mInternalProcessMap.count(pid), entriesRemoved ? 0u : 1u);
        EXPECT_EQ(mProcessMap.mRejectList, (rejected ? RejectList{{pid, name}} : RejectList{}));
        EXPECT_EQ(mProcessMap.mFileManagerPid, recordedAsFileManager ? pid : -1);
    }
}

TEST(HashMap_isRejectedPid, RemembersARejectedPidWithoutNamingItAgain) {
    FreshProcessMap fresh;
    // Gone and reaped: even a whitelisted name no longer counts.
    const int ended = NamedProcess("com.vux.android.gallery3d").pid();
    const MapEntry entry{ended, "pdf", time(nullptr) + 3600, 1};
    LibraryLockGuard guard;
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    EXPECT_EQ(mProcessMap.mRejectList, (RejectList{{ended, "???"}}));
    LogCapture log;
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    EXPECT_EQ(log.take(), (std::vector<LogRecord>{systemDebug(
                                  "DLP_LIBDLP : <HashMap::isRejectedPid> pid [" +
                                  std::to_string(ended) + "] belongs to rejected process")}));
}

}  // namespace dlp::test
