#include <android/log.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/pending_inode.h>
#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <thread>

#include "command_vector.h"
#include "support/duration_database.h"
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
                    runCommandVector({"4", "0", std::to_string(pid * 100000 + round), path});
                    setExpiryforFile(pid, path.data(), 150), runCommandVector({"1", name}),
                            putPendingInodeValue(pid * uint64_t{100000} + round, pid),
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
    // Under an emulator every start takes about half a second.
    const int runs = getenv("DLP_EMULATOR") == nullptr ? 200 : 40;
    int abnormal = 0;
    for (int count = 0; count < runs; ++count) abnormal += system(run.c_str()) != 0;
    EXPECT_EQ(abnormal, 0) << "of " << runs << " runs did not end with exit(0)";
}

}  // namespace dlp::test
