#include <gtest/gtest.h>

#include <ctime>
#include <string>

#include "processmap/process_map_internal.h"
#include "support/child_process.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {
namespace {

const std::string kWhitelisted = "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with ";
const LogRecord kFileManagerOrGallery = systemDebug(kWhitelisted + "filbrook or Gallery process");
const LogRecord kFileManager = systemDebug(kWhitelisted + "filbrook");
const LogRecord kHancom = systemDebug(kWhitelisted + "Hancom process");

LogRecord rejectedMessage(int pid) {
    return systemDebug("DLP_LIBDLP : <HashMap::isRejectedPid> pid [" + std::to_string(pid) +
                       "] does not belongs to whitelisted application process adding to reject "
                       "list");
}
LogRecord removingMessage(int pid) {
    return systemDebug(
            "DLP_LIBDLP : <HashMap::checkAndDeleteProcessEntry> removing map entry for expired "
            "file creation for Pid[" +
            std::to_string(pid) + "]");
}

class ProcessClassificationTest : public ::testing::Test {
  protected:
    // Stores an entry for the pid and hands it back, as HashMap::get would.
    MapEntry recordEntry(int pid, long expiry) {
        MapEntry entry{pid, "pdf", expiry, time(nullptr)};
        EXPECT_TRUE(mProcessMap.put(pid, entry));
        log_.clear();
        return entry;
    }

    static bool hasEntries(int pid) { return HashMap::mInternalProcessMap.count(pid) != 0; }

    FreshProcessMap map_;
    LogCapture log_;
};

TEST_F(ProcessClassificationTest, GalleryIsWhitelistedAndForgottenOnceItsEntryExpires) {
    ChildProcess gallery("com.vux.android.gallery3d");
    const int pid = gallery.pid();
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) + 3600)));
    expectRecords(log_,
                  {processNameMessage(pid, "com.vux.android.gallery3d"), kFileManagerOrGallery});
    EXPECT_TRUE(hasEntries(pid));

    // An entry that expires right now has expired.
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr))));
    expectRecords(log_, {processNameMessage(pid, "com.vux.android.gallery3d"),
                         kFileManagerOrGallery, removingMessage(pid), removeMessage(pid)});
    EXPECT_FALSE(hasEntries(pid));
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

TEST_F(ProcessClassificationTest, FileManagerPidIsRecordedEvenAfterItsRemoval) {
    ChildProcess fileManager("com.vux.android.app.filbrook");
    const int pid = fileManager.pid();
    const std::string name = "com.vux.android.app.filbrook";
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) + 3600)));
    expectRecords(log_, {processNameMessage(pid, name), kFileManagerOrGallery, kFileManager});
    EXPECT_TRUE(hasEntries(pid));
    EXPECT_EQ(mProcessMap.mFileManagerPid, pid);

    mProcessMap.mFileManagerPid = -1;
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 1)));
    expectRecords(log_, {processNameMessage(pid, name), kFileManagerOrGallery, removingMessage(pid),
                         removeMessage(pid), kFileManager});
    EXPECT_FALSE(hasEntries(pid));
    EXPECT_EQ(mProcessMap.mFileManagerPid, pid);
    EXPECT_TRUE(mProcessMap.mRejectList.empty());

    // The pid recorded is the entry's.
    EXPECT_TRUE(
            mProcessMap.isWhitelistedProcess(name, MapEntry{4242, "pdf", time(nullptr) + 60, 1}));
    EXPECT_EQ(mProcessMap.mFileManagerPid, 4242);
}

TEST_F(ProcessClassificationTest, OfficeSuiteIsWhitelistedByPackagePrefixWithoutExpiryCheck) {
    for (const char* name : {"com.hancom.office:documents", "com.hancom.office"}) {
        ChildProcess office(name);
        const int pid = office.pid();
        EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
        expectRecords(log_, {processNameMessage(pid, name), kHancom});
        EXPECT_TRUE(hasEntries(pid));
    }
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);

    ChildProcess prefix("com.hancom.offic");
    const int pid = prefix.pid();
    EXPECT_TRUE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
    expectRecords(log_, {processNameMessage(pid, "com.hancom.offic"), rejectedMessage(pid)});
    EXPECT_EQ(mProcessMap.mRejectList, (std::map<int, std::string>{{pid, "com.hancom.offic"}}));
    EXPECT_TRUE(hasEntries(pid));
}

TEST_F(ProcessClassificationTest, OtherNamesAreNotWhitelisted) {
    for (const char* name :
         {"com.vux.android.app.filbrook:remote", "com.vux.android.gallery3d:remote",
          "com.vux.android.app.filbroo", "COM.HANCOM.OFFICE", "com.hancom", "", "???"}) {
        EXPECT_FALSE(mProcessMap.isWhitelistedProcess(name, MapEntry{4242, "pdf", 1, 1})) << name;
    }
    expectRecords(log_, {});
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

TEST_F(ProcessClassificationTest, RejectedPidsStayRejectedWithoutBeingNamedAgain) {
    ChildProcess remote("com.vux.android.app.filbrook:remote");
    const int pid = remote.pid();
    EXPECT_TRUE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
    expectRecords(log_, {processNameMessage(pid, "com.vux.android.app.filbrook:remote"),
                         rejectedMessage(pid)});
    EXPECT_EQ(mProcessMap.mRejectList.at(pid), "com.vux.android.app.filbrook:remote");
    EXPECT_TRUE(hasEntries(pid));

    const int ended = unusedPid();
    const MapEntry entry{ended, "pdf", time(nullptr) + 3600, time(nullptr)};
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    expectRecords(log_, {processNameMessage(ended, "???"), rejectedMessage(ended)});
    EXPECT_EQ(mProcessMap.mRejectList.at(ended), "???");
    for (int call = 0; call < 2; ++call) {
        EXPECT_TRUE(mProcessMap.isRejectedPid(ended, MapEntry{ended, "pdf", 1, 1}));
        expectRecords(log_, {systemDebug("DLP_LIBDLP : <HashMap::isRejectedPid> pid [" +
                                         std::to_string(ended) + "] belongs to rejected process")});
    }
    EXPECT_EQ(mProcessMap.mRejectList.size(), 2u);

    // Only its removal lets the pid be named again.
    mProcessMap.remove(ended);
    log_.clear();
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    expectRecords(log_, {processNameMessage(ended, "???"), rejectedMessage(ended)});
}

TEST_F(ProcessClassificationTest, ExpiryIsComparedInSixtyFourBits) {
    const long now = time(nullptr);
    recordEntry(100, now + 3600);
    mProcessMap.mRejectList = {{100, "app"}};
    mProcessMap.mFileManagerPid = 100;

    // The low 32 bits of the first expiry alone would lie in the past.
    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", now + (1L << 32) - 10, now});
    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", now + 3600, now});
    expectRecords(log_, {});
    EXPECT_TRUE(hasEntries(100));

    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", -1, now});
    expectRecords(log_, {removingMessage(100), removeMessage(100)});
    EXPECT_FALSE(hasEntries(100));
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

}  // namespace
}  // namespace dlp::test
