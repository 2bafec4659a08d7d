#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>
#include <sys/time.h>

#include <ctime>
#include <string>

#include "decisions/frozen_clock.h"
#include "primitives/path_extension.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

constexpr int kPid = 4242;

// A freshly loaded process map, a directory for the reported files and the log.
struct TrackingScene {
    std::vector<MapEntry> entriesOf(int pid) const {
        auto found = HashMap::mInternalProcessMap.find(pid);
        return found == HashMap::mInternalProcessMap.end() ? std::vector<MapEntry>{}
                                                           : found->second;
    }

    FreshProcessMap map;
    ScratchDirectory directory;
    LogCapture log;
};

LogRecord refusalMessage(long now, long expiry) {
    return systemError("DLP_LIBDLP : <HashMap::addOrUpdateMapEntry> curTime[" + low32(now) +
                       "], entryInMap.value_expiry[" + low32(expiry) + "] ignoring add to map");
}

LogRecord recordMessage(const std::string& path) {
    return systemDebug("DLP_LIBDLP : <addOrUpdateMapEntry> addOrUpdate for file[" + path + "]");
}

TEST(getExtensionFromPath, TakesLowerCasedTextAfterLastDotOfWholePath) {
    EXPECT_EQ(getExtensionFromPath("/sdcard/Report.DOCX"), "docx");
    EXPECT_EQ(getExtensionFromPath("/sdcard/old.dir/README"), "dir/readme");
    EXPECT_EQ(getExtensionFromPath("/sdcard/README"), "/sdcard/readme");
    EXPECT_EQ(getExtensionFromPath("/sdcard/name."), "");
    EXPECT_EQ(getExtensionFromPath("/sdcard/backup.tar.GZ"), "gz");
    // Only ASCII capitals change; the bytes of other characters pass through.
    EXPECT_EQ(getExtensionFromPath("/sdcard/x.\xC3\x84Z"), "\xC3\x84z");
}

TEST(getCurrentTimeInSec, ReadsSecondsOfWallClock) {
    timeval before{};
    gettimeofday(&before, nullptr);
    long now = getCurrentTimeInSec();
    timeval after{};
    gettimeofday(&after, nullptr);
    EXPECT_GE(now, before.tv_sec);
    EXPECT_LE(now, after.tv_sec);
}

TEST(addOrUpdateMapEntry, RefusesNullPath) {
    TrackingScene scene;
    EXPECT_FALSE(addOrUpdateMapEntry(kPid, nullptr));
    expectRecords(
            scene.log,
            {systemError("DLP_LIBDLP : <addOrUpdateMapEntry> file path is null. return false")});
    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
}

TEST(addOrUpdateMapEntry, IgnoresFilesWithoutFutureExpiry) {
    TrackingScene scene;
    std::string unprotected = scene.directory.file("plain.pdf");
    long now = time(nullptr);
    std::string expired = scene.directory.stampedFile("expired.pdf", now - 100);

    long first = getCurrentTimeInSec();
    EXPECT_TRUE(addOrUpdateMapEntry(kPid, unprotected.data()));
    EXPECT_TRUE(addOrUpdateMapEntry(kPid, expired.data()));
    long last = getCurrentTimeInSec();

    EXPECT_TRUE(scene.entriesOf(kPid).empty());
    EXPECT_EQ(countForSecondsBetween(scene.log, first, last,
                                     [](long second) { return refusalMessage(second, -1); }),
              1u);
    EXPECT_EQ(
            countForSecondsBetween(scene.log, first, last,
                                   [&](long second) { return refusalMessage(second, now - 100); }),
            1u);
    EXPECT_TRUE(scene.log.matching("<addOrUpdateMapEntry> addOrUpdate").empty());
}

TEST(addOrUpdateMapEntry, RecordsProtectedFileWithLowerCasedExtension) {
    TrackingScene scene;
    // Beyond 32 bits: the entry keeps the whole time.
    const long expiry = 5000000000;
    std::string path = scene.directory.stampedFile("A.PDF", expiry);

    long first = getCurrentTimeInSec();
    EXPECT_TRUE(addOrUpdateMapEntry(kPid, path.data()));
    long last = getCurrentTimeInSec();

    std::vector<MapEntry> entries = scene.entriesOf(kPid);
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_EQ(entries[0].value_pid, kPid);
    EXPECT_EQ(entries[0].value_extension, "pdf");
    EXPECT_EQ(entries[0].value_expiry, expiry);
    EXPECT_GE(entries[0].value_opentime, first);
    EXPECT_LE(entries[0].value_opentime, last);
    EXPECT_EQ(scene.log.count(recordMessage(path)), 1u);
    EXPECT_TRUE(scene.log.matching("ignoring add to map").empty());
}

TEST(addOrUpdateMapEntry, LeavesUnprotectedExtensionsToStoreRefusal) {
    TrackingScene scene;
    long now = time(nullptr);
    std::string notes = scene.directory.stampedFile("notes.xyz", now + 1000);
    // Its only dot lies in a directory name: "pdf/page" is no protected extension.
    std::string page = scene.directory.stampedFile("scans.pdf/page", now + 1000);

    EXPECT_TRUE(addOrUpdateMapEntry(kPid, notes.data()));
    EXPECT_TRUE(addOrUpdateMapEntry(kPid, page.data()));

    EXPECT_TRUE(HashMap::mInternalProcessMap.empty());
    EXPECT_EQ(scene.log.count(recordMessage(notes)), 1u);
    EXPECT_EQ(scene.log.count(unprotectedExtensionMessage()), 2u);
}

// Runs under a frozen clock past 2^32 seconds, so that "%d" shows only the low 32 bits.
TEST(addOrUpdateMapEntry, ComparesExpiryWithCurrentSecondAtFixedTime) {
    SKIP_UNLESS_CLOCK_IS_FROZEN();
    std::optional<long> now = frozenNow();
    TrackingScene scene;
    std::string expiringNow = scene.directory.stampedFile("now.pdf", *now);
    std::string expiringNext = scene.directory.stampedFile("next.docx", *now + 1);

    EXPECT_TRUE(addOrUpdateMapEntry(kPid, expiringNow.data()));
    EXPECT_EQ(scene.log.count(refusalMessage(*now, *now)), 1u);
    EXPECT_TRUE(scene.entriesOf(kPid).empty());

    EXPECT_TRUE(addOrUpdateMapEntry(kPid, expiringNext.data()));
    std::vector<MapEntry> entries = scene.entriesOf(kPid);
    ASSERT_EQ(entries.size(), 1u);
    EXPECT_EQ(entries[0].value_extension, "docx");
    EXPECT_EQ(entries[0].value_expiry, *now + 1);
    EXPECT_EQ(entries[0].value_opentime, *now);
}

}  // namespace
}  // namespace dlp::test
