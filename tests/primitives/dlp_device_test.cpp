// Runs inside tools/dlp-sandbox --device: /dev/zmk_dlp is the FUSE stand-in, which records every
// request it receives in $DLP_DEVICE_STATE.

#include <dlp_sdk/dlp_device.h>

#include <fcntl.h>
#include <linux/magic.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/log_capture.h"

namespace dlp::test {
namespace {

constexpr const char* kDevicePath = "/dev/zmk_dlp";
constexpr uint32_t kLockEnable = 0x40047801;
constexpr uint32_t kLockDisable = 0x40047802;
constexpr uint32_t kExtensionSet = 0x43F07803;
constexpr size_t kExtensionRecordSize = 1008;
// "0x%08x " in front of the argument bytes of a `requests` line.
constexpr size_t kRequestLinePrefixSize = 11;

const LogRecord kCannotOpen = mainError("DLP_LIBDLP :  Can't open device file: /dev/zmk_dlp\n");

std::vector<uint8_t> littleEndian(int32_t id) {
    const uint32_t value = static_cast<uint32_t>(id);
    return {static_cast<uint8_t>(value), static_cast<uint8_t>(value >> 8),
            static_cast<uint8_t>(value >> 16), static_cast<uint8_t>(value >> 24)};
}

std::vector<uint8_t> extensionRecord(int32_t id, const std::string& text) {
    std::vector<uint8_t> record(kExtensionRecordSize, 0);
    const std::vector<uint8_t> idBytes = littleEndian(id);
    std::copy(idBytes.begin(), idBytes.end(), record.begin());
    std::copy(text.begin(), text.end(), record.begin() + idBytes.size());
    return record;
}

// A line of the stand-in's `requests` file.
std::string requestLine(uint32_t request, const std::vector<uint8_t>& argument) {
    char line[16];
    snprintf(line, sizeof line, "0x%08x ", request);
    std::string text = line;
    for (uint8_t byte : argument) {
        snprintf(line, sizeof line, "%02x", byte);
        text += line;
    }
    return text;
}

// Bytes 1 to 255 over and over: every offset error shows, and no zero ends the text early.
std::string patternText(size_t size) {
    std::string text;
    for (size_t i = 0; i < size; ++i) text += static_cast<char>(1 + i % 255);
    return text;
}

std::vector<std::string> readOnlyOpens(size_t count) {
    return std::vector<std::string>(count, "O_RDONLY");
}

size_t openDescriptorCount() {
    return static_cast<size_t>(std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                                             std::filesystem::directory_iterator()));
}

// Takes this process into a mount namespace of its own where /dev is empty, and back into the
// sandbox's on destruction. Nothing else sees the node disappear.
class DeviceNodeRemoved {
  public:
    DeviceNodeRemoved()
        : sandboxNamespace_(open("/proc/self/ns/mnt", O_RDONLY | O_CLOEXEC)),
          workingDirectory_(open(".", O_PATH | O_DIRECTORY | O_CLOEXEC)) {
        removed_ = sandboxNamespace_ >= 0 && workingDirectory_ >= 0 && unshare(CLONE_NEWNS) == 0 &&
                   mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                   mount("dlp-test-empty-dev", "/dev", "tmpfs", 0, "mode=0755") == 0;
        if (!removed_) error_ = strerror(errno);
    }
    ~DeviceNodeRemoved() {
        if (sandboxNamespace_ >= 0) {
            if (setns(sandboxNamespace_, CLONE_NEWNS) != 0) std::abort();
            close(sandboxNamespace_);
        }
        if (workingDirectory_ >= 0) {
            if (fchdir(workingDirectory_) != 0) std::abort();
            close(workingDirectory_);
        }
    }
    DeviceNodeRemoved(const DeviceNodeRemoved&) = delete;
    DeviceNodeRemoved& operator=(const DeviceNodeRemoved&) = delete;

    bool removed() const { return removed_; }
    const std::string& error() const { return error_; }

  private:
    int sandboxNamespace_;
    int workingDirectory_;
    bool removed_ = false;
    std::string error_;
};

class DlpDeviceTest : public testing::Test {
  protected:
    void SetUp() override {
        const char* directory = getenv("DLP_DEVICE_STATE");
        struct statfs device;
        ASSERT_TRUE(directory != nullptr && statfs(kDevicePath, &device) == 0 &&
                    device.f_type == FUSE_SUPER_MAGIC)
                << "run through tools/dlp-sandbox --device with the stand-in";
        stateDirectory_ = directory;
        for (const auto& entry : std::filesystem::directory_iterator(stateDirectory_)) {
            const std::string name = entry.path().filename();
            if (name == "opens" || name == "requests" || name == "fail" ||
                name.rfind("lock.", 0) == 0 || name.rfind("extensions.", 0) == 0) {
                std::filesystem::remove(entry.path());
            }
        }
        descriptorsBefore_ = openDescriptorCount();
    }

    void TearDown() override {
        EXPECT_EQ(openDescriptorCount(), descriptorsBefore_) << "a descriptor was left open";
    }

    std::optional<std::string> deviceState(const std::string& name) const {
        std::ifstream file(stateDirectory_ + "/" + name, std::ios::binary);
        if (!file) return std::nullopt;
        return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
    }

    std::vector<std::string> stateLines(const std::string& name) const {
        std::vector<std::string> lines;
        std::ifstream file(stateDirectory_ + "/" + name);
        for (std::string line; std::getline(file, line);) lines.push_back(line);
        return lines;
    }

    std::vector<std::string> receivedRequests() const { return stateLines("requests"); }

    // The access mode of every open that reached the device.
    std::vector<std::string> deviceOpens() const { return stateLines("opens"); }

    void failRequests(const std::string& lines) const {
        std::ofstream(stateDirectory_ + "/fail") << lines;
    }

    LogCapture log_;
    std::string stateDirectory_;
    size_t descriptorsBefore_ = 0;
};

TEST_F(DlpDeviceTest, LockAndUnlockSendTheIdAsFourLittleEndianBytes) {
    EXPECT_EQ(lock_dlp(0x01020304), 0);
    EXPECT_EQ(deviceState("lock.16909060"), "1");
    EXPECT_EQ(unlock_dlp(0x01020304), 0);
    EXPECT_EQ(deviceState("lock.16909060"), "0");
    EXPECT_EQ(lock_dlp(-2), 0);
    EXPECT_EQ(deviceState("lock.-2"), "1");

    EXPECT_EQ(receivedRequests(),
              (std::vector<std::string>{requestLine(kLockEnable, littleEndian(0x01020304)),
                                        requestLine(kLockDisable, littleEndian(0x01020304)),
                                        requestLine(kLockEnable, littleEndian(-2))}));
    EXPECT_EQ(receivedRequests()[2], "0x40047801 feffffff");
    EXPECT_EQ(deviceOpens(), readOnlyOpens(3));
    expectRecords(log_, {mainError("DLP_LIBDLP :  lock_dlp : for 16909060\n"),
                         mainError("DLP_LIBDLP :  unlock_dlp : for 16909060\n"),
                         mainError("DLP_LIBDLP :  lock_dlp : for -2\n")});
}

TEST_F(DlpDeviceTest, SetDlpExtensionSendsTheIdAndTheZeroFilledText) {
    EXPECT_EQ(set_dlp_extension(0x0a0b0c0d, "pdf,docx,xlsx"), 0);
    EXPECT_EQ(deviceState("extensions.168496141"), "pdf,docx,xlsx");
    EXPECT_EQ(set_dlp_extension(3, ""), 0);
    EXPECT_EQ(deviceState("extensions.3"), "");

    const std::vector<std::string> requests = receivedRequests();
    ASSERT_EQ(requests.size(), 2u);
    EXPECT_EQ(requests[0],
              requestLine(kExtensionSet, extensionRecord(0x0a0b0c0d, "pdf,docx,xlsx")));
    EXPECT_EQ(requests[0].substr(0, 47), "0x43f07803 0d0c0b0a7064662c646f63782c786c737800");
    EXPECT_EQ(requests[1], requestLine(kExtensionSet, extensionRecord(3, "")));
    EXPECT_EQ(deviceOpens(), readOnlyOpens(2));
    // No message on success.
    expectRecords(log_, {});
}

TEST_F(DlpDeviceTest, SetDlpExtensionAcceptsAtMostOneThousandBytesOfText) {
    const std::string longest = patternText(1000);
    EXPECT_EQ(set_dlp_extension(7, longest.c_str()), 0);
    EXPECT_EQ(deviceState("extensions.7"), longest);
    std::vector<std::string> requests = receivedRequests();
    ASSERT_EQ(requests.size(), 1u);
    EXPECT_EQ(requests[0], requestLine(kExtensionSet, extensionRecord(7, longest)));
    EXPECT_EQ(requests[0].size(), kRequestLinePrefixSize + 2 * kExtensionRecordSize);
    EXPECT_EQ(requests[0].substr(kRequestLinePrefixSize + 2 * 1004), "00000000")
            << "bytes 1004 to 1007";
    expectRecords(log_, {});

    const std::string tooLong = longest + "x";
    EXPECT_EQ(set_dlp_extension(7, tooLong.c_str()), -1);
    expectRecords(log_, {mainError("DLP_LIBDLP :  Extension length exceeds defined length")});
    EXPECT_EQ(receivedRequests().size(), 1u) << "the refused text reached the device";
    // The device is opened before the text is measured.
    EXPECT_EQ(deviceOpens(), readOnlyOpens(2));
    EXPECT_EQ(deviceState("extensions.7"), longest);
}

TEST_F(DlpDeviceTest, RefusedRequestsFailWithTheDeviceError) {
    failRequests("0x43f07803 1\n0x40047801 5\n0x40047802 16\n");

    EXPECT_EQ(set_dlp_extension(1, "pdf"), -1);
    EXPECT_EQ(lock_dlp(2), -1);
    EXPECT_EQ(unlock_dlp(3), -1);

    expectRecords(log_,
                  {mainError("DLP_LIBDLP :  DLP_EXTENSION_SET failed: Operation not permitted\n"),
                   mainError("DLP_LIBDLP :  lock_dlp : for 2\n"),
                   mainError("DLP_LIBDLP :  DLP_LOCK_ENABLE failed: Input/output error\n"),
                   mainError("DLP_LIBDLP :  unlock_dlp : for 3\n"),
                   mainError("DLP_LIBDLP :  DLP_LOCK_DISABLE failed: Device or resource busy\n")});
    EXPECT_EQ(receivedRequests(),
              (std::vector<std::string>{requestLine(kExtensionSet, extensionRecord(1, "pdf")),
                                        requestLine(kLockEnable, littleEndian(2)),
                                        requestLine(kLockDisable, littleEndian(3))}));
    EXPECT_EQ(deviceOpens(), readOnlyOpens(3));
    EXPECT_EQ(deviceState("extensions.1"), std::nullopt);
    EXPECT_EQ(deviceState("lock.2"), std::nullopt);
    EXPECT_EQ(deviceState("lock.3"), std::nullopt);
}

TEST_F(DlpDeviceTest, MissingDeviceNodeFailsEveryCall) {
    const std::string tooLong = patternText(1001);
    {
        DeviceNodeRemoved noDevice;
        ASSERT_TRUE(noDevice.removed()) << noDevice.error();
        const int accessResult = access(kDevicePath, F_OK);
        const int accessError = errno;
        ASSERT_EQ(accessResult, -1);
        ASSERT_EQ(accessError, ENOENT);

        EXPECT_EQ(set_dlp_extension(1, "pdf"), -1);
        // An unreachable device is reported first, even for an over-long text.
        EXPECT_EQ(set_dlp_extension(1, tooLong.c_str()), -1);
        EXPECT_EQ(lock_dlp(2), -1);
        EXPECT_EQ(unlock_dlp(3), -1);
    }
    expectRecords(log_,
                  {kCannotOpen, kCannotOpen, mainError("DLP_LIBDLP :  lock_dlp : for 2\n"),
                   kCannotOpen, mainError("DLP_LIBDLP :  unlock_dlp : for 3\n"), kCannotOpen});
    EXPECT_EQ(deviceOpens(), std::vector<std::string>{});
    EXPECT_EQ(receivedRequests(), std::vector<std::string>{});
}

TEST_F(DlpDeviceTest, NullExtensionTextIsRefusedBeforeTheDeviceIsOpened) {
    EXPECT_EQ(set_dlp_extension(1, nullptr), -1);
    expectRecords(log_, {mainError("DLP_LIBDLP :  Extension list is null")});
    EXPECT_EQ(deviceOpens(), std::vector<std::string>{});
    EXPECT_EQ(receivedRequests(), std::vector<std::string>{});
}

}  // namespace
}  // namespace dlp::test
