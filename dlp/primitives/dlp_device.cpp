#include <dlp_sdk/dlp_device.h>

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <sys/ioctl.h>

#include <cerrno>
#include <cstdint>
#include <cstring>

#include "primitives/platform_log.h"

namespace {

constexpr const char* kDevicePath = "/dev/zmk_dlp";
constexpr size_t kExtensionTextSize = 1004;
constexpr size_t kLongestExtensionText = 1000;

struct ExtensionRecord {
    int32_t id;
    char text[kExtensionTextSize];
};
static_assert(sizeof(ExtensionRecord) == 1008, "the device reads a 1008-byte record");

constexpr unsigned long DLP_LOCK_ENABLE = _IOW('x', 1, int32_t);
constexpr unsigned long DLP_LOCK_DISABLE = _IOW('x', 2, int32_t);
constexpr unsigned long DLP_EXTENSION_SET = _IOW('x', 3, ExtensionRecord);
static_assert(DLP_LOCK_ENABLE == 0x40047801, "request number fixed by the driver");
static_assert(DLP_LOCK_DISABLE == 0x40047802, "request number fixed by the driver");
static_assert(DLP_EXTENSION_SET == 0x43F07803, "request number fixed by the driver");

android::base::unique_fd openDevice() {
    android::base::unique_fd device(open(kDevicePath, O_RDONLY | O_CLOEXEC));
    if (!device.ok()) DLP_PRIMITIVE_LOG("DLP_LIBDLP :  Can't open device file: %s\n", kDevicePath);
    return device;
}

int sendLockRequest(int id, unsigned long request, const char* requestName) {
    android::base::unique_fd device = openDevice();
    if (!device.ok()) return -1;
    int32_t argument = id;
    if (ioctl(device.get(), request, &argument) < 0) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :  %s failed: %s\n", requestName, strerror(errno));
        return -1;
    }
    return 0;
}

}  // namespace

int set_dlp_extension(int id, const char* extensions) {
    if (extensions == nullptr) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :  Extension list is null");
        return -1;
    }
    android::base::unique_fd device = openDevice();
    if (!device.ok()) return -1;
    size_t length = strlen(extensions);
    if (length > kLongestExtensionText) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :  Extension length exceeds defined length");
        return -1;
    }
    // Zero-filled beyond the text, so the device always finds a terminated text.
    ExtensionRecord record = {};
    record.id = id;
    memcpy(record.text, extensions, length);
    if (ioctl(device.get(), DLP_EXTENSION_SET, &record) < 0) {
        DLP_PRIMITIVE_LOG("DLP_LIBDLP :  DLP_EXTENSION_SET failed: %s\n", strerror(errno));
        return -1;
    }
    return 0;
}

int lock_dlp(int id) {
    DLP_PRIMITIVE_LOG("DLP_LIBDLP :  lock_dlp : for %d\n", id);
    return sendLockRequest(id, DLP_LOCK_ENABLE, "DLP_LOCK_ENABLE");
}

int unlock_dlp(int id) {
    DLP_PRIMITIVE_LOG("DLP_LIBDLP :  unlock_dlp : for %d\n", id);
    return sendLockRequest(id, DLP_LOCK_DISABLE, "DLP_LOCK_DISABLE");
}
