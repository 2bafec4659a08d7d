#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <string>

#include "decisions/decision_test_support.h"
#include "support/child_process.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {
namespace {

const std::string kFileManager = "com.vux.android.app.filbrook";
const std::string kGallery = "com.vux.android.gallery3d";
const std::string kOffice = "com.hancom.office.viewer";
const std::string kOtherApp = "com.example.notes";

// A freshly loaded process map, a directory for the files and the log.
struct DecisionScene {
    DecisionScene() { resetProcessMap(); }
    ~DecisionScene() { resetProcessMap(); }

    ScratchDirectory directory;
    LogCapture log;
};

void storeDuration(int containerId, int seconds) {
    ASSERT_EQ(runCommand({"3", std::to_string(containerId), std::to_string(seconds)}), 0);
}

void reportOpening(pid_t pid, const std::string& path) {
    ASSERT_EQ(runCommand({"4", "0", std::to_string(pid), path}), 0);
}

void forgetProcess(pid_t pid) {
    ASSERT_EQ(runCommand({"1", std::to_string(pid)}), 0);
}

int fileCreated(pid_t pid, std::string path, int containerId) {
    return setExpiryforFile(pid, path.data(), containerId);
}

// Opening times that the clock cannot produce on demand go straight into the map.
void putOpenedEntry(pid_t pid, const std::string& extension, long expiry, long openTime) {
    HashMap::mInternalProcessMap[pid].push_back(MapEntry{pid, extension, expiry, openTime});
}

bool hasEntries(pid_t pid) {
    return HashMap::mInternalProcessMap.count(pid) != 0;
}

const std::string kPrefix = "DLP_LIBDLP : <setExpiryforFile> ";

std::string inheritingMessage(long expiry, const std::string& path) {
    return kPrefix + "INHERITING CASE. expiry time[" + low32(expiry) + "] for the file[" + path +
           "]";
}

std::string newFileMessage(pid_t pid, const std::string& path, long expiry) {
    return kPrefix + "NEWFILE CASE. pid[" + std::to_string(pid) + "], file_path[" + path +
           "]. Set IT admin's expiry[" + std::to_string(expiry) + "]";
}

std::string zipTimesMessage(long now, long current) {
    return kPrefix + "support 2.7 Zip copy -- current time[" + low32(now) + "], expiry_time[" +
           low32(current) + "], time diff[" + low32(current - now) + "]";
}

std::string fileManagerTimesMessage(long now, long current) {
    return kPrefix + "Filbrook support case -- current time[" + low32(now) + "], expiry_time[" +
           low32(current) + "], time diff[" + low32(current - now) + "]";
}

std::string writeFailedMessage(const std::string& path, int error) {
    return kPrefix + "Error: setxattr(" + path + ", setxattr error - -1, " + std::to_string(error) +
           ", " + strerror(error) + "\n";
}

std::string rejectedMessage(pid_t pid) {
    return "DLP_LIBDLP : <isNewFileCase> pid[" + std::to_string(pid) +
           "] passed is in reject list do new file case";
}

const std::string kSetOkMessage = kPrefix + "setxattr OK\n";
const std::string kZipInheritMessage =
        kPrefix + "support for 2.7 zip -- last opened entry is zip inheriting";
const std::string kZipEndOfDayMessage = kPrefix + "zip file created from Filbrook. Set End of day";
const std::string kZipAlreadySetMessage =
        kPrefix +
        "support for 2.7 zip -- DLP expiry time is already set by Filbrook ignoring the case";
const std::string kFileManagerAlreadySetMessage =
        kPrefix +
        "Filbrook support case -- DLP expiry time is already set by Filbrook ignoring the case";

// The new-file case under a running clock: t1 + duration, where t1 lies between two readings
// taken around the call.
void expectNewFileExpiry(const DecisionScene& scene, pid_t pid, const std::string& path, long first,
                         long last, long duration) {
    std::optional<int64_t> written = readExpiryAttribute(path);
    ASSERT_TRUE(written.has_value()) << path;
    EXPECT_GE(*written, first + duration) << path;
    EXPECT_LE(*written, last + duration) << path;
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, newFileMessage(pid, path, *written)), 1u);
}

TEST(setExpiryforFile, RefusesNullPath) {
    DecisionScene scene;
    EXPECT_EQ(setExpiryforFile(100, nullptr, 100), -1);
    EXPECT_TRUE(
            scene.log.contains(kSystemBuffer, kError, kPrefix + "file path is null. return -1"));
    EXPECT_TRUE(scene.log.matching("CASE").empty());
}

TEST(setExpiryforFile, WhitelistedProcessesInheritFromSameOrMostRecentRelatedExtension) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    storeDuration(110, 7200);
    long now = time(nullptr);
    ChildProcess gallery(kGallery);
    ChildProcess office(kOffice);
    reportOpening(gallery.pid(), scene.directory.stampedFile("photo.jpg", now + 5000));
    reportOpening(office.pid(), scene.directory.stampedFile("letter.docx", now + 1000));
    reportOpening(office.pid(), scene.directory.stampedFile("notes.txt", now + 2000));
    reportOpening(office.pid(), scene.directory.stampedFile("budget.xlsx", now + 3000));
    reportOpening(office.pid(), scene.directory.stampedFile("scan.pdf", now + 4000));

    struct Case {
        pid_t pid;
        std::string path;
        long expected;
    };
    // txt was opened after docx, and the pdf opened last is no relative of doc.
    const Case cases[] = {{gallery.pid(), scene.directory.file("photo-copy.jpg"), now + 5000},
                          {gallery.pid(), scene.directory.file("edited.png"), now + 5000},
                          {office.pid(), scene.directory.file("draft.docx"), now + 1000},
                          {office.pid(), scene.directory.file("memo.doc"), now + 2000},
                          {office.pid(), scene.directory.file("budget.xls"), now + 3000}};
    for (const Case& test : cases) {
        EXPECT_EQ(fileCreated(test.pid, test.path, 110), 0) << test.path;
        EXPECT_EQ(readExpiryAttribute(test.path), test.expected) << test.path;
        EXPECT_EQ(
                scene.log.count(kSystemBuffer, kDebug, inheritingMessage(test.expected, test.path)),
                1u);
    }
    EXPECT_TRUE(scene.log.matching("NEWFILE CASE").empty());
    EXPECT_TRUE(scene.log.matching("Filbrook support case").empty());
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
    ChildProcess fileManagerHelper(kFileManager + ":remote");
    reportOpening(notes.pid(), scene.directory.stampedFile("report.pdf", now + 5000));
    reportOpening(notes.pid(), scene.directory.stampedFile("archive.zip", now + 6000));
    reportOpening(fileManagerHelper.pid(), scene.directory.stampedFile("other.zip", now + 7000));

    std::string reportCopy = scene.directory.file("report-copy.pdf");
    std::string archiveCopy = scene.directory.file("archive-copy.zip");
    std::string helperCopy = scene.directory.file("helper-copy.zip");
    std::string withoutDuration = scene.directory.file("report-other.pdf");
    long first = getCurrentTimeInSec();
    EXPECT_EQ(fileCreated(notes.pid(), reportCopy, 120), 0);
    EXPECT_EQ(fileCreated(notes.pid(), archiveCopy, 120), 0);
    EXPECT_EQ(fileCreated(fileManagerHelper.pid(), helperCopy, 120), 0);
    // No duration stored for container 121: one second.
    EXPECT_EQ(fileCreated(notes.pid(), withoutDuration, 121), 0);
    long last = getCurrentTimeInSec();

    expectNewFileExpiry(scene, notes.pid(), reportCopy, first, last, 3600);
    expectNewFileExpiry(scene, notes.pid(), archiveCopy, first, last, 3600);
    expectNewFileExpiry(scene, fileManagerHelper.pid(), helperCopy, first, last, 3600);
    expectNewFileExpiry(scene, notes.pid(), withoutDuration, first, last, 1);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, rejectedMessage(notes.pid())), 3u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, rejectedMessage(fileManagerHelper.pid())), 1u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kSetOkMessage), 4u);
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
    reportOpening(office.pid(), scene.directory.stampedFile("scan.pdf", now + 5000));
    reportOpening(gallery.pid(), scene.directory.stampedFile("photo.jpg", now + 5000));
    forgetProcess(gallery.pid());

    std::string slides = scene.directory.file("slides.pptx");
    std::string readme = scene.directory.file("README");
    std::string data = scene.directory.file("data.xyz");
    std::string picture = scene.directory.file("picture.jpg");
    long first = getCurrentTimeInSec();
    EXPECT_EQ(fileCreated(office.pid(), slides, 122), 0);
    EXPECT_EQ(fileCreated(office.pid(), readme, 122), 0);
    EXPECT_EQ(fileCreated(office.pid(), data, 122), 0);
    EXPECT_EQ(fileCreated(gallery.pid(), picture, 122), 0);
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

    std::string picture = scene.directory.file("late.jpg");
    std::string letter = scene.directory.file("late.docx");
    EXPECT_EQ(fileCreated(gallery.pid(), picture, 124), 0);
    EXPECT_EQ(fileCreated(office.pid(), letter, 124), 0);

    EXPECT_EQ(readExpiryAttribute(picture), now - 50);
    EXPECT_EQ(readExpiryAttribute(letter), now - 60);
    // The gallery's expired record goes; the office suite is never checked for expiry.
    EXPECT_FALSE(hasEntries(gallery.pid()));
    EXPECT_TRUE(hasEntries(office.pid()));
    EXPECT_TRUE(scene.log.matching("NEWFILE CASE").empty());
}

TEST(setExpiryforFile, ReturnsErrnoOfFailedWriteExceptForZipCopy) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess gallery(kGallery);
    ChildProcess notes(kOtherApp);
    ChildProcess fileManager(kFileManager);
    reportOpening(gallery.pid(), scene.directory.stampedFile("photo.jpg", now + 5000));

    std::string inherited = scene.directory.unwritableFile("inherited.jpg");
    std::string brandNew = scene.directory.unwritableFile("new.pdf");
    std::string zipCopy = scene.directory.unwritableFile("copy.zip");
    EXPECT_EQ(fileCreated(gallery.pid(), inherited, 125), EOPNOTSUPP);
    EXPECT_EQ(fileCreated(notes.pid(), brandNew, 125), EOPNOTSUPP);
    EXPECT_EQ(fileCreated(fileManager.pid(), zipCopy, 125), 0);

    EXPECT_EQ(scene.log.count(kSystemBuffer, kError, writeFailedMessage(inherited, EOPNOTSUPP)),
              1u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kError, writeFailedMessage(brandNew, EOPNOTSUPP)), 1u);
    EXPECT_TRUE(scene.log.matching(kPrefix + "Error: setxattr(" + zipCopy).empty());
    EXPECT_EQ(scene.log.count(kMainBuffer, kError,
                              "DLP_LIBDLP :  Error: setxattr(" + zipCopy +
                                      ", setxattr error - -1, " + std::to_string(EOPNOTSUPP) +
                                      ", " + strerror(EOPNOTSUPP) + "\n"),
              1u);
    EXPECT_TRUE(scene.log.matching("setxattr OK").empty());
}

TEST(setExpiryforFile, FileManagerZipCopyInheritsLastOpenedZipElseEndsAtEndOfDay) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess zipOpener(kFileManager);
    ChildProcess pdfOpener(kFileManager);
    ChildProcess idle(kFileManager);
    reportOpening(zipOpener.pid(), scene.directory.stampedFile("report.pdf", now + 1000));
    reportOpening(zipOpener.pid(), scene.directory.stampedFile("archive.zip", now + 5000));
    reportOpening(pdfOpener.pid(), scene.directory.stampedFile("bundle.zip", now + 6000));
    reportOpening(pdfOpener.pid(), scene.directory.stampedFile("letter.pdf", now + 7000));

    std::string copy = scene.directory.file("copy.zip");
    std::string upperCase = scene.directory.file("Report.ZIP");
    std::string afterPdf = scene.directory.file("after-pdf.zip");
    std::string idleCopy = scene.directory.file("idle.zip");
    long first = getCurrentTimeInSec();
    long endOfDayBefore = getEndOfDay();
    EXPECT_EQ(fileCreated(zipOpener.pid(), copy, 127), 0);
    EXPECT_EQ(fileCreated(zipOpener.pid(), upperCase, 127), 0);
    EXPECT_EQ(fileCreated(pdfOpener.pid(), afterPdf, 127), 0);
    EXPECT_EQ(fileCreated(idle.pid(), idleCopy, 127), 0);
    long endOfDayAfter = getEndOfDay();
    long last = getCurrentTimeInSec();

    EXPECT_EQ(readExpiryAttribute(copy), now + 5000);
    EXPECT_EQ(readExpiryAttribute(upperCase), now + 5000);
    for (const std::string& path : {afterPdf, idleCopy}) {
        std::optional<int64_t> written = readExpiryAttribute(path);
        ASSERT_TRUE(written.has_value()) << path;
        EXPECT_TRUE(*written == endOfDayBefore || *written == endOfDayAfter) << *written;
    }
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kZipInheritMessage), 2u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kZipEndOfDayMessage), 2u);
    EXPECT_EQ(countForSecondsBetween(scene.log, kDebug, first, last,
                                     [](long second) { return zipTimesMessage(second, -1); }),
              4u);
    // The zip copy asks neither the entry store nor the whitelist.
    EXPECT_TRUE(scene.log.matching("<HashMap::get>").empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);
}

TEST(setExpiryforFile, FileManagerLeavesExpiryItSetEarlierAlone) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess fileManager(kFileManager);
    ChildProcess unpacker(kFileManager);
    ChildProcess gallery(kGallery);
    reportOpening(fileManager.pid(), scene.directory.stampedFile("archive.zip", now + 1000));
    reportOpening(fileManager.pid(), scene.directory.stampedFile("report.pdf", now + 5000));
    // Its last opened file is a zip: whatever it creates next comes out of that archive.
    reportOpening(unpacker.pid(), scene.directory.stampedFile("bundle.zip", now + 6000));
    reportOpening(gallery.pid(), scene.directory.stampedFile("photo.jpg", now + 7000));

    std::string laterZip = scene.directory.stampedFile("later.zip", now + 90000);
    std::string earlierZip = scene.directory.stampedFile("earlier.zip", now - 3600);
    std::string laterPdf = scene.directory.stampedFile("later.pdf", now + 90000);
    std::string freshPdf = scene.directory.file("fresh.pdf");
    std::string unpackedLater = scene.directory.stampedFile("unpacked-later.docx", now + 90000);
    std::string unpackedFresh = scene.directory.file("unpacked.docx");
    std::string laterJpg = scene.directory.stampedFile("later.jpg", now + 90000);
    std::string freshJpg = scene.directory.file("fresh.jpg");
    long first = getCurrentTimeInSec();
    for (const std::string* path : {&laterZip, &earlierZip, &laterPdf, &freshPdf}) {
        EXPECT_EQ(fileCreated(fileManager.pid(), *path, 129), 0) << *path;
    }
    EXPECT_EQ(mProcessMap.mFileManagerPid, fileManager.pid());
    EXPECT_EQ(fileCreated(unpacker.pid(), unpackedLater, 129), 0);
    EXPECT_EQ(fileCreated(unpacker.pid(), unpackedFresh, 129), 0);
    // A file-manager pid that command 1 never cleared, now carried by the gallery.
    mProcessMap.mFileManagerPid = gallery.pid();
    EXPECT_EQ(fileCreated(gallery.pid(), laterJpg, 129), 0);
    EXPECT_EQ(fileCreated(gallery.pid(), freshJpg, 129), 0);
    long last = getCurrentTimeInSec();

    EXPECT_EQ(readExpiryAttribute(laterZip), now + 90000);
    EXPECT_EQ(readExpiryAttribute(earlierZip), now - 3600);
    EXPECT_EQ(readExpiryAttribute(laterPdf), now + 90000);
    EXPECT_EQ(readExpiryAttribute(freshPdf), now + 5000);
    EXPECT_EQ(readExpiryAttribute(unpackedLater), now + 90000);
    EXPECT_EQ(readExpiryAttribute(unpackedFresh), now + 6000);
    EXPECT_EQ(readExpiryAttribute(laterJpg), now + 90000);
    EXPECT_EQ(readExpiryAttribute(freshJpg), now + 7000);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kZipAlreadySetMessage), 2u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kFileManagerAlreadySetMessage), 3u);
    EXPECT_EQ(countForSecondsBetween(
                      scene.log, kDebug, first, last,
                      [&](long second) { return zipTimesMessage(second, now - 3600); }),
              1u);
    EXPECT_EQ(countForSecondsBetween(
                      scene.log, kDebug, first, last,
                      [&](long second) { return fileManagerTimesMessage(second, now + 90000); }),
              3u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, inheritingMessage(now + 5000, freshPdf)), 1u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, inheritingMessage(now + 6000, unpackedFresh)),
              1u);
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

    std::string recentCopy = scene.directory.file("recent.jpg");
    std::string staleCopy = scene.directory.file("stale.jpg");
    EXPECT_EQ(fileCreated(recent.pid(), recentCopy, 131), 0);
    EXPECT_EQ(fileCreated(stale.pid(), staleCopy, 131), 0);

    EXPECT_EQ(readExpiryAttribute(recentCopy), now + 5000);
    EXPECT_EQ(readExpiryAttribute(staleCopy), now + 3600);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, inheritingMessage(now + 5000, recentCopy)),
              1u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug,
                              newFileMessage(stale.pid(), staleCopy, now + 3600)),
              1u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kSetOkMessage), 1u);
}

TEST(setExpiryforFile, FileManagerRewritesOnlyExpiriesOfNext20SecondsAtFixedTime) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    SKIP_UNLESS_CLOCK_IS_FROZEN();
    DecisionScene scene;
    long now = *frozenNow();
    ChildProcess zipper(kFileManager);
    ChildProcess copier(kFileManager);
    reportOpening(zipper.pid(), scene.directory.stampedFile("archive.zip", now + 5000));
    reportOpening(copier.pid(), scene.directory.stampedFile("report.pdf", now + 6000));

    struct Case {
        const char* name;
        std::optional<long> existing;
        long expected;
    };
    const Case zipCases[] = {{"in20.zip", now + 20, now + 5000},
                             {"in21.zip", now + 21, now + 21},
                             {"before.zip", now - 1, now - 1},
                             {"none.zip", std::nullopt, now + 5000}};
    const Case pdfCases[] = {{"in20.pdf", now + 20, now + 6000},
                             {"in21.pdf", now + 21, now + 21},
                             {"before.pdf", now - 1, now - 1},
                             {"none.pdf", std::nullopt, now + 6000}};
    for (auto [cases, pid] :
         {std::pair{zipCases, zipper.pid()}, std::pair{pdfCases, copier.pid()}}) {
        for (int i = 0; i < 4; ++i) {
            const Case& test = cases[i];
            std::string path = test.existing
                                       ? scene.directory.stampedFile(test.name, *test.existing)
                                       : scene.directory.file(test.name);
            EXPECT_EQ(fileCreated(pid, path, 132), 0) << test.name;
            EXPECT_EQ(readExpiryAttribute(path), test.expected) << test.name;
            long current = test.existing.value_or(-1);
            std::string timesMessage = pid == zipper.pid() ? zipTimesMessage(now, current)
                                                           : fileManagerTimesMessage(now, current);
            EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, timesMessage), 1u) << test.name;
        }
    }
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kZipAlreadySetMessage), 2u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kFileManagerAlreadySetMessage), 2u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, kZipInheritMessage), 2u);
}

TEST(isNewFileCase, RejectsProcessesOutsideWhitelist) {
    DecisionScene scene;
    long now = time(nullptr);
    ChildProcess notes(kOtherApp);
    ChildProcess fileManagerHelper(kFileManager + ":remote");
    pid_t ended = unusedPid();

    for (pid_t pid : {notes.pid(), notes.pid(), fileManagerHelper.pid(), ended}) {
        EXPECT_TRUE(isNewFileCase(MapEntry{pid, "pdf", now + 5000, now}, nullptr, now, pid));
    }

    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, rejectedMessage(notes.pid())), 2u);
    EXPECT_EQ(scene.log.count(kSystemBuffer, kDebug, rejectedMessage(ended)), 1u);
    EXPECT_EQ(mProcessMap.mRejectList[notes.pid()], kOtherApp);
    EXPECT_EQ(mProcessMap.mRejectList[ended], "???");
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

TEST(getEndOfDay, ReturnsLastSecondOfCurrentLocalDay) {
    time_t before = time(nullptr);
    long endOfDay = getEndOfDay();
    time_t after = time(nullptr);

    tm end{};
    time_t endTime = endOfDay;
    localtime_r(&endTime, &end);
    EXPECT_EQ(end.tm_hour, 23);
    EXPECT_EQ(end.tm_min, 59);
    EXPECT_EQ(end.tm_sec, 59);
    auto sameDay = [&](time_t moment) {
        tm local{};
        localtime_r(&moment, &local);
        return local.tm_year == end.tm_year && local.tm_yday == end.tm_yday;
    };
    EXPECT_TRUE(sameDay(before) || sameDay(after));
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
