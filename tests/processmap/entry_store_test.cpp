#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "processmap/process_map_internal.h"
#include "support/child_process.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {
namespace {

using Tokens = std::vector<std::string>;

constexpr long kExpiry = 2000000000;
constexpr long kOpenTime = 1700000000;
constexpr long kHighBit = 1L << 32;

LogRecord putMessage(int key, int pid, int expiry, const std::string& extension, int openTime) {
    return systemDebug("DLP_LIBDLP : <HashMap::put> key[" + std::to_string(key) + "], value.pid[" +
                       std::to_string(pid) + "], value.expiry[" + std::to_string(expiry) +
                       "], value.extension[" + extension + "], value.value_opentime[" +
                       std::to_string(openTime) + "]");
}
LogRecord getMessage(int key, const std::string& extension) {
    return systemDebug("DLP_LIBDLP : <HashMap::get> key[" + std::to_string(key) +
                       "], value.value_extension[" + extension + "]");
}
LogRecord foundMessage(int expiry) {
    return systemDebug("DLP_LIBDLP : <HashMap::get> record with extension found. with expiry [" +
                       std::to_string(expiry) + "]");
}
LogRecord negativeExpiryMessage(int expiry) {
    return systemError("DLP_LIBDLP : <HashMap::put> expiry is less than 0[" +
                       std::to_string(expiry) + "]. ignoring add to map");
}

MapEntry entry(int pid, const std::string& extension, long expiry = kExpiry,
               long openTime = kOpenTime) {
    return MapEntry{pid, extension, expiry, openTime};
}

std::string show(const MapEntry& entry) {
    return std::to_string(entry.value_pid) + " " + entry.value_extension + " " +
           std::to_string(entry.value_expiry) + " " + std::to_string(entry.value_opentime);
}

Tokens extensionsOf(int pid) {
    Tokens extensions;
    for (const MapEntry& stored : HashMap::mInternalProcessMap.at(pid)) {
        extensions.push_back(stored.value_extension);
    }
    return extensions;
}

int iteratorPid() {
    return HashMap::mMapIterator == HashMap::mInternalProcessMap.end()
                   ? -1
                   : HashMap::mMapIterator->first;
}

class EntryStoreTest : public ::testing::Test {
  protected:
    FreshProcessMap map_;
    LogCapture log_;
};

TEST_F(EntryStoreTest, PutKeepsOneEntryPerExtensionMostRecentLast) {
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "pdf")));
    expectRecords(log_, {putMessage(100, 100, kExpiry, "pdf", kOpenTime)});
    EXPECT_EQ(iteratorPid(), -1);
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "docx")));
    EXPECT_EQ(iteratorPid(), 100);
    EXPECT_TRUE(mProcessMap.put(50, entry(50, "txt")));
    EXPECT_EQ(iteratorPid(), -1);
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "pdf", kExpiry + 7, kOpenTime + 9)));
    EXPECT_EQ(iteratorPid(), 100);

    EXPECT_EQ(extensionsOf(100), (Tokens{"docx", "pdf"}));
    EXPECT_EQ(show(HashMap::mInternalProcessMap.at(100).back()),
              show(entry(100, "pdf", kExpiry + 7, kOpenTime + 9)));

    // The value's pid is taken as given, and an expiry of 0 is stored.
    EXPECT_TRUE(mProcessMap.put(100, entry(7, "txt", 0)));
    EXPECT_EQ(show(HashMap::mInternalProcessMap.at(100).back()), show(entry(7, "txt", 0)));
    EXPECT_EQ(extensionsOf(100), (Tokens{"docx", "pdf", "txt"}));
}

TEST_F(EntryStoreTest, PutRefusesNegativeExpiryAndUnprotectedExtensions) {
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "pdf")));
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "docx")));
    log_.clear();

    EXPECT_FALSE(mProcessMap.put(200, entry(200, "pdf", -1)));
    // Compared in 64 bits although its low half is 0; the expiry is checked first.
    EXPECT_FALSE(mProcessMap.put(100, entry(100, "PDF", -kHighBit)));
    EXPECT_FALSE(mProcessMap.put(100, entry(100, "tmp")));
    expectRecords(log_,
                  {putMessage(200, 200, -1, "pdf", kOpenTime), negativeExpiryMessage(-1),
                   putMessage(100, 100, 0, "PDF", kOpenTime), negativeExpiryMessage(0),
                   putMessage(100, 100, kExpiry, "tmp", kOpenTime), unprotectedExtensionMessage()});

    EXPECT_EQ(HashMap::mInternalProcessMap.size(), 1u);
    EXPECT_EQ(extensionsOf(100), (Tokens{"pdf", "docx"}));
    EXPECT_EQ(iteratorPid(), 100);
}

TEST_F(EntryStoreTest, GetPrefersTheExactExtensionThenTheGroup) {
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "docx", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "pdf", kExpiry + 2)));
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "txt", kExpiry + 3)));
    const int ordinary = unusedPid();
    ASSERT_TRUE(mProcessMap.put(ordinary, entry(ordinary, "zip")));
    log_.clear();

    EXPECT_EQ(show(mProcessMap.get(100, "pdf")), show(entry(100, "pdf", kExpiry + 2)));
    expectRecords(log_, {getMessage(100, "pdf"), foundMessage(kExpiry + 2)});
    EXPECT_EQ(iteratorPid(), 100);

    EXPECT_EQ(show(mProcessMap.get(100, "doc")), show(entry(100, "txt", kExpiry + 3)));
    expectRecords(log_, {getMessage(100, "doc"),
                         systemDebug("DLP_LIBDLP : <HashMap::get> extension not matching with "
                                     "[doc]. returning last matching entry [txt][" +
                                     std::to_string(kExpiry + 3) + "]")});

    const std::string empty = show(emptyMapEntry());
    EXPECT_EQ(show(mProcessMap.get(100, "jpg")), empty);
    const std::string extensionNotFound =
            "DLP_LIBDLP : <HashMap::get> record with key[100] found but ext[";
    expectRecords(log_,
                  {getMessage(100, "jpg"), systemDebug(extensionNotFound + "jpg] not found")});
    EXPECT_EQ(show(mProcessMap.get(100, "zip")), empty);
    expectRecords(log_, {getMessage(100, "zip"), missingGroupMessage("zip"),
                         systemDebug(extensionNotFound + "zip] not found")});

    // A process whose last entry is a zip is named, but only the file manager gets "unzip".
    EXPECT_EQ(show(mProcessMap.get(ordinary, "zip")), show(entry(ordinary, "zip")));
    expectRecords(log_, {getMessage(ordinary, "zip"), processNameMessage(ordinary, "???"),
                         foundMessage(kExpiry)});
    EXPECT_EQ(iteratorPid(), ordinary);

    EXPECT_EQ(show(mProcessMap.get(999, "pdf")), empty);
    expectRecords(log_,
                  {getMessage(999, "pdf"),
                   systemDebug("DLP_LIBDLP : <HashMap::get> record with key[999] not found.")});
    EXPECT_EQ(iteratorPid(), -1);

    // An unprotected extension does not even look the pid up.
    mProcessMap.get(100, "pdf");
    log_.clear();
    EXPECT_EQ(show(mProcessMap.get(999, "PDF")), empty);
    expectRecords(log_, {getMessage(999, "PDF")});
    EXPECT_EQ(iteratorPid(), 100);
}

TEST_F(EntryStoreTest, FileManagerGetsItsMostRecentZipAsUnzip) {
    const std::string fileManagerName = "com.vux.android.app.filbrook";
    ChildProcess fileManager(fileManagerName);
    ChildProcess remote(fileManagerName + ":remote");
    const int fm = fileManager.pid();
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "pdf", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "zip", kHighBit + 5, kOpenTime + 5)));
    ASSERT_TRUE(mProcessMap.put(remote.pid(), entry(remote.pid(), "pdf", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(remote.pid(), entry(remote.pid(), "zip")));
    log_.clear();

    for (const char* asked : {"pdf", "docx"}) {
        EXPECT_EQ(show(mProcessMap.get(fm, asked)),
                  show(entry(fm, "unzip", kHighBit + 5, kOpenTime + 5)));
        expectRecords(log_, {getMessage(fm, asked), processNameMessage(fm, fileManagerName),
                             systemDebug("DLP_LIBDLP : <HashMap::get> zip file is opened in "
                                         "Filbrook most recently with expiry [5]. Return this.")});
        EXPECT_EQ(iteratorPid(), fm);
    }
    EXPECT_EQ(extensionsOf(fm), (Tokens{"pdf", "zip"}));

    // Only the exact package name counts.
    EXPECT_EQ(show(mProcessMap.get(remote.pid(), "pdf")),
              show(entry(remote.pid(), "pdf", kExpiry + 1)));
    expectRecords(log_, {getMessage(remote.pid(), "pdf"),
                         processNameMessage(remote.pid(), fileManagerName + ":remote"),
                         foundMessage(kExpiry + 1)});

    // With a pdf opened after the zip, the process is not named at all.
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "pdf", kExpiry + 2)));
    log_.clear();
    EXPECT_EQ(show(mProcessMap.get(fm, "zip")),
              show(entry(fm, "zip", kHighBit + 5, kOpenTime + 5)));
    expectRecords(log_, {getMessage(fm, "zip"), foundMessage(5)});
}

TEST_F(EntryStoreTest, RemoveForgetsEntriesRejectionAndFileManagerPid) {
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "pdf")));
    ASSERT_TRUE(mProcessMap.put(200, entry(200, "pdf")));
    mProcessMap.mRejectList = {{100, "app.one"}, {300, "app.three"}};
    mProcessMap.mFileManagerPid = 100;
    mProcessMap.get(200, "pdf");
    log_.clear();

    EXPECT_TRUE(mProcessMap.remove(100));
    expectRecords(log_, {removeMessage(100)});
    EXPECT_EQ(HashMap::mInternalProcessMap.count(100), 0u);
    EXPECT_EQ(extensionsOf(200), (Tokens{"pdf"}));
    EXPECT_EQ(iteratorPid(), -1);
    EXPECT_EQ(mProcessMap.mRejectList, (std::map<int, std::string>{{300, "app.three"}}));
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);

    // A pid without entries still leaves the reject list and the file-manager record.
    mProcessMap.mFileManagerPid = 300;
    mProcessMap.get(200, "pdf");
    EXPECT_TRUE(mProcessMap.remove(300));
    EXPECT_EQ(iteratorPid(), -1);
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);

    mProcessMap.mFileManagerPid = 200;
    EXPECT_TRUE(mProcessMap.remove(400));
    EXPECT_EQ(mProcessMap.mFileManagerPid, 200);
    EXPECT_EQ(HashMap::mInternalProcessMap.size(), 1u);
}

TEST_F(EntryStoreTest, TimesAreLoggedAsTheirLow32Bits) {
    const long expiry = kHighBit + 1234;
    const long openTime = 2 * kHighBit - 1;  // low half all ones: -1 as a signed int
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "pdf", expiry, openTime)));
    EXPECT_EQ(show(mProcessMap.get(100, "pdf")), show(entry(100, "pdf", expiry, openTime)));
    expectRecords(log_, {putMessage(100, 100, 1234, "pdf", -1), getMessage(100, "pdf"),
                         foundMessage(1234)});
}

}  // namespace
}  // namespace dlp::test
