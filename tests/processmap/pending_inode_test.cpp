#include <dlp_sdk/pending_inode.h>
#include <gtest/gtest.h>

#include <cstdint>

#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {

TEST(putPendingInodeValue, ParksLooksUpAndClearsPidsByInode) {
    const char* put =
            "DLP_LIBDLP : <putPendingInodeValue> Invalid parameter inode/pid. Return false";
    const char* get = "DLP_LIBDLP : <getPidByInode> Invalid parameter inode. Return false";
    // (put, get or clear; inode; pid; result; message)
    // An inode above 2^32 is its own key, not the one of its low 32 bits.
    const uint64_t high = (uint64_t{1} << 32) + 42;
    const std::tuple<char, uint64_t, int, int, const char*> rows[] = {
            {'p', 42, 7, 1, ""},   {'p', 42, 9, 1, ""},    {'g', 42, 0, 7, ""},
            {'g', 42, 0, 7, ""},   {'p', 43, 0, 1, ""},    {'g', 43, 0, 0, ""},
            {'p', 44, -1, 0, put}, {'p', 0, 7, 0, put},    {'g', 44, 0, -1, ""},
            {'g', 0, 0, 0, get},   {'c', 0, 0, 0, ""},     {'c', 99, 0, 1, ""},
            {'c', 42, 0, 1, ""},   {'g', 42, 0, -1, ""},   {'p', 42, 9, 1, ""},
            {'g', 42, 0, 9, ""},   {'p', high, 5, 1, ""},  {'g', high, 0, 5, ""},
            {'c', high, 0, 1, ""}, {'g', high, 0, -1, ""}, {'g', 42, 0, 9, ""}};
    FreshProcessMap fresh;
    LogCapture log;
    for (auto [call, inode, pid, result, message] : rows) {
        EXPECT_EQ(call == 'p'   ? putPendingInodeValue(inode, pid)
                  : call == 'g' ? getPidByInode(inode)
                                : clearPendingInode(inode),
                  result)
                << call << " " << inode << " " << pid;
        EXPECT_EQ(log.take(), *message ? std::vector<LogRecord>{systemError(message)}
                                       : std::vector<LogRecord>{});
    }
}

}  // namespace dlp::test
