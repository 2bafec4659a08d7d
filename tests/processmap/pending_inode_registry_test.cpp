#include <dlp_sdk/pending_inode.h>

#include <gtest/gtest.h>

#include <climits>
#include <map>

#include "processmap/process_map_internal.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {
namespace {

using PendingInodes = std::map<unsigned long, int>;

const LogRecord kInvalidPut = systemError(
        "DLP_LIBDLP : <putPendingInodeValue> Invalid parameter inode/pid. Return false");
const LogRecord kInvalidGet =
        systemError("DLP_LIBDLP : <getPidByInode> Invalid parameter inode. Return false");

class PendingInodeRegistryTest : public ::testing::Test {
  protected:
    FreshProcessMap map_;
    LogCapture log_;
};

TEST_F(PendingInodeRegistryTest, FirstParkedPidStaysUntilCleared) {
    EXPECT_TRUE(putPendingInodeValue(42, 7));
    EXPECT_TRUE(putPendingInodeValue(42, 9));
    EXPECT_TRUE(mProcessMap.addPendingInode(42, 11));
    EXPECT_EQ(getPidByInode(42), 7);
    EXPECT_EQ(getPidByInode(42), 7);
    EXPECT_TRUE(putPendingInodeValue(43, 0));
    EXPECT_EQ(getPidByInode(43), 0);
    EXPECT_EQ(getPidByInode(44), -1);
    EXPECT_EQ(HashMap::mPendingInodeMap, (PendingInodes{{42, 7}, {43, 0}}));

    EXPECT_TRUE(clearPendingInode(42));
    EXPECT_EQ(getPidByInode(42), -1);
    EXPECT_EQ(getPidByInode(43), 0);
    EXPECT_TRUE(clearPendingInode(42));
    EXPECT_TRUE(clearPendingInode(44));
    EXPECT_TRUE(putPendingInodeValue(42, 9));
    EXPECT_EQ(getPidByInode(42), 9);
    EXPECT_EQ(HashMap::mPendingInodeMap, (PendingInodes{{42, 9}, {43, 0}}));
    expectRecords(log_, {});
}

TEST_F(PendingInodeRegistryTest, InodeZeroAndNegativePidsAreRefused) {
    ASSERT_TRUE(putPendingInodeValue(42, 7));
    EXPECT_FALSE(putPendingInodeValue(42, -1));
    EXPECT_FALSE(putPendingInodeValue(50, -1));
    EXPECT_FALSE(putPendingInodeValue(0, 7));
    EXPECT_FALSE(putPendingInodeValue(0, -1));
    expectRecords(log_, {kInvalidPut, kInvalidPut, kInvalidPut, kInvalidPut});

    EXPECT_EQ(getPidByInode(0), 0);
    expectRecords(log_, {kInvalidGet});
    EXPECT_FALSE(clearPendingInode(0));
    expectRecords(log_, {});
    EXPECT_EQ(HashMap::mPendingInodeMap, (PendingInodes{{42, 7}}));
}

TEST_F(PendingInodeRegistryTest, InodesAreFullUnsigned64BitKeys) {
    const unsigned long largest = ULONG_MAX;
    const unsigned long above32Bits = 1UL << 32;  // 0 when cut to 32 bits
    EXPECT_TRUE(putPendingInodeValue(largest, 5));
    EXPECT_TRUE(putPendingInodeValue(above32Bits, 8));
    EXPECT_TRUE(putPendingInodeValue(1, 6));
    EXPECT_EQ(getPidByInode(largest), 5);
    EXPECT_EQ(getPidByInode(above32Bits), 8);
    EXPECT_EQ(getPidByInode(largest - 1), -1);
    EXPECT_EQ(HashMap::mPendingInodeMap, (PendingInodes{{1, 6}, {above32Bits, 8}, {largest, 5}}));

    EXPECT_TRUE(clearPendingInode(above32Bits));
    EXPECT_EQ(getPidByInode(above32Bits), -1);
    EXPECT_EQ(getPidByInode(largest), 5);
    expectRecords(log_, {});
}

}  // namespace
}  // namespace dlp::test
