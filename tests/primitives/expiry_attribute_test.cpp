#include <dlp_sdk/expiry_attribute.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <iterator>
#include <string>
#include <vector>

#include "support/expiry_attribute_bytes.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

using Bytes = std::vector<unsigned char>;

LogRecord readFailedMessage(const std::string& path, int result, int error) {
    return mainError("DLP_LIBDLP :  in get_dlp_file_expiry_time Error: getxattr(" + path +
                     ", getxattr error - " + std::to_string(result) + ", " + std::to_string(error) +
                     ", " + strerror(error) + "\n");
}

LogRecord readMessage(long expiry) {
    return mainError("DLP_LIBDLP :  in get_dlp_file_expiry_time getxattr OK: [" +
                     std::to_string(expiry) + "]\n");
}

const LogRecord kWritten = mainError("DLP_LIBDLP :  set xattr is successful!!");
const LogRecord kNotPositive = mainError("DLP_LIBDLP :  dlp expiry time is <= 0 retunring -1");

class ExpiryAttributeTest : public ::testing::Test {
  protected:
    ScratchDirectory directory_;
    LogCapture log_;
};

TEST_F(ExpiryAttributeTest, WritesSixteenLittleEndianBytesAndReadsThemBack) {
    std::string path = directory_.file("report.pdf");
    const long expiry = 0x1122334455667788L;

    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), expiry), 0);
    EXPECT_EQ(readRawAttribute(path),
              (Bytes{0x88, 0x77, 0x66, 0x55, 0x44, 0x33, 0x22, 0x11, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), expiry);
    expectRecords(log_, {kWritten, readMessage(expiry)});

    // A second write replaces the whole value; a negative time keeps its sign bits.
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), -2), 0);
    EXPECT_EQ(readRawAttribute(path),
              (Bytes{0xfe, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), 2000000000), 0);
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), 2000000000);
}

TEST_F(ExpiryAttributeTest, FollowsSymbolicLinksAndIgnoresTheReservedBytes) {
    std::string target = directory_.file("target.docx");
    std::string link = directory_.path() + "/link.docx";
    ASSERT_EQ(symlink(target.c_str(), link.c_str()), 0);

    EXPECT_EQ(set_dlp_file_expiry_time(link.c_str(), 1900000000), 0);
    EXPECT_EQ(readRawAttribute(target).size(), 16u);
    EXPECT_EQ(get_dlp_file_expiry_time(target.c_str()), 1900000000);

    Bytes value(16, 0xff);
    const unsigned char expiry[8] = {0x00, 0x94, 0x35, 0x77, 0, 0, 0, 0};  // 2000000000
    std::copy(std::begin(expiry), std::end(expiry), value.begin());
    writeRawAttribute(target, value);
    log_.clear();
    EXPECT_EQ(get_dlp_file_expiry_time(link.c_str()), 2000000000);
    expectRecords(log_, {readMessage(2000000000)});
}

TEST_F(ExpiryAttributeTest, ReadsWithoutAValidAttributeYieldNoExpiry) {
    std::string plain = directory_.file("plain.txt");
    EXPECT_EQ(get_dlp_file_expiry_time(plain.c_str()), -1);
    expectRecords(log_, {mainError("DLP_LIBDLP :   in get_dlp_file_expiry_time normal file (" +
                                   plain + ")\n")});

    std::string missing = directory_.path() + "/missing.txt";
    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(missing.c_str()), -1);
    EXPECT_EQ(errno, ENOENT);
    expectRecords(log_, {readFailedMessage(missing, -1, ENOENT)});

    // A short value is read successfully, so errno still holds what it held before the call.
    std::string shortValue = directory_.file("short.txt");
    writeRawAttribute(shortValue, Bytes(8, 0x11));
    errno = EDOM;
    EXPECT_EQ(get_dlp_file_expiry_time(shortValue.c_str()), -1);
    EXPECT_EQ(errno, EDOM);
    expectRecords(log_, {readFailedMessage(shortValue, 8, EDOM)});

    std::string longValue = directory_.file("long.txt");
    writeRawAttribute(longValue, Bytes(20, 0x11));
    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(longValue.c_str()), -1);
    EXPECT_EQ(errno, ERANGE);
    expectRecords(log_, {readFailedMessage(longValue, -1, ERANGE)});

    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(nullptr), -1);
    EXPECT_EQ(errno, EINVAL);
    expectRecords(log_, {readFailedMessage("(null)", -1, EINVAL)});
}

TEST_F(ExpiryAttributeTest, StoredTimesOfZeroOrLessAreWrittenButReadAsNoExpiry) {
    std::string path = directory_.file("zero.pdf");
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), 0), 0);
    EXPECT_EQ(readRawAttribute(path), Bytes(16, 0));
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), -1);
    expectRecords(log_, {kWritten, readMessage(0), kNotPositive});

    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), -5), 0);
    log_.clear();
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), -1);
    expectRecords(log_, {readMessage(-5), kNotPositive});
}

TEST_F(ExpiryAttributeTest, FailedWritesReportTheirErrno) {
    std::string missing = directory_.path() + "/missing.pdf";
    errno = 0;
    EXPECT_EQ(set_dlp_file_expiry_time(missing.c_str(), 1900000000), -1);
    EXPECT_EQ(errno, ENOENT);
    errno = 0;
    EXPECT_EQ(set_dlp_file_expiry_time(nullptr, 1900000000), -1);
    EXPECT_EQ(errno, EINVAL);
    expectRecords(log_, {attributeWriteFailedMessage(missing, -1, ENOENT),
                         attributeWriteFailedMessage("(null)", -1, EINVAL)});
}

}  // namespace
}  // namespace dlp::test
