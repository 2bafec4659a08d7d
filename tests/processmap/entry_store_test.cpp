#include <gtest/gtest.h>

#include <tuple>

#include "named_process.h"
#include "processmap/process_map_internal.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {

using Fields = std::tuple<int, std::string, int64_t, int64_t>;
using Entries = std::vector<Fields>;

Fields fields(const MapEntry& entry) {
    return {entry.value_pid, entry.value_extension, entry.value_expiry, entry.value_opentime};
}

// Every stored entry, pid by pid.
Entries stored() {
    Entries entries;
    for (auto& [pid, list] : HashMap::mInternalProcessMap)
        for (const MapEntry& entry : list) entries.push_back(fields(entry));
    return entries;
}

TEST(HashMap_put, KeepsTheLastEntryPerExtensionAndRefusesNegativeExpiryOrUnprotectedExtension) {
    FreshProcessMap fresh;
    LibraryLockGuard guard;
    EXPECT_TRUE(mProcessMap.put(1, {1, "pdf", 10, 1}));
    EXPECT_TRUE(HashMap::mMapIterator == HashMap::mInternalProcessMap.end());
    EXPECT_TRUE(mProcessMap.put(1, {1, "docx", 20, 2}));
    EXPECT_TRUE(mProcessMap.put(1, {1, "pdf", 30, 3}));
    EXPECT_TRUE(HashMap::mMapIterator == HashMap::mInternalProcessMap.find(1));
    LogCapture log;
    // -2^32 is negative in 64 bits, and 0 in the low 32 that the log shows.
    for (auto [entry, refusal] :
         {std::pair<MapEntry, const char*>{{2, "pdf", -1, 5}, "expiry is less than 0[-1]"},
          {{2, "pdf", -(int64_t{1} << 32), 5}, "expiry is less than 0[0]"},
          {{2, "tmp", 10, 5}, "extension passed is not valid"}}) {
        EXPECT_FALSE(mProcessMap.put(2, entry));
        EXPECT_EQ(log.take().at(1), systemError(std::string("DLP_LIBDLP : <HashMap::put> ") +
                                                refusal + ". ignoring add to map"));
    }
    EXPECT_TRUE(HashMap::mMapIterator == HashMap::mInternalProcessMap.find(1));
    EXPECT_TRUE(mProcessMap.put(2, {2, "pdf", 0, 5}));
    EXPECT_EQ(stored(), (Entries{{1, "docx", 20, 2}, {1, "pdf", 30, 3}, {2, "pdf", 0, 5}}));
}

TEST(HashMap_get, TakesTheArchiveTheExactOrTheRelatedEntry) {
    FreshProcessMap fresh;
    NamedProcess fileManager("com.vux.android.app.filbrook"),
            zipFirst("com.vux.android.app.filbrook"), remote("com.vux.android.app.filbrook:remote");
    const int manager = fileManager.pid(), first = zipFirst.pid(), suffixed = remote.pid();
    LibraryLockGuard guard;
    using Opened = std::tuple<int, const char*, int64_t>;
    for (auto [pid, extension, expiry] :
         {Opened{manager, "pdf", 11}, Opened{manager, "zip", 12}, Opened{suffixed, "pdf", 21},
          Opened{suffixed, "zip", 22}, Opened{first, "zip", 31}, Opened{first, "pdf", 32},
          Opened{3, "docx", 41}, Opened{3, "pdf", 42}, Opened{3, "txt", 43}})
        ASSERT_TRUE(mProcessMap.put(pid, {pid, extension, expiry, 7}));
    EXPECT_EQ(fields(mProcessMap.get(manager, "pdf")), (Fields{manager, "unzip", 12, 7}));
    EXPECT_EQ(fields(mProcessMap.get(manager, "docx")), (Fields{manager, "unzip", 12, 7}));
    EXPECT_EQ(fields(mProcessMap.get(suffixed, "pdf")), (Fields{suffixed, "pdf", 21, 7}));
    EXPECT_EQ(fields(mProcessMap.get(first, "pdf")), (Fields{first, "pdf", 32, 7}));
    EXPECT_EQ(fields(mProcessMap.get(first, "zip")), (Fields{first, "zip", 31, 7}));
    EXPECT_EQ(fields(mProcessMap.get(3, "pdf")), (Fields{3, "pdf", 42, 7}));
    EXPECT_EQ(fields(mProcessMap.get(3, "doc")), (Fields{3, "txt", 43, 7}));
    const Fields empty{-1, "no_extension", -1, -1};
    EXPECT_EQ(fields(mProcessMap.get(3, "jpg")), empty);
    EXPECT_EQ(fields(mProcessMap.get(4, "pdf")), empty);
    EXPECT_EQ(fields(mProcessMap.get(3, "tmp")), empty);
}

TEST(HashMap_remove, ForgetsTheEntriesTheRejectionAndTheFileManagerPid) {
    FreshProcessMap fresh;
    LibraryLockGuard guard;
    ASSERT_TRUE(mProcessMap.put(1, {1, "pdf", 10, 1}));
    ASSERT_TRUE(mProcessMap.put(2, {2, "pdf", 10, 1}));
    mProcessMap.mRejectList = {{1, "one"}, {3, "three"}};
    // (pid, file-manager pid before, after): present, absent, another's record kept.
    for (auto [pid, before, after] : {std::array{1, 1, -1}, {3, 3, -1}, {4, 2, 2}}) {
        mProcessMap.mFileManagerPid = before;
        HashMap::mMapIterator = HashMap::mInternalProcessMap.find(2);
        EXPECT_TRUE(mProcessMap.remove(pid));
        EXPECT_TRUE(HashMap::mMapIterator == HashMap::mInternalProcessMap.end()) << pid;
        EXPECT_EQ(mProcessMap.mFileManagerPid, after) << pid;
    }
    EXPECT_TRUE(mProcessMap.mRejectList.empty());
    EXPECT_EQ(stored(), (Entries{{2, "pdf", 10, 1}}));
}

}  // namespace dlp::test
