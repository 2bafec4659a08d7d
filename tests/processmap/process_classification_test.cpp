#include <gtest/gtest.h>
#include <unistd.h>

#include <ctime>
#include <fstream>
#include <string>
#include <vector>

#include "processmap/hash_map.h"
#include "support/child_process.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace {

using dlp::test::ChildProcess;

using dlp::test::kDebug;
using dlp::test::kSystemBuffer;

const std::string kWhitelisted = "DLP_LIBDLP : <HashMap::isWhitelistedProcess> pid match with ";
const std::string kFileManagerOrGallery = kWhitelisted + "filbrook or Gallery process";
const std::string kFileManager = kWhitelisted + "filbrook";
const std::string kHancom = kWhitelisted + "Hancom process";

std::string nameLine(int pid, const std::string& name) {
    return "DLP_LIBDLP : <getProcessNameByPid> pid[" + std::to_string(pid) + "], processName[" +
           name + "]";
}
std::string rejectedLine(int pid) {
    return "DLP_LIBDLP : <HashMap::isRejectedPid> pid [" + std::to_string(pid) +
           "] does not belongs to whitelisted application process adding to reject list";
}
std::string removingLine(int pid) {
    return "DLP_LIBDLP : <HashMap::checkAndDeleteProcessEntry> removing map entry for expired file "
           "creation for Pid[" +
           std::to_string(pid) + "]";
}
std::string removeLine(int pid) {
    return "DLP_LIBDLP : <HashMap::remove> key[" + std::to_string(pid) + "]";
}

class ProcessClassificationTest : public ::testing::Test {
  protected:
    void SetUp() override {
        dlp::test::resetProcessMap();
        log_.clear();
    }
    void TearDown() override { dlp::test::resetProcessMap(); }

    // Every message of the classification is a debug message on the system buffer.
    void expectMessages(const std::vector<std::string>& texts) {
        std::vector<dlp::test::LogRecord> records = log_.records();
        ASSERT_EQ(records.size(), texts.size());
        for (size_t i = 0; i < texts.size(); ++i) {
            EXPECT_EQ(records[i].buffer, kSystemBuffer) << i;
            EXPECT_EQ(records[i].priority, kDebug) << i;
            EXPECT_EQ(records[i].text, texts[i]) << i;
        }
        log_.clear();
    }

    // Stores an entry for the pid and hands it back, as HashMap::get would.
    MapEntry recordEntry(int pid, long expiry) {
        MapEntry entry{pid, "pdf", expiry, time(nullptr)};
        EXPECT_TRUE(mProcessMap.put(pid, entry));
        log_.clear();
        return entry;
    }

    static bool hasEntries(int pid) { return HashMap::mInternalProcessMap.count(pid) != 0; }

    dlp::test::LogCapture log_;
};

TEST_F(ProcessClassificationTest, GalleryIsWhitelistedAndForgottenOnceItsEntryExpires) {
    ChildProcess gallery("com.vux.android.gallery3d");
    const int pid = gallery.pid();
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) + 3600)));
    expectMessages({nameLine(pid, "com.vux.android.gallery3d"), kFileManagerOrGallery});
    EXPECT_TRUE(hasEntries(pid));

    // An entry that expires right now has expired.
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr))));
    expectMessages({nameLine(pid, "com.vux.android.gallery3d"), kFileManagerOrGallery,
                    removingLine(pid), removeLine(pid)});
    EXPECT_FALSE(hasEntries(pid));
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

TEST_F(ProcessClassificationTest, FileManagerPidIsRecordedEvenAfterItsRemoval) {
    ChildProcess fileManager("com.vux.android.app.filbrook");
    const int pid = fileManager.pid();
    const std::string name = "com.vux.android.app.filbrook";
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) + 3600)));
    expectMessages({nameLine(pid, name), kFileManagerOrGallery, kFileManager});
    EXPECT_TRUE(hasEntries(pid));
    EXPECT_EQ(mProcessMap.mFileManagerPid, pid);

    mProcessMap.mFileManagerPid = -1;
    EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 1)));
    expectMessages({nameLine(pid, name), kFileManagerOrGallery, removingLine(pid), removeLine(pid),
                    kFileManager});
    EXPECT_FALSE(hasEntries(pid));
    EXPECT_EQ(mProcessMap.mFileManagerPid, pid);
    EXPECT_TRUE(mProcessMap.mRejectList.empty());

    // The pid recorded is the entry's.
    EXPECT_TRUE(
            mProcessMap.isWhitelistedProcess(name, MapEntry{4242, "pdf", time(nullptr) + 60, 1}));
    EXPECT_EQ(mProcessMap.mFileManagerPid, 4242);
}

TEST_F(ProcessClassificationTest, OfficeSuiteIsWhitelistedByPackagePrefixWithoutExpiryCheck) {
    ChildProcess office("com.hancom.office:documents");
    ChildProcess exactOffice("com.hancom.office");
    for (const ChildProcess* child : {&office, &exactOffice}) {
        const int pid = child->pid();
        EXPECT_FALSE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
        EXPECT_EQ(log_.count(kSystemBuffer, kDebug, kHancom), 1u);
        EXPECT_EQ(log_.records().size(), 2u);
        EXPECT_TRUE(hasEntries(pid));
        log_.clear();
    }
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);

    ChildProcess prefix("com.hancom.offic");
    const int pid = prefix.pid();
    EXPECT_TRUE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
    expectMessages({nameLine(pid, "com.hancom.offic"), rejectedLine(pid)});
    EXPECT_EQ(mProcessMap.mRejectList, (std::map<int, std::string>{{pid, "com.hancom.offic"}}));
    EXPECT_TRUE(hasEntries(pid));
}

TEST_F(ProcessClassificationTest, OtherNamesAreNotWhitelisted) {
    for (const char* name :
         {"com.vux.android.app.filbrook:remote", "com.vux.android.gallery3d:remote",
          "com.vux.android.app.filbroo", "COM.HANCOM.OFFICE", "com.hancom", "", "???"}) {
        EXPECT_FALSE(mProcessMap.isWhitelistedProcess(name, MapEntry{4242, "pdf", 1, 1})) << name;
    }
    EXPECT_TRUE(log_.records().empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

TEST_F(ProcessClassificationTest, RejectedPidsStayRejectedWithoutBeingNamedAgain) {
    ChildProcess remote("com.vux.android.app.filbrook:remote");
    const int pid = remote.pid();
    EXPECT_TRUE(mProcessMap.isRejectedPid(pid, recordEntry(pid, time(nullptr) - 10)));
    expectMessages({nameLine(pid, "com.vux.android.app.filbrook:remote"), rejectedLine(pid)});
    EXPECT_EQ(mProcessMap.mRejectList.at(pid), "com.vux.android.app.filbrook:remote");
    EXPECT_TRUE(hasEntries(pid));

    const int ended = dlp::test::unusedPid();
    const MapEntry entry{ended, "pdf", time(nullptr) + 3600, time(nullptr)};
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    expectMessages({nameLine(ended, "???"), rejectedLine(ended)});
    EXPECT_EQ(mProcessMap.mRejectList.at(ended), "???");
    for (int call = 0; call < 2; ++call) {
        EXPECT_TRUE(mProcessMap.isRejectedPid(ended, MapEntry{ended, "pdf", 1, 1}));
        expectMessages({"DLP_LIBDLP : <HashMap::isRejectedPid> pid [" + std::to_string(ended) +
                        "] belongs to rejected process"});
    }
    EXPECT_EQ(mProcessMap.mRejectList.size(), 2u);

    // Only its removal lets the pid be named again.
    mProcessMap.remove(ended);
    log_.clear();
    EXPECT_TRUE(mProcessMap.isRejectedPid(ended, entry));
    expectMessages({nameLine(ended, "???"), rejectedLine(ended)});
}

TEST_F(ProcessClassificationTest, ExpiryIsComparedInSixtyFourBits) {
    const long now = time(nullptr);
    recordEntry(100, now + 3600);
    mProcessMap.mRejectList = {{100, "app"}};
    mProcessMap.mFileManagerPid = 100;

    // The low 32 bits of the first expiry alone would lie in the past.
    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", now + (1L << 32) - 10, now});
    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", now + 3600, now});
    EXPECT_TRUE(log_.records().empty());
    EXPECT_TRUE(hasEntries(100));

    mProcessMap.checkAndDeleteProcessEntry(MapEntry{100, "pdf", -1, now});
    expectMessages({removingLine(100), removeLine(100)});
    EXPECT_FALSE(hasEntries(100));
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

}  // namespace
