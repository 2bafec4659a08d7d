#include <android/log.h>
#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/pending_inode.h>
#include <dlp_sdk/process_map.h>
#include <dlp_sdk/process_name.h>
#include <gtest/gtest.h>

#include <atomic>
#include <ctime>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "support/child_process.h"
#include "support/command_vector.h"
#include "support/duration_database.h"
#include "support/expiry_attribute_bytes.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

constexpr int kThreads = 4;
constexpr int kIterations = 120;
// The 100 container ids, 25 per thread.
constexpr int kContainersPerThread = 25;
const std::string kGallery = "com.vux.android.gallery3d";

// Pids that no process carries: named "???" and rejected, so their new files take the duration.
pid_t openerPid(int thread, int iteration) {
    return 700000 + thread * 10000 + iteration;
}
pid_t forgottenPid(int thread, int iteration) {
    return 800000 + thread * 10000 + iteration;
}
// Parking is pure map work: with no file work in between, the threads meet inside the map.
constexpr int kParkedInodes = 20000;
unsigned long inodeOf(int thread, int slot) {
    return 1000000UL * static_cast<unsigned long>(thread + 1) + static_cast<unsigned long>(slot);
}
int containerOf(int thread, int iteration) {
    return 100 + thread * kContainersPerThread + iteration % kContainersPerThread;
}
int durationOf(int thread, int iteration) {
    return 1000 * (thread + 1) + iteration;
}

void discardLog(const __android_logger_data*, const char*) {}

// One thread's own files and gallery process: the final state depends on nothing it shares.
struct Worker {
    Worker(int index, const ScratchDirectory& directory, long now)
        : index(index),
          gallery(kGallery),
          pdfExpiry(now + 10000 + index),
          docxExpiry(now + 20000 + index),
          jpgExpiry(now + 30000 + index),
          pdf(directory.stampedFile("t" + std::to_string(index) + "/opened.pdf", pdfExpiry)),
          docx(directory.stampedFile("t" + std::to_string(index) + "/opened.docx", docxExpiry)),
          jpg(directory.stampedFile("t" + std::to_string(index) + "/opened.jpg", jpgExpiry)),
          directory(directory) {}

    std::string newFile(const std::string& name, int iteration) const {
        return directory.file("t" + std::to_string(index) + "/" + std::to_string(iteration) + name);
    }

    void parkInodes() {
        for (int slot = 0; slot < kParkedInodes; ++slot) {
            const unsigned long inode = inodeOf(index, slot);
            EXPECT_TRUE(putPendingInodeValue(inode, gallery.pid()));
            EXPECT_EQ(getPidByInode(inode), gallery.pid());
            if (slot % 2 == 1) {
                EXPECT_TRUE(clearPendingInode(inode));
            }
        }
    }

    void iterate(int i) {
        const pid_t opener = openerPid(index, i);
        const std::string openerText = std::to_string(opener);
        const int container = containerOf(index, i);
        const int duration = durationOf(index, i);

        EXPECT_EQ(runCommand({"4", "0", openerText, pdf}), 0);
        EXPECT_TRUE(addOrUpdateMapEntry(opener, docx.data()));
        EXPECT_EQ(runCommand({"4", "0", std::to_string(gallery.pid()), jpg}), 0);
        if (i % 2 == 0) {
            EXPECT_EQ(runCommand({"3", std::to_string(container), std::to_string(duration)}), 0);
        } else {
            EXPECT_EQ(set_expiryAfter_time(container, duration), 0);
        }
        EXPECT_EQ(get_expiryAfter_time(container), duration);
        long beforeAdminExpiry = time(nullptr);
        EXPECT_GE(getITAdminExpiryTime(container), beforeAdminExpiry + duration);

        std::string inherited = newFile("inherited.jpg", i);
        EXPECT_EQ(setExpiryforFile(gallery.pid(), inherited.data(), container), 0);
        EXPECT_EQ(readExpiryAttribute(inherited), jpgExpiry);
        std::string brandNew = newFile("new.pdf", i);
        long first = getCurrentTimeInSec();
        EXPECT_EQ(setExpiryforFile(opener, brandNew.data(), container), 0);
        long last = getCurrentTimeInSec();
        std::optional<int64_t> written = readExpiryAttribute(brandNew);
        EXPECT_TRUE(written && *written >= first + duration && *written <= last + duration);
        EXPECT_TRUE(
                isNewFileCase(MapEntry{opener, "pdf", pdfExpiry, first}, nullptr, first, opener));

        const pid_t forgotten = forgottenPid(index, i);
        EXPECT_TRUE(addOrUpdateMapEntry(forgotten, pdf.data()));
        EXPECT_EQ(runCommand({"1", std::to_string(forgotten)}), 0);

        EXPECT_EQ(runCommand({"5", "0", "abc,def"}), 0);
        EXPECT_EQ(runCommand({"6", "100", "1"}), 0);
        EXPECT_EQ(getDLPAuditLogState(), 1);
        std::string stamped = newFile("stamped.pdf", i);
        EXPECT_EQ(runCommand({"2", std::to_string(container), stamped, "12345"}), 0);
        EXPECT_EQ(get_dlp_file_expiry_time(stamped.c_str()), 12345);
        EXPECT_EQ(set_dlp_file_expiry_time(stamped.c_str(), 54321), 0);
        EXPECT_EQ(get_dlp_file_expiry_time(stamped.c_str()), 54321);

        EXPECT_EQ(getExtensions("pdf,docx", ','), (std::vector<std::string>{"pdf", "docx"}));
        EXPECT_EQ(mProcessMap.getValidMapEntryIndexForExt(
                          "doc", {MapEntry{opener, "docx", docxExpiry, first},
                                  MapEntry{opener, "pdf", pdfExpiry, first}}),
                  0);
        EXPECT_EQ(getProcessNameByPid(gallery.pid()), kGallery);
        EXPECT_GE(getEndOfDay(), first);
    }

    const int index;
    const ChildProcess gallery;
    const long pdfExpiry;
    const long docxExpiry;
    const long jpgExpiry;
    std::string pdf;
    std::string docx;
    std::string jpg;
    const ScratchDirectory& directory;
};

TEST(lockLibraryState, KeepsEveryThreadsStateWhenAllEntryPointsRunConcurrently) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap freshMap;
    ScratchDirectory directory;
    long now = time(nullptr);
    std::vector<std::unique_ptr<Worker>> workers;
    for (int t = 0; t < kThreads; ++t)
        workers.push_back(std::make_unique<Worker>(t, directory, now));

    __android_log_set_logger(discardLog);
    std::atomic<int> waiting{kThreads};
    std::vector<std::thread> threads;
    for (auto& worker : workers) {
        threads.emplace_back([&worker, &waiting] {
            // All start together, so that their map work overlaps.
            --waiting;
            while (waiting.load() > 0) std::this_thread::yield();
            worker->parkInodes();
            for (int i = 0; i < kIterations; ++i) worker->iterate(i);
        });
    }
    for (std::thread& thread : threads) thread.join();
    __android_log_set_logger(__android_log_stderr_logger);

    std::vector<std::pair<int, int>> rowList = DurationDatabase().rows();
    std::multimap<int, int> rows(rowList.begin(), rowList.end());
    for (const auto& worker : workers) {
        const int t = worker->index;
        const std::vector<MapEntry>& galleryEntries =
                HashMap::mInternalProcessMap[worker->gallery.pid()];
        ASSERT_EQ(galleryEntries.size(), 1u);
        EXPECT_EQ(galleryEntries[0].value_expiry, worker->jpgExpiry);
        for (int i = 0; i < kIterations; ++i) {
            const pid_t opener = openerPid(t, i);
            auto found = HashMap::mInternalProcessMap.find(opener);
            ASSERT_NE(found, HashMap::mInternalProcessMap.end()) << opener;
            ASSERT_EQ(found->second.size(), 2u) << opener;
            EXPECT_EQ(found->second[0].value_extension, "pdf");
            EXPECT_EQ(found->second[0].value_expiry, worker->pdfExpiry);
            EXPECT_EQ(found->second[1].value_extension, "docx");
            EXPECT_EQ(found->second[1].value_expiry, worker->docxExpiry);
            EXPECT_EQ(mProcessMap.mRejectList[opener], "???") << opener;
            EXPECT_EQ(HashMap::mInternalProcessMap.count(forgottenPid(t, i)), 0u);
        }
        for (int slot = 0; slot < kParkedInodes; ++slot) {
            auto parked = HashMap::mPendingInodeMap.find(inodeOf(t, slot));
            if (slot % 2 == 0) {
                ASSERT_NE(parked, HashMap::mPendingInodeMap.end()) << inodeOf(t, slot);
                EXPECT_EQ(parked->second, worker->gallery.pid());
            } else {
                EXPECT_EQ(parked, HashMap::mPendingInodeMap.end()) << inodeOf(t, slot);
            }
        }
        // The last duration written for each container, in the cache and in one database row.
        std::map<int, int> expected;
        for (int i = 0; i < kIterations; ++i) expected[containerOf(t, i)] = durationOf(t, i);
        for (const auto& [container, duration] : expected) {
            EXPECT_EQ(get_expiryAfter_time(container), duration) << container;
            ASSERT_EQ(rows.count(container), 1u) << container;
            EXPECT_EQ(rows.find(container)->second, duration) << container;
        }
    }
    EXPECT_EQ(HashMap::mInternalProcessMap.size(),
              static_cast<size_t>(kThreads * (kIterations + 1)));
    EXPECT_EQ(HashMap::mPendingInodeMap.size(), static_cast<size_t>(kThreads * kParkedInodes / 2));
    EXPECT_EQ(mProcessMap.mRejectList.size(), static_cast<size_t>(kThreads * kIterations));
    EXPECT_EQ(mProcessMap.mExtensionList, (std::vector<std::string>{"abc", "def"}));
    EXPECT_EQ(rows.size(), 100u);
}

}  // namespace
}  // namespace dlp::test
