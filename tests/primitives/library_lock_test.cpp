#include <android/log.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/pending_inode.h>
#include <dlp_sdk/process_map.h>
#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <thread>

#include "support/command_vector.h"
#include "support/duration_database.h"
#include "support/process_map_reset.h"
#include "support/scratch_directory.h"

namespace dlp::test {

// Started again with DLP_LATE_CALLERS=FILE, the test leaves the program as returning from main
// does, while four threads keep calling in. Every run must end with exit(0), never by a signal.
TEST(LibraryLock, CallsRacingTheExitWait) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    static std::atomic<int> rounds{0};
    if (const char* file = getenv("DLP_LATE_CALLERS")) {
        __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
        for (int pid = 1000; pid < 1004; ++pid) {
            std::thread([pid, path = std::string(file), name = std::to_string(pid)]() mutable {
                // The maps grow, so that their destruction takes a while.
                for (int round = 0;; ++round, ++rounds) {
                    runCommand({"4", "0", std::to_string(pid * 100000 + round), path});
                    setExpiryforFile(pid, path.data(), 150), runCommand({"1", name}),
                            putPendingInodeValue(pid * 100000UL + round, pid),
                            get_expiryAfter_time(150);
                }
            }).detach();
        }
        while (rounds < 100) std::this_thread::yield();
        exit(0);
    }
    ScratchDirectory directory;
    ASSERT_EQ(set_time(150, 60), 0);
    // ThreadSanitizer would wait a second at each exit.
    const std::string run =
            "TSAN_OPTIONS=\"$TSAN_OPTIONS:atexit_sleep_ms=50\" DLP_LATE_CALLERS=" +
            directory.file("opened.pdf", 2000000000) + " " + program_invocation_name +
            " --gtest_brief=1 --gtest_filter=LibraryLock.CallsRacingTheExitWait >/dev/null";
    int abnormal = 0;
    for (int count = 0; count < 200; ++count) abnormal += system(run.c_str()) != 0;
    EXPECT_EQ(abnormal, 0) << "of 200 runs did not end with exit(0)";
}

// Four threads over every entry point that takes the lock, each pid with files of its own; no
// such process exists, so each is rejected and its new files take the container's duration.
TEST(LibraryLock, ConcurrentCallersLoseNothing) {
    SKIP_UNLESS_DATABASE_IS_THROWAWAY();
    FreshProcessMap freshMap;
    ScratchDirectory directory;
    __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
    std::vector<std::thread> threads;
    for (int pid = 900000; pid < 900004; ++pid) {
        threads.emplace_back([&directory, pid, id = pid - 899900] {
            const std::string name = std::to_string(pid), other = std::to_string(pid + 10);
            std::string container = std::to_string(id), created = directory.file(name);
            std::string pdf = directory.file(name + ".pdf", pid + 2000000000L);
            std::string docx = directory.file(name + ".docx", pid + 2100000000L);
            // Map work alone first, where the threads meet most often.
            for (unsigned long inode = pid * 10000UL; inode < pid * 10000UL + 5000; ++inode) {
                EXPECT_TRUE(putPendingInodeValue(inode, pid) && getPidByInode(inode) == pid &&
                            (inode % 2 == 0 || clearPendingInode(inode)));
            }
            for (int round = 0; round < 100; ++round) {
                EXPECT_TRUE(addOrUpdateMapEntry(pid, docx.data()));
                mProcessMap.makeExtensionGroups();
                // Each 0 when the call did what it should.
                EXPECT_EQ((std::vector<int>{
                                  runCommand({"4", "0", name, pdf}),
                                  runCommand({"4", "0", other, pdf}), runCommand({"1", other}),
                                  runCommand({"5", "0", "abc"}), runCommand({"6", "100", "1"}),
                                  runCommand({"2", container, created, "1"}),
                                  runCommand({"3", container, std::to_string(round)}),
                                  set_expiryAfter_time(id, round), set_time(id, round),
                                  init_table(), setExpiryforFile(pid, created.data(), id),
                                  get_time(id) - round, get_expiryAfter_time(id) - round,
                                  getITAdminExpiryTime(id) < 1700000000, getDLPAuditLogState() - 1,
                                  isNewFileCase({pid, "pdf", 2, 1}, nullptr, 2, pid) - 1,
                                  mProcessMap.getValidMapEntryIndexForExt("doc",
                                                                          {{pid, "docx", 2, 1}})}),
                          std::vector<int>(17, 0));
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    __android_log_set_minimum_priority(ANDROID_LOG_DEFAULT);
    EXPECT_EQ(HashMap::mInternalProcessMap.size(), 4u);
    for (const auto& [pid, entries] : HashMap::mInternalProcessMap) {
        ASSERT_EQ(entries.size(), 2u) << pid;
        EXPECT_EQ(entries[0].value_expiry + entries[1].value_expiry, 2 * pid + 4100000000L) << pid;
    }
    EXPECT_EQ(HashMap::mPendingInodeMap.size(), 10000u);
    EXPECT_EQ(DurationDatabase().rows("WHERE Id < 104 ORDER BY Id"),
              (std::vector<std::pair<int, int>>{{100, 99}, {101, 99}, {102, 99}, {103, 99}}));
}

}  // namespace dlp::test
