#include <android-base/unique_fd.h>
#include <dlp_sdk/dlp_device.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <unistd.h>

#include <fstream>
#include <functional>
#include <iterator>
#include <tuple>

#include "support/log_capture.h"

namespace dlp::test {

using Log = std::vector<LogRecord>;
// A call, its result, a pattern of the requests it sent, its messages.
using Row = std::tuple<std::function<int()>, int, const char*, Log>;

// A state file of the stand-in, then removed: the stand-in starts it again.
std::string take(const char* name) {
    std::string path = std::string(getenv("DLP_DEVICE_STATE")) + "/" + name;
    std::string content(std::istreambuf_iterator<char>(std::ifstream(path).rdbuf()), {});
    unlink(path.c_str());
    return content;
}

void run(const std::vector<Row>& rows) {
    for (size_t row = 0; row < rows.size(); ++row) {
        const auto& [call, result, requests, messages] = rows[row];
        LogCapture log;
        EXPECT_EQ(call(), result) << "row " << row;
        EXPECT_THAT(take("requests"), testing::MatchesRegex(requests)) << "row " << row;
        EXPECT_EQ(log.take(), messages) << "row " << row;
    }
}

const auto message = [](const std::string& text) { return mainError("DLP_LIBDLP :  " + text); };
const std::string kLongest(1000, 'a'), kTooLong(1001, 'a');

// qemu-user answers the ioctl requests it does not know with ENOSYS, without calling the kernel.
bool emulatorRefusesRequests() {
    if (getenv("DLP_EMULATOR") == nullptr) return false;
    android::base::unique_fd device(open("/dev/zmk_dlp", O_RDONLY | O_CLOEXEC));
    int id = 0;
    const bool refused = ioctl(device.get(), 0x40047802, &id) != 0 && errno == ENOSYS;
    take("requests"), take("opens");
    return refused;
}

// An extension record: id, text, zeros up to 1000 bytes of text, 4 bytes of the library's choice.
TEST(dlp_device, RequestsResultsAndMessages) {
    if (getenv("DLP_DEVICE_STATE") == nullptr) GTEST_SKIP() << "needs tools/dlp-sandbox --device";
    if (emulatorRefusesRequests())
        GTEST_SKIP() << getenv("DLP_EMULATOR") << " answers the device's requests with ENOSYS";
    run({Row(std::bind(lock_dlp, 0x01020304), 0, "0x40047801 04030201\n",
             Log{message("lock_dlp : for 16909060\n")}),
         Row(std::bind(unlock_dlp, -2), 0, "0x40047802 feffffff\n",
             Log{message("unlock_dlp : for -2\n")}),
         Row(std::bind(set_dlp_extension, 0x01020304, "pdf,doc"), 0,
             "0x43f07803 040302017064662c646f63(00){993}[0-9a-f]{8}\n", Log{}),
         Row(std::bind(set_dlp_extension, 7, ""), 0, "0x43f07803 07000000(00){1000}[0-9a-f]{8}\n",
             Log{}),
         Row(std::bind(set_dlp_extension, 7, kLongest.c_str()), 0,
             "0x43f07803 07000000(61){1000}[0-9a-f]{8}\n", Log{}),
         Row(std::bind(set_dlp_extension, 7, kTooLong.c_str()), -1, "",
             Log{message("Extension length exceeds defined length")}),
         Row(std::bind(set_dlp_extension, 7, nullptr), -1, "",
             Log{message("Extension list is null")})});
    std::ofstream(std::string(getenv("DLP_DEVICE_STATE")) + "/fail")
            << "0x40047801 1\n0x40047802 25\n0x43f07803 1\n";
    run({Row(std::bind(lock_dlp, 5), -1, "0x40047801 05000000\n",
             Log{message("lock_dlp : for 5\n"),
                 message("DLP_LOCK_ENABLE failed: Operation not permitted\n")}),
         Row(std::bind(unlock_dlp, 5), -1, "0x40047802 05000000\n",
             Log{message("unlock_dlp : for 5\n"),
                 message("DLP_LOCK_DISABLE failed: Inappropriate ioctl for device\n")}),
         Row(std::bind(set_dlp_extension, 5, "pdf"), -1,
             "0x43f07803 05000000706466(00){997}[0-9a-f]{8}\n",
             Log{message("DLP_EXTENSION_SET failed: Operation not permitted\n")})});
    EXPECT_THAT(take("opens"), testing::MatchesRegex("(O_RDONLY\n){9}"));

    // The node goes, and the stand-in ends with its mount.
    ASSERT_EQ(umount2("/dev/zmk_dlp", MNT_DETACH), 0);
    ASSERT_EQ(unlink("/dev/zmk_dlp"), 0);
    const LogRecord cannotOpen = message("Can't open device file: /dev/zmk_dlp\n");
    run({Row(std::bind(lock_dlp, 3), -1, "", Log{message("lock_dlp : for 3\n"), cannotOpen}),
         Row(std::bind(unlock_dlp, 3), -1, "", Log{message("unlock_dlp : for 3\n"), cannotOpen}),
         Row(std::bind(set_dlp_extension, 3, kTooLong.c_str()), -1, "", Log{cannotOpen})});
}

}  // namespace dlp::test
