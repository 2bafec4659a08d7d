#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <optional>
#include <string>
#include <tuple>

#include "decisions/frozen_clock.h"
#include "support/child_process.h"
#include "support/command_vector.h"
#include "support/duration_database.h"
#include "support/expiry_attribute_bytes.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

const std::string kFileManager = "com.vux.android.app.filbrook";
const std::string kGallery = "com.vux.android.gallery3d";
const std::string kOffice = "com.hancom.office.viewer";
const std::string kOtherApp = "com.example.notes";

struct DecisionScene {
    // Reports a file, carrying `expiry`, as opened by `pid` (command 4).
    void opened(pid_t pid, const std::string& name, long expiry) {
        std::string path = directory.stampedFile(name, expiry);
        EXPECT_EQ(runCommand({"4", "0", std::to_string(pid), path}), 0) << path;
    }
    // A new file by `pid`, carrying `existing` if given, once setExpiryforFile has succeeded on it.
    std::string created(pid_t pid, const std::string& name, int containerId,
                        std::optional<long> existing = std::nullopt) {
        std::string path = existing ? directory.stampedFile(name, *existing) : directory.file(name);
        EXPECT_EQ(setExpiryforFile(pid, path.data(), containerId), 0) << path;
        return path;
    }

    FreshProcessMap map;
    ScratchDirectory directory;
    LogCapture log;
};

void storeDuration(int containerId, int seconds) {
    ASSERT_EQ(runCommand({"3", std::to_string(containerId), std::to_string(seconds)}), 0);
}

// Opening times that the clock cannot produce on demand go straight into the map.
void putOpenedEntry(pid_t pid, const std::string& extension, long expiry, long openTime) {
    HashMap::mInternalProcessMap[pid].push_back(MapEntry{pid, extension, expiry, openTime});
}

bool hasEntries(pid_t pid) {
    return HashMap::mInternalProcessMap.count(pid) != 0;
}

const std::string kPrefix = "DLP_LIBDLP : <setExpiryforFile> ";

LogRecord inheritingMessage(long expiry, const std::string& path) {
    return systemDebug(kPrefix + "INHERITING CASE. expiry time[" + low32(expiry) +
                       "] for the file[" + path + "]");
}
LogRecord newFileMessage(pid_t pid, const std::string& path, long expiry) {
    return systemDebug(kPrefix + "NEWFILE CASE. pid[" + std::to_string(pid) + "], file_path[" +
                       path + "]. Set IT admin's expiry[" + std::to_string(expiry) + "]");
}
LogRecord timesMessage(const std::string& caseName, long now, long current) {
    return systemDebug(kPrefix + caseName + " -- current time[" + low32(now) + "], expiry_time[" +
                       low32(current) + "], time diff[" + low32(current - now) + "]");
}
LogRecord rejectedMessage(pid_t pid) {
    return systemDebug("DLP_LIBDLP : <isNewFileCase> pid[" + std::to_string(pid) +
                       "] passed is in reject list do new file case");
}

const std::string kZipCase = "support 2.7 Zip copy";
const std::string kFileManagerCase = "Filbrook support case";
const std::string kAlreadySet = " -- DLP expiry time is already set by Filbrook ignoring the case";
const LogRecord kZipAlreadySetMessage = systemDebug(kPrefix + "support for 2.7 zip" + kAlreadySet);
const LogRecord kFileManagerAlreadySetMessage =
        systemDebug(kPrefix + kFileManagerCase + kAlreadySet);
const LogRecord kSetOkMessage = systemDebug(kPrefix + "setxattr OK\n");
const LogRecord kZipInheritMessage =
        systemDebug(kPrefix + "support for 2.7 zip -- last opened entry is zip inheriting");
const LogRecord kZipEndOfDayMessage =
        systemDebug(kPrefix + "zip file created from Filbrook. Set End of day");

// The new-file case under a running clock: t1 + duration, where t1 lies between two readings
// taken around the call.
void expectNewFileExpiry(const DecisionScene& scene, pid_t pid, const std::string& path, long first,
                         long last, long duration) {
    std::optional<int64_t> written = readExpiryAttribute(path);
    ASSERT_TRUE(written.has_value()) << path;
    EXPECT_GE(*written, first + duration) << path;
    EXPECT_LE(*written, last + duration) << path;
    EXPECT_EQ(scene.log.count(newFileMessage(pid, path, *written)), 1u);
}

TEST(setExpiryforFile, RefusesNullPath) {
    DecisionScene scene;
    EXPECT_EQ(setExpiryforFile(100, nullptr, 100), -1);
    expectRecords(scene.log, {systemError(kPrefix + "file path is null. return -1")});
}

TEST(setExpiryforFile, WhitelistedProcessesInheritFromSameOrMostRecentRelatedExtension) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    storeDuration(110, 7200);
    long now = time(nullptr);
    ChildProcess gallery(kGallery);
    ChildProcess office(kOffice);
    scene.opened(gallery.pid(), "photo.jpg", now + 5000);
    scene.opened(office.pid(), "letter.docx", now + 1000);
    scene.opened(office.pid(), "notes.txt", now + 2000);
    scene.opened(office.pid(), "budget.xlsx", now + 3000);
    scene.opened(office.pid(), "scan.pdf", now + 4000);

    // txt was opened after docx, and the pdf opened last is no relative of doc.
    const std::tuple<pid_t, const char*, long> cases[] = {{gallery.pid(), "photo-copy.jpg", 5000},
                                                          {gallery.pid(), "edited.png", 5000},
                                                          {office.pid(), "draft.docx", 1000},
                                                          {office.pid(), "memo.doc", 2000},
                                                          {office.pid(), "budget.xls", 3000}};
    for (const auto& [pid, name, offset] : cases) {
        std::string path = scene.created(pid, name, 110);
        EXPECT_EQ(readExpiryAttribute(path), now + offset) << path;
        EXPECT_EQ(scene.log.count(inheritingMessage(now + offset, path)), 1u) << path;
    }
    EXPECT_TRUE(scene.log.matching("NEWFILE CASE").empty());
    EXPECT_TRUE(scene.log.matching(kFileManagerCase).empty());
    EXPECT_TRUE(hasEntries(gallery.pid()));
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
}

TEST(setExpiryforFile, ProcessOutsideWhitelistTakesContainerDuration) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    storeDuration(120, 3600);
    long now = time(nullptr);
    ChildProcess notes(kOtherApp);
    // Named after the file manager, but not the file manager itself: no zip copy either.
    ChildProcess helper(kFileManager + ":remote");
    scene.opened(notes.pid(), "report.pdf", now + 5000);
    scene.opened(notes.pid(), "archive.zip", now + 6000);
    scene.opened(helper.pid(), "other.zip", now + 7000);

    long first = getCurrentTimeInSec();
    std::string reportCopy = scene.created(notes.pid(), "report-copy.pdf", 120);
    std::string archiveCopy = scene.created(notes.pid(), "archive-copy.zip", 120);
    std::string helperCopy = scene.created(helper.pid(), "helper-copy.zip", 120);
    // No duration stored for container 121: one second.
    std::string withoutDuration = scene.created(notes.pid(), "report-other.pdf", 121);
    long last = getCurrentTimeInSec();

    expectNewFileExpiry(scene, notes.pid(), reportCopy, first, last, 3600);
    expectNewFileExpiry(scene, notes.pid(), archiveCopy, first, last, 3600);
    expectNewFileExpiry(scene, helper.pid(), helperCopy, first, last, 3600);
    expectNewFileExpiry(scene, notes.pid(), withoutDuration, first, last, 1);
    EXPECT_EQ(scene.log.count(rejectedMessage(notes.pid())), 3u);
    EXPECT_EQ(scene.log.count(rejectedMessage(helper.pid())), 1u);
    EXPECT_EQ(scene.log.count(kSetOkMessage), 4u);
    EXPECT_TRUE(scene.log.matching("INHERITING").empty());
    EXPECT_TRUE(scene.log.matching("Zip copy").empty());
    EXPECT_EQ(mProcessMap.mRejectList[notes.pid()], kOtherApp);
}

TEST(setExpiryforFile, WhitelistedProcessWithoutRelatedEntryTakesContainerDuration) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    storeDuration(122, 600);
    long now = time(nullptr);
    ChildProcess office(kOffice);
    ChildProcess gallery(kGallery);
    scene.opened(office.pid(), "scan.pdf", now + 5000);
    scene.opened(gallery.pid(), "photo.jpg", now + 5000);
    ASSERT_EQ(runCommand({"1", std::to_string(gallery.pid())}), 0);

    long first = getCurrentTimeInSec();
    std::string slides = scene.created(office.pid(), "slides.pptx", 122);
    std::string readme = scene.created(office.pid(), "README", 122);
    std::string data = scene.created(office.pid(), "data.xyz", 122);
    std::string picture = scene.created(gallery.pid(), "picture.jpg", 122);
    long last = getCurrentTimeInSec();

    for (const std::string& path : {slides, readme, data}) {
        expectNewFileExpiry(scene, office.pid(), path, first, last, 600);
    }
    expectNewFileExpiry(scene, gallery.pid(), picture, first, last, 600);
    EXPECT_TRUE(scene.log.matching("INHERITING").empty());
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
}

TEST(setExpiryforFile, WritesInheritedExpiryThatHasPassed) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess gallery(kGallery);
    ChildProcess office(kOffice);
    putOpenedEntry(gallery.pid(), "jpg", now - 50, now);
    putOpenedEntry(office.pid(), "docx", now - 60, now);

    EXPECT_EQ(readExpiryAttribute(scene.created(gallery.pid(), "late.jpg", 124)), now - 50);
    EXPECT_EQ(readExpiryAttribute(scene.created(office.pid(), "late.docx", 124)), now - 60);
    // The gallery's expired record goes; the office suite is never checked for expiry.
    EXPECT_FALSE(hasEntries(gallery.pid()));
    EXPECT_TRUE(hasEntries(office.pid()));
    EXPECT_TRUE(scene.log.matching("NEWFILE CASE").empty());
}

TEST(setExpiryforFile, ReturnsErrnoOfFailedWriteExceptForZipCopy) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    ChildProcess gallery(kGallery);
    ChildProcess notes(kOtherApp);
    ChildProcess fileManager(kFileManager);
    scene.opened(gallery.pid(), "photo.jpg", time(nullptr) + 5000);

    std::string inherited = scene.directory.unwritableFile("inherited.jpg");
    std::string brandNew = scene.directory.unwritableFile("new.pdf");
    std::string zipCopy = scene.directory.unwritableFile("copy.zip");
    EXPECT_EQ(setExpiryforFile(gallery.pid(), inherited.data(), 125), EOPNOTSUPP);
    EXPECT_EQ(setExpiryforFile(notes.pid(), brandNew.data(), 125), EOPNOTSUPP);
    EXPECT_EQ(setExpiryforFile(fileManager.pid(), zipCopy.data(), 125), 0);

    for (const std::string& path : {inherited, brandNew}) {
        EXPECT_EQ(scene.log.count(systemError(
                          kPrefix + "Error: setxattr(" + path + ", setxattr error - -1, " +
                          std::to_string(EOPNOTSUPP) + ", " + strerror(EOPNOTSUPP) + "\n")),
                  1u);
    }
    EXPECT_TRUE(scene.log.matching(kPrefix + "Error: setxattr(" + zipCopy).empty());
    EXPECT_EQ(scene.log.count(attributeWriteFailedMessage(zipCopy, -1, EOPNOTSUPP)), 1u);
    EXPECT_TRUE(scene.log.matching("setxattr OK").empty());
}

TEST(setExpiryforFile, FileManagerZipCopyInheritsLastOpenedZipElseEndsAtEndOfDay) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess zipOpener(kFileManager);
    ChildProcess pdfOpener(kFileManager);
    ChildProcess idle(kFileManager);
    scene.opened(zipOpener.pid(), "report.pdf", now + 1000);
    scene.opened(zipOpener.pid(), "archive.zip", now + 5000);
    scene.opened(pdfOpener.pid(), "bundle.zip", now + 6000);
    scene.opened(pdfOpener.pid(), "letter.pdf", now + 7000);

    long first = getCurrentTimeInSec();
    long endOfDayBefore = getEndOfDay();
    std::string copy = scene.created(zipOpener.pid(), "copy.zip", 127);
    std::string upperCase = scene.created(zipOpener.pid(), "Report.ZIP", 127);
    std::string afterPdf = scene.created(pdfOpener.pid(), "after-pdf.zip", 127);
    std::string idleCopy = scene.created(idle.pid(), "idle.zip", 127);
    long endOfDayAfter = getEndOfDay();
    long last = getCurrentTimeInSec();

    EXPECT_EQ(readExpiryAttribute(copy), now + 5000);
    EXPECT_EQ(readExpiryAttribute(upperCase), now + 5000);
    for (const std::string& path : {afterPdf, idleCopy}) {
        long written = readExpiryAttribute(path).value_or(-1);
        EXPECT_TRUE(written == endOfDayBefore || written == endOfDayAfter) << written;
    }
    EXPECT_EQ(scene.log.count(kZipInheritMessage), 2u);
    EXPECT_EQ(scene.log.count(kZipEndOfDayMessage), 2u);
    EXPECT_EQ(
            countForSecondsBetween(scene.log, first, last,
                                   [](long second) { return timesMessage(kZipCase, second, -1); }),
            4u);
    // The zip copy asks neither the entry store nor the whitelist.
    EXPECT_TRUE(scene.log.matching("<HashMap::get>").empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

// The file manager's own files are covered exactly at fixed time; these are the other ways into
// the file-manager case.
TEST(setExpiryforFile, FileManagerCaseCoversUnpackedFilesAndStaleFileManagerPid) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess unpacker(kFileManager);
    ChildProcess gallery(kGallery);
    // Its last opened file is a zip: whatever it creates next comes out of that archive.
    scene.opened(unpacker.pid(), "bundle.zip", now + 6000);
    scene.opened(gallery.pid(), "photo.jpg", now + 7000);

    long first = getCurrentTimeInSec();
    std::string unpackedLater = scene.created(unpacker.pid(), "later.docx", 129, now + 90000);
    std::string unpackedFresh = scene.created(unpacker.pid(), "fresh.docx", 129);
    // A file-manager pid that command 1 never cleared, now carried by the gallery.
    mProcessMap.mFileManagerPid = gallery.pid();
    std::string laterJpg = scene.created(gallery.pid(), "later.jpg", 129, now + 90000);
    std::string freshJpg = scene.created(gallery.pid(), "fresh.jpg", 129);
    long last = getCurrentTimeInSec();

    EXPECT_EQ(readExpiryAttribute(unpackedLater), now + 90000);
    EXPECT_EQ(readExpiryAttribute(unpackedFresh), now + 6000);
    EXPECT_EQ(readExpiryAttribute(laterJpg), now + 90000);
    EXPECT_EQ(readExpiryAttribute(freshJpg), now + 7000);
    EXPECT_EQ(scene.log.count(kFileManagerAlreadySetMessage), 2u);
    EXPECT_EQ(countForSecondsBetween(scene.log, first, last,
                                     [&](long second) {
                                         return timesMessage(kFileManagerCase, second, now + 90000);
                                     }),
              2u);
    EXPECT_EQ(scene.log.count(inheritingMessage(now + 6000, unpackedFresh)), 1u);
    EXPECT_EQ(scene.log.count(inheritingMessage(now + 7000, freshJpg)), 1u);
}

// Under a frozen clock the windows are exact, and the times lie past 2^32 seconds.
TEST(setExpiryforFile, InheritsOnlyEntriesOpenedWithin599SecondsAtFixedTime) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    SKIP_UNLESS_CLOCK_IS_FROZEN();
    DecisionScene scene;
    storeDuration(131, 3600);
    long now = *frozenNow();
    ChildProcess recent(kGallery);
    ChildProcess stale(kGallery);
    putOpenedEntry(recent.pid(), "jpg", now + 5000, now - 599);
    putOpenedEntry(stale.pid(), "jpg", now + 5000, now - 600);

    std::string recentCopy = scene.created(recent.pid(), "recent.jpg", 131);
    std::string staleCopy = scene.created(stale.pid(), "stale.jpg", 131);
    EXPECT_EQ(readExpiryAttribute(recentCopy), now + 5000);
    EXPECT_EQ(readExpiryAttribute(staleCopy), now + 3600);
    EXPECT_EQ(scene.log.count(inheritingMessage(now + 5000, recentCopy)), 1u);
    EXPECT_EQ(scene.log.count(newFileMessage(stale.pid(), staleCopy, now + 3600)), 1u);
    EXPECT_EQ(scene.log.count(kSetOkMessage), 1u);
}

TEST(setExpiryforFile, FileManagerRewritesOnlyExpiriesOfNext20SecondsAtFixedTime) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    SKIP_UNLESS_CLOCK_IS_FROZEN();
    DecisionScene scene;
    long now = *frozenNow();
    ChildProcess zipper(kFileManager);
    ChildProcess copier(kFileManager);
    scene.opened(zipper.pid(), "archive.zip", now + 5000);
    scene.opened(copier.pid(), "report.pdf", now + 6000);

    struct Case {
        pid_t pid;
        std::string caseName;
        const char* name;
        std::optional<long> existing;
        long expected;
    };
    const pid_t zip = zipper.pid(), pdf = copier.pid();
    const Case cases[] = {{zip, kZipCase, "in20.zip", now + 20, now + 5000},
                          {zip, kZipCase, "in21.zip", now + 21, now + 21},
                          {zip, kZipCase, "before.zip", now - 1, now - 1},
                          {zip, kZipCase, "none.zip", std::nullopt, now + 5000},
                          {pdf, kFileManagerCase, "in20.pdf", now + 20, now + 6000},
                          {pdf, kFileManagerCase, "in21.pdf", now + 21, now + 21},
                          {pdf, kFileManagerCase, "before.pdf", now - 1, now - 1},
                          {pdf, kFileManagerCase, "none.pdf", std::nullopt, now + 6000}};
    for (const Case& test : cases) {
        std::string path = scene.created(test.pid, test.name, 132, test.existing);
        EXPECT_EQ(readExpiryAttribute(path), test.expected) << path;
        LogRecord times = timesMessage(test.caseName, now, test.existing.value_or(-1));
        EXPECT_EQ(scene.log.count(times), 1u) << path;
    }
    EXPECT_EQ(scene.log.count(kZipAlreadySetMessage), 2u);
    EXPECT_EQ(scene.log.count(kFileManagerAlreadySetMessage), 2u);
    EXPECT_EQ(scene.log.count(kZipInheritMessage), 2u);
}

TEST(isNewFileCase, AcceptsWhitelistedEntriesOpenedUpTo599SecondsBefore) {
    DecisionScene scene;
    long now = time(nullptr);
    const long openTime = now - 10000;
    for (const std::string& name : {kGallery, kOffice, kFileManager}) {
        ChildProcess app(name);
        MapEntry entry{app.pid(), "pdf", now + 5000, openTime};
        EXPECT_FALSE(isNewFileCase(entry, nullptr, openTime + 599, app.pid())) << name;
        EXPECT_TRUE(isNewFileCase(entry, nullptr, openTime + 600, app.pid())) << name;
        EXPECT_FALSE(isNewFileCase(entry, nullptr, openTime, app.pid())) << name;
    }
    EXPECT_TRUE(scene.log.matching("<isNewFileCase>").empty());
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
}

TEST(getEndOfDay, LeavesSharedLocalTimeBufferAlone) {
    time_t epoch = 0;
    tm* shared = localtime(&epoch);
    tm saved = *shared;
    getEndOfDay();
    EXPECT_EQ(shared->tm_year, saved.tm_year);
    EXPECT_EQ(shared->tm_yday, saved.tm_yday);
    EXPECT_EQ(shared->tm_hour, saved.tm_hour);
    EXPECT_EQ(shared->tm_sec, saved.tm_sec);
}

// Each fixed-time run names the day's last second in DLP_EXPECTED_END_OF_DAY.
TEST(getEndOfDay, IsLastSecondOfCallingDayAtFixedTime) {
    const char* expected = std::getenv("DLP_EXPECTED_END_OF_DAY");
    if (expected == nullptr) GTEST_SKIP() << "needs the frozen clock of its own run";
    EXPECT_EQ(getEndOfDay(), std::strtol(expected, nullptr, 10));
}

}  // namespace
}  // namespace dlp::test
