#include <gtest/gtest.h>
#include <unistd.h>

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
using dlp::test::kError;
using dlp::test::kSystemBuffer;
using Tokens = std::vector<std::string>;

constexpr long kExpiry = 2000000000;
constexpr long kOpenTime = 1700000000;
constexpr long kHighBit = 1L << 32;

struct Message {
    int priority;
    std::string text;
};

Message debug(const std::string& text) {
    return {kDebug, "DLP_LIBDLP : " + text};
}
Message error(const std::string& text) {
    return {kError, "DLP_LIBDLP : " + text};
}

Message putLine(int key, int pid, int expiry, const std::string& extension, int openTime) {
    return debug("<HashMap::put> key[" + std::to_string(key) + "], value.pid[" +
                 std::to_string(pid) + "], value.expiry[" + std::to_string(expiry) +
                 "], value.extension[" + extension + "], value.value_opentime[" +
                 std::to_string(openTime) + "]");
}
Message getLine(int key, const std::string& extension) {
    return debug("<HashMap::get> key[" + std::to_string(key) + "], value.value_extension[" +
                 extension + "]");
}
Message foundLine(int expiry) {
    return debug("<HashMap::get> record with extension found. with expiry [" +
                 std::to_string(expiry) + "]");
}
Message nameLine(int pid, const std::string& name) {
    return debug("<getProcessNameByPid> pid[" + std::to_string(pid) + "], processName[" + name +
                 "]");
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

class EntryStoreTest : public ::testing::Test {
  protected:
    void SetUp() override {
        dlp::test::resetProcessMap();
        log_.clear();
    }
    void TearDown() override { dlp::test::resetProcessMap(); }

    // Every message of the store goes to the system buffer.
    void expectMessages(const std::vector<Message>& expected) {
        std::vector<dlp::test::LogRecord> records = log_.records();
        ASSERT_EQ(records.size(), expected.size());
        for (size_t i = 0; i < expected.size(); ++i) {
            EXPECT_EQ(records[i].buffer, kSystemBuffer) << i;
            EXPECT_EQ(records[i].priority, expected[i].priority) << i;
            EXPECT_EQ(records[i].text, expected[i].text) << i;
        }
        log_.clear();
    }

    static bool iteratorAtEnd() {
        return HashMap::mMapIterator == HashMap::mInternalProcessMap.end();
    }
    static int iteratorPid() { return iteratorAtEnd() ? -1 : HashMap::mMapIterator->first; }

    dlp::test::LogCapture log_;
};

TEST_F(EntryStoreTest, PutKeepsOneEntryPerExtensionMostRecentLast) {
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "pdf")));
    expectMessages({putLine(100, 100, kExpiry, "pdf", kOpenTime)});
    EXPECT_TRUE(iteratorAtEnd());
    EXPECT_TRUE(mProcessMap.put(100, entry(100, "docx")));
    EXPECT_EQ(iteratorPid(), 100);
    EXPECT_TRUE(mProcessMap.put(50, entry(50, "txt")));
    EXPECT_TRUE(iteratorAtEnd());
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
    expectMessages({putLine(200, 200, -1, "pdf", kOpenTime),
                    error("<HashMap::put> expiry is less than 0[-1]. ignoring add to map")});
    // Compared in 64 bits although its low half is 0; the expiry is checked first.
    EXPECT_FALSE(mProcessMap.put(100, entry(100, "PDF", -kHighBit)));
    expectMessages({putLine(100, 100, 0, "PDF", kOpenTime),
                    error("<HashMap::put> expiry is less than 0[0]. ignoring add to map")});
    EXPECT_FALSE(mProcessMap.put(100, entry(100, "tmp")));
    expectMessages({putLine(100, 100, kExpiry, "tmp", kOpenTime),
                    error("<HashMap::put> extension passed is not valid. ignoring add to map")});

    EXPECT_EQ(HashMap::mInternalProcessMap.size(), 1u);
    EXPECT_EQ(extensionsOf(100), (Tokens{"pdf", "docx"}));
    EXPECT_EQ(iteratorPid(), 100);
}

TEST_F(EntryStoreTest, GetPrefersTheExactExtensionThenTheGroup) {
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "docx", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "pdf", kExpiry + 2)));
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "txt", kExpiry + 3)));
    const int ordinary = dlp::test::unusedPid();
    ASSERT_TRUE(mProcessMap.put(ordinary, entry(ordinary, "zip")));
    log_.clear();

    EXPECT_EQ(show(mProcessMap.get(100, "pdf")), show(entry(100, "pdf", kExpiry + 2)));
    expectMessages({getLine(100, "pdf"), foundLine(kExpiry + 2)});
    EXPECT_EQ(iteratorPid(), 100);

    EXPECT_EQ(show(mProcessMap.get(100, "doc")), show(entry(100, "txt", kExpiry + 3)));
    expectMessages({getLine(100, "doc"),
                    debug("<HashMap::get> extension not matching with [doc]. returning last "
                          "matching entry [txt][" +
                          std::to_string(kExpiry + 3) + "]")});

    const std::string empty = show(emptyMapEntry());
    EXPECT_EQ(show(mProcessMap.get(100, "jpg")), empty);
    expectMessages({getLine(100, "jpg"),
                    debug("<HashMap::get> record with key[100] found but ext[jpg] not found")});
    EXPECT_EQ(show(mProcessMap.get(100, "zip")), empty);
    expectMessages({getLine(100, "zip"),
                    error("<HashMap::getValidMapEntryIndexForExt> record with key[zip] not found."),
                    debug("<HashMap::get> record with key[100] found but ext[zip] not found")});

    // A process whose last entry is a zip is named, but only the file manager gets "unzip".
    EXPECT_EQ(show(mProcessMap.get(ordinary, "zip")), show(entry(ordinary, "zip")));
    expectMessages({getLine(ordinary, "zip"), nameLine(ordinary, "???"), foundLine(kExpiry)});
    EXPECT_EQ(iteratorPid(), ordinary);

    EXPECT_EQ(show(mProcessMap.get(999, "pdf")), empty);
    expectMessages({getLine(999, "pdf"), debug("<HashMap::get> record with key[999] not found.")});
    EXPECT_TRUE(iteratorAtEnd());

    // An unprotected extension does not even look the pid up.
    mProcessMap.get(100, "pdf");
    log_.clear();
    EXPECT_EQ(show(mProcessMap.get(999, "PDF")), empty);
    expectMessages({getLine(999, "PDF")});
    EXPECT_EQ(iteratorPid(), 100);
}

TEST_F(EntryStoreTest, FileManagerGetsItsMostRecentZipAsUnzip) {
    ChildProcess fileManager("com.vux.android.app.filbrook");
    ChildProcess remote("com.vux.android.app.filbrook:remote");
    const int fm = fileManager.pid();
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "pdf", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "zip", kHighBit + 5, kOpenTime + 5)));
    ASSERT_TRUE(mProcessMap.put(remote.pid(), entry(remote.pid(), "pdf", kExpiry + 1)));
    ASSERT_TRUE(mProcessMap.put(remote.pid(), entry(remote.pid(), "zip")));
    log_.clear();

    for (const char* asked : {"pdf", "docx"}) {
        EXPECT_EQ(show(mProcessMap.get(fm, asked)),
                  show(entry(fm, "unzip", kHighBit + 5, kOpenTime + 5)));
        expectMessages({getLine(fm, asked), nameLine(fm, "com.vux.android.app.filbrook"),
                        debug("<HashMap::get> zip file is opened in Filbrook most recently with "
                              "expiry [5]. Return this.")});
        EXPECT_EQ(iteratorPid(), fm);
    }
    EXPECT_EQ(extensionsOf(fm), (Tokens{"pdf", "zip"}));

    // Only the exact package name counts.
    EXPECT_EQ(show(mProcessMap.get(remote.pid(), "pdf")),
              show(entry(remote.pid(), "pdf", kExpiry + 1)));
    expectMessages({getLine(remote.pid(), "pdf"),
                    nameLine(remote.pid(), "com.vux.android.app.filbrook:remote"),
                    foundLine(kExpiry + 1)});

    // With a pdf opened after the zip, the process is not named at all.
    ASSERT_TRUE(mProcessMap.put(fm, entry(fm, "pdf", kExpiry + 2)));
    log_.clear();
    EXPECT_EQ(show(mProcessMap.get(fm, "zip")),
              show(entry(fm, "zip", kHighBit + 5, kOpenTime + 5)));
    expectMessages({getLine(fm, "zip"), foundLine(5)});
}

TEST_F(EntryStoreTest, RemoveForgetsEntriesRejectionAndFileManagerPid) {
    ASSERT_TRUE(mProcessMap.put(100, entry(100, "pdf")));
    ASSERT_TRUE(mProcessMap.put(200, entry(200, "pdf")));
    mProcessMap.mRejectList = {{100, "app.one"}, {300, "app.three"}};
    mProcessMap.mFileManagerPid = 100;
    mProcessMap.get(200, "pdf");
    log_.clear();

    EXPECT_TRUE(mProcessMap.remove(100));
    expectMessages({debug("<HashMap::remove> key[100]")});
    EXPECT_EQ(HashMap::mInternalProcessMap.count(100), 0u);
    EXPECT_EQ(extensionsOf(200), (Tokens{"pdf"}));
    EXPECT_TRUE(iteratorAtEnd());
    EXPECT_EQ(mProcessMap.mRejectList, (std::map<int, std::string>{{300, "app.three"}}));
    EXPECT_EQ(mProcessMap.mFileManagerPid, -1);

    // A pid without entries still leaves the reject list and the file-manager record.
    mProcessMap.mFileManagerPid = 300;
    mProcessMap.get(200, "pdf");
    EXPECT_TRUE(mProcessMap.remove(300));
    EXPECT_TRUE(iteratorAtEnd());
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
    expectMessages({putLine(100, 100, 1234, "pdf", -1)});
    EXPECT_EQ(show(mProcessMap.get(100, "pdf")), show(entry(100, "pdf", expiry, openTime)));
    expectMessages({getLine(100, "pdf"), foundLine(1234)});
}

}  // namespace
