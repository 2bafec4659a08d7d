#include <dlp_sdk/expiry_attribute.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <optional>
#include <tuple>

#include "support/log_capture.h"
#include "support/scratch_directory.h"

namespace dlp::test {

using Bytes = std::vector<unsigned char>;
using Log = std::vector<LogRecord>;

// The working directory, so that paths, and the messages that print them, are literals.
const ScratchDirectory kDirectory;
[[maybe_unused]] const int kInDirectory = chdir(kDirectory.path().c_str());

const auto message = [](const std::string& text) { return mainError("DLP_LIBDLP :  " + text); };

TEST(set_dlp_file_expiry_time, WritesSixteenBytesOrFailsKeepingErrno) {
    kDirectory.file("report");
    ASSERT_EQ(mkfifo("fifo", 0600), 0);
    LogCapture log;
    EXPECT_EQ(set_dlp_file_expiry_time("report", 0x1122334455667788), 0);
    EXPECT_EQ(readAttribute("report"),
              (Bytes{0x88, 0x77, 0x66, 0x55, 0x44, 0x33, 0x22, 0x11, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(set_dlp_file_expiry_time("report", -2), 0);
    EXPECT_EQ(readAttribute("report"), expiryValue(-2));
    EXPECT_EQ(log.take(), Log(2, message("set xattr is successful!!")));
    // The kernel keeps user attributes off a FIFO.
    for (const auto& [path, error, text] :
         {std::tuple("missing", ENOENT,
                     "missing, setxattr error - -1, 2, No such file or directory\n"),
          std::tuple("fifo", EPERM, "fifo, setxattr error - -1, 1, Operation not permitted\n")}) {
        EXPECT_EQ(set_dlp_file_expiry_time(path, 1700000000), -1) << path;
        EXPECT_EQ(errno, error) << path;
        EXPECT_EQ(log.take(), Log{message(std::string("Error: setxattr(") + text)}) << path;
    }
}

TEST(get_dlp_file_expiry_time, ResultsAndMessages) {
    const auto read = [](const std::string& text) {
        return message("in get_dlp_file_expiry_time " + text + "\n");
    };
    const LogRecord notPositive = message("dlp expiry time is <= 0 retunring -1");
    // No value: the path does not exist; an empty one: the file has no attribute. Bytes 8-15 are
    // never read.
    using Row = std::tuple<const char*, std::optional<Bytes>, int64_t, Log>;
    for (const auto& [path, value, result, messages] :
         {Row("valid",
              Bytes{0x88, 0x77, 0x66, 0x55, 0x44, 0x33, 0x22, 0x11, 9, 9, 9, 9, 9, 9, 9, 9},
              0x1122334455667788, Log{read("getxattr OK: [1234605616436508552]")}),
          Row("year2040", expiryValue(2208988800), 2208988800,
              Log{read("getxattr OK: [2208988800]")}),
          Row("beyond", expiryValue(4295053696), 4295053696,
              Log{read("getxattr OK: [4295053696]")}),
          Row("zero", expiryValue(0), -1, Log{read("getxattr OK: [0]"), notPositive}),
          Row("negative", expiryValue(-5), -1, Log{read("getxattr OK: [-5]"), notPositive}),
          Row("plain", Bytes{}, -1,
              Log{message(" in get_dlp_file_expiry_time normal file (plain)\n")}),
          Row("gone", {}, -1,
              Log{read("Error: getxattr(gone, getxattr error - -1, 2, No such file or directory")}),
          Row("short", Bytes(8, 1), -1,
              Log{read("Error: getxattr(short, getxattr error - 8, 0, Success")}),
          Row("long", Bytes(17, 1), -1,
              Log{read("Error: getxattr(long, getxattr error - -1, 34, Numerical result out of "
                       "range")}),
          Row(nullptr, {}, -1,
              Log{read("Error: getxattr((null), getxattr error - -1, 22, Invalid argument")})}) {
        if (value) kDirectory.file(path);
        if (value && !value->empty()) writeAttribute(path, *value);
        LogCapture log;
        errno = 0;
        EXPECT_EQ(get_dlp_file_expiry_time(path), result) << path;
        EXPECT_EQ(log.take(), messages) << path;
    }
}

}  // namespace dlp::test
