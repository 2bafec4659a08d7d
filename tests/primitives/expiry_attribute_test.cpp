#include <dlp_sdk/expiry_attribute.h>

#include <gtest/gtest.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "support/log_capture.h"

namespace {

using dlp::test::kError;
using dlp::test::kMainBuffer;
using dlp::test::LogCapture;

constexpr const char* kAttribute = "user.zorvat_dlp";

class ExpiryAttributeTest : public ::testing::Test {
  protected:
    void SetUp() override {
        char pattern[] = "/tmp/expiry_attribute_test.XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        directory_ = pattern;
    }
    void TearDown() override { std::filesystem::remove_all(directory_); }

    std::string createFile(const std::string& name) {
        std::string path = directory_ + "/" + name;
        std::ofstream(path) << "content";
        return path;
    }

    std::vector<unsigned char> readRawValue(const std::string& path) {
        std::vector<unsigned char> value(64);
        ssize_t size = getxattr(path.c_str(), kAttribute, value.data(), value.size());
        EXPECT_GE(size, 0) << strerror(errno);
        value.resize(size < 0 ? 0 : size);
        return value;
    }

    void writeRawValue(const std::string& path, const std::vector<unsigned char>& value) {
        ASSERT_EQ(setxattr(path.c_str(), kAttribute, value.data(), value.size(), 0), 0)
                << strerror(errno);
    }

    // Every message of the attribute goes to the main buffer at error priority.
    void expectMessages(const std::vector<std::string>& texts) {
        std::vector<dlp::test::LogRecord> records = log_.records();
        ASSERT_EQ(records.size(), texts.size());
        for (size_t i = 0; i < texts.size(); ++i) {
            EXPECT_EQ(records[i].buffer, kMainBuffer) << i;
            EXPECT_EQ(records[i].priority, kError) << i;
            EXPECT_EQ(records[i].text, texts[i]) << i;
        }
        log_.clear();
    }

    std::string directory_;
    LogCapture log_;
};

std::string getxattrError(const std::string& path, int result, int error) {
    return "DLP_LIBDLP :  in get_dlp_file_expiry_time Error: getxattr(" + path +
           ", getxattr error - " + std::to_string(result) + ", " + std::to_string(error) + ", " +
           strerror(error) + "\n";
}

std::string setxattrError(const std::string& path, int result, int error) {
    return "DLP_LIBDLP :  Error: setxattr(" + path + ", setxattr error - " +
           std::to_string(result) + ", " + std::to_string(error) + ", " + strerror(error) + "\n";
}

std::string readOk(long expiry) {
    return "DLP_LIBDLP :  in get_dlp_file_expiry_time getxattr OK: [" + std::to_string(expiry) +
           "]\n";
}

const std::string kWritten = "DLP_LIBDLP :  set xattr is successful!!";
const std::string kNotPositive = "DLP_LIBDLP :  dlp expiry time is <= 0 retunring -1";

TEST_F(ExpiryAttributeTest, WritesSixteenLittleEndianBytesAndReadsThemBack) {
    std::string path = createFile("report.pdf");
    const long expiry = 0x1122334455667788L;

    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), expiry), 0);
    expectMessages({kWritten});
    EXPECT_EQ(readRawValue(path), (std::vector<unsigned char>{0x88, 0x77, 0x66, 0x55, 0x44, 0x33,
                                                              0x22, 0x11, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), expiry);
    expectMessages({readOk(expiry)});

    // A second write replaces the whole value; a negative time keeps its sign bits.
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), -2), 0);
    expectMessages({kWritten});
    EXPECT_EQ(readRawValue(path), (std::vector<unsigned char>{0xfe, 0xff, 0xff, 0xff, 0xff, 0xff,
                                                              0xff, 0xff, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), 2000000000), 0);
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), 2000000000);
}

TEST_F(ExpiryAttributeTest, FollowsSymbolicLinksAndIgnoresTheReservedBytes) {
    std::string target = createFile("target.docx");
    std::string link = directory_ + "/link.docx";
    ASSERT_EQ(symlink(target.c_str(), link.c_str()), 0);

    EXPECT_EQ(set_dlp_file_expiry_time(link.c_str(), 1900000000), 0);
    EXPECT_EQ(readRawValue(target).size(), 16u);
    EXPECT_EQ(get_dlp_file_expiry_time(target.c_str()), 1900000000);

    std::vector<unsigned char> value(16, 0xff);
    const unsigned char expiry[8] = {0x00, 0x94, 0x35, 0x77, 0, 0, 0, 0};  // 2000000000
    std::copy(std::begin(expiry), std::end(expiry), value.begin());
    writeRawValue(target, value);
    log_.clear();
    EXPECT_EQ(get_dlp_file_expiry_time(link.c_str()), 2000000000);
    expectMessages({readOk(2000000000)});
}

TEST_F(ExpiryAttributeTest, ReadsWithoutAValidAttributeYieldNoExpiry) {
    std::string plain = createFile("plain.txt");
    EXPECT_EQ(get_dlp_file_expiry_time(plain.c_str()), -1);
    expectMessages({"DLP_LIBDLP :   in get_dlp_file_expiry_time normal file (" + plain + ")\n"});

    std::string missing = directory_ + "/missing.txt";
    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(missing.c_str()), -1);
    EXPECT_EQ(errno, ENOENT);
    expectMessages({getxattrError(missing, -1, ENOENT)});

    // A short value is read successfully, so errno still holds what it held before the call.
    std::string shortValue = createFile("short.txt");
    writeRawValue(shortValue, std::vector<unsigned char>(8, 0x11));
    errno = EDOM;
    EXPECT_EQ(get_dlp_file_expiry_time(shortValue.c_str()), -1);
    EXPECT_EQ(errno, EDOM);
    expectMessages({getxattrError(shortValue, 8, EDOM)});

    std::string longValue = createFile("long.txt");
    writeRawValue(longValue, std::vector<unsigned char>(20, 0x11));
    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(longValue.c_str()), -1);
    EXPECT_EQ(errno, ERANGE);
    expectMessages({getxattrError(longValue, -1, ERANGE)});

    errno = 0;
    EXPECT_EQ(get_dlp_file_expiry_time(nullptr), -1);
    EXPECT_EQ(errno, EINVAL);
    expectMessages({getxattrError("(null)", -1, EINVAL)});
}

TEST_F(ExpiryAttributeTest, StoredTimesOfZeroOrLessAreWrittenButReadAsNoExpiry) {
    std::string path = createFile("zero.pdf");
    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), 0), 0);
    expectMessages({kWritten});
    EXPECT_EQ(readRawValue(path), std::vector<unsigned char>(16, 0));
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), -1);
    expectMessages({readOk(0), kNotPositive});

    EXPECT_EQ(set_dlp_file_expiry_time(path.c_str(), -5), 0);
    log_.clear();
    EXPECT_EQ(get_dlp_file_expiry_time(path.c_str()), -1);
    expectMessages({readOk(-5), kNotPositive});
}

TEST_F(ExpiryAttributeTest, FailedWritesReportTheirErrno) {
    std::string missing = directory_ + "/missing.pdf";
    errno = 0;
    EXPECT_EQ(set_dlp_file_expiry_time(missing.c_str(), 1900000000), -1);
    EXPECT_EQ(errno, ENOENT);
    expectMessages({setxattrError(missing, -1, ENOENT)});

    errno = 0;
    EXPECT_EQ(set_dlp_file_expiry_time(nullptr, 1900000000), -1);
    EXPECT_EQ(errno, EINVAL);
    expectMessages({setxattrError("(null)", -1, EINVAL)});
}

}  // namespace
