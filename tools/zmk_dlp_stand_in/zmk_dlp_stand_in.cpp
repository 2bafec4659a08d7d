// Stands in for the kernel DLP device: serves one regular file over FUSE, mounted straight onto
// the device node, so that the library's real open and ioctl calls reach this program.
//
// Usage: zmk_dlp_stand_in [--state-directory DIRECTORY] MOUNTPOINT
// The state directory defaults to $DLP_DEVICE_STATE, else /run/zmk_dlp. It holds:
//   opens            one line per open: its access mode, "O_RDONLY", "O_WRONLY" or "O_RDWR"
//   requests         one line per ioctl received: "0x%08x <argument bytes as lowercase hex>\n"
//   fail             written by tests: each line "0x%08x <errno>" makes that request fail with
//                    that errno (still recorded); unknown requests fail with ENOTTY
//   lock.<id>        "1" after a lock, "0" after an unlock
//   extensions.<id>  the last extension text, up to its first zero byte
// Prints "ready" on stdout once mounted; stops on SIGTERM, SIGINT, SIGHUP or an unmount.

#define FUSE_USE_VERSION 35
#include <fuse_lowlevel.h>

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>
#include <sstream>
#include <string>

namespace {

constexpr unsigned int kLockEnable = 0x40047801;
constexpr unsigned int kLockDisable = 0x40047802;
constexpr unsigned int kExtensionSet = 0x43F07803;
constexpr size_t kIdSize = 4;
constexpr size_t kExtensionRecordSize = 1008;
constexpr const char* kDefaultStateDirectory = "/run/zmk_dlp";

using android::base::unique_fd;

std::string stateDirectory;

std::string statePath(const std::string& name) {
    return stateDirectory + "/" + name;
}

bool writeAll(int fd, const std::string& text) {
    size_t written = 0;
    while (written < text.size()) {
        ssize_t result = write(fd, text.data() + written, text.size() - written);
        if (result < 0 && errno == EINTR) continue;
        if (result <= 0) return false;
        written += static_cast<size_t>(result);
    }
    return true;
}

bool appendToStateFile(const std::string& name, const std::string& text) {
    unique_fd file(open(statePath(name).c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644));
    if (!file.ok() || !writeAll(file.get(), text)) {
        fprintf(stderr, "zmk_dlp_stand_in: cannot append to %s: %s\n", statePath(name).c_str(),
                strerror(errno));
        return false;
    }
    return true;
}

// Replaced as a whole, so a reader never sees a half-written state.
bool replaceStateFile(const std::string& name, const std::string& text) {
    const std::string path = statePath(name);
    const std::string temporaryPath = statePath("." + name + ".new");
    {
        unique_fd file(open(temporaryPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644));
        if (!file.ok() || !writeAll(file.get(), text)) {
            fprintf(stderr, "zmk_dlp_stand_in: cannot write %s: %s\n", temporaryPath.c_str(),
                    strerror(errno));
            return false;
        }
    }
    if (rename(temporaryPath.c_str(), path.c_str()) != 0) {
        fprintf(stderr, "zmk_dlp_stand_in: cannot replace %s: %s\n", path.c_str(), strerror(errno));
        return false;
    }
    return true;
}

std::optional<std::string> readStateFile(const std::string& name) {
    unique_fd file(open(statePath(name).c_str(), O_RDONLY | O_CLOEXEC));
    if (!file.ok()) return std::nullopt;
    std::string content;
    char buffer[4096];
    ssize_t result;
    while ((result = read(file.get(), buffer, sizeof buffer)) != 0) {
        if (result < 0 && errno == EINTR) continue;
        if (result < 0) return std::nullopt;
        content.append(buffer, static_cast<size_t>(result));
    }
    return content;
}

// The errno that the `fail` file asks for this request, or 0.
int requestedFailure(unsigned int request) {
    std::optional<std::string> failures = readStateFile("fail");
    if (!failures) return 0;
    std::istringstream lines(*failures);
    std::string line;
    while (std::getline(lines, line)) {
        std::istringstream fields(line);
        std::string requestText;
        int error = 0;
        if (!(fields >> requestText)) continue;
        char* end = nullptr;
        unsigned long failingRequest = strtoul(requestText.c_str(), &end, 16);
        if (*end != '\0' || !(fields >> error) || error <= 0) {
            fprintf(stderr, "zmk_dlp_stand_in: ignoring fail line \"%s\"\n", line.c_str());
            continue;
        }
        if (failingRequest == request) return error;
    }
    return 0;
}

std::string hexBytes(const uint8_t* bytes, size_t size) {
    static const char kDigits[] = "0123456789abcdef";
    std::string hex;
    hex.reserve(size * 2);
    for (size_t i = 0; i < size; ++i) {
        hex += kDigits[bytes[i] >> 4];
        hex += kDigits[bytes[i] & 0xf];
    }
    return hex;
}

int32_t littleEndianId(const uint8_t* bytes) {
    uint32_t value = static_cast<uint32_t>(bytes[0]) | static_cast<uint32_t>(bytes[1]) << 8 |
                     static_cast<uint32_t>(bytes[2]) << 16 | static_cast<uint32_t>(bytes[3]) << 24;
    return static_cast<int32_t>(value);
}

// 0, or the errno the caller's ioctl fails with.
int applyRequest(unsigned int request, const uint8_t* argument, size_t size) {
    switch (request) {
        case kLockEnable:
        case kLockDisable: {
            if (size != kIdSize) return EINVAL;
            const std::string name = "lock." + std::to_string(littleEndianId(argument));
            return replaceStateFile(name, request == kLockEnable ? "1" : "0") ? 0 : EIO;
        }
        case kExtensionSet: {
            if (size != kExtensionRecordSize) return EINVAL;
            const char* text = reinterpret_cast<const char*>(argument + kIdSize);
            const size_t textSize = strnlen(text, kExtensionRecordSize - kIdSize);
            const std::string name = "extensions." + std::to_string(littleEndianId(argument));
            return replaceStateFile(name, std::string(text, textSize)) ? 0 : EIO;
        }
        default:
            return ENOTTY;
    }
}

void handleIoctl(fuse_req_t fuseRequest, fuse_ino_t, unsigned int request, void*, fuse_file_info*,
                 unsigned, const void* input, size_t inputSize, size_t) {
    const uint8_t* argument = static_cast<const uint8_t*>(input);
    char requestText[16];
    snprintf(requestText, sizeof requestText, "0x%08x", request);
    if (!appendToStateFile("requests",
                           std::string(requestText) + " " + hexBytes(argument, inputSize) + "\n")) {
        fuse_reply_err(fuseRequest, EIO);
        return;
    }
    int error = requestedFailure(request);
    if (error == 0) error = applyRequest(request, argument, inputSize);
    if (error != 0) {
        fuse_reply_err(fuseRequest, error);
    } else {
        fuse_reply_ioctl(fuseRequest, 0, nullptr, 0);
    }
}

void handleGetattr(fuse_req_t fuseRequest, fuse_ino_t inode, fuse_file_info*) {
    if (inode != FUSE_ROOT_ID) {
        fuse_reply_err(fuseRequest, ENOENT);
        return;
    }
    struct stat attributes = {};
    attributes.st_ino = FUSE_ROOT_ID;
    attributes.st_mode = S_IFREG | 0600;
    attributes.st_nlink = 1;
    attributes.st_uid = getuid();
    attributes.st_gid = getgid();
    fuse_reply_attr(fuseRequest, &attributes, 0);
}

std::string accessModeName(int flags) {
    switch (flags & O_ACCMODE) {
        case O_RDONLY:
            return "O_RDONLY";
        case O_WRONLY:
            return "O_WRONLY";
        case O_RDWR:
            return "O_RDWR";
        default:
            return std::to_string(flags & O_ACCMODE);
    }
}

void handleOpen(fuse_req_t fuseRequest, fuse_ino_t, fuse_file_info* file) {
    if (!appendToStateFile("opens", accessModeName(file->flags) + "\n")) {
        fuse_reply_err(fuseRequest, EIO);
        return;
    }
    // Reads and writes reach this program (and fail), never a page cache.
    file->direct_io = 1;
    file->nonseekable = 1;
    fuse_reply_open(fuseRequest, file);
}

void handleRelease(fuse_req_t fuseRequest, fuse_ino_t, fuse_file_info*) {
    fuse_reply_err(fuseRequest, 0);
}

struct SessionDeleter {
    void operator()(fuse_session* session) const { fuse_session_destroy(session); }
};

struct ArgumentsDeleter {
    void operator()(fuse_args* arguments) const { fuse_opt_free_args(arguments); }
};

int usage(FILE* out, int status) {
    fprintf(out,
            "usage: zmk_dlp_stand_in [--state-directory DIRECTORY] MOUNTPOINT\n"
            "Serves the DLP device's three ioctl requests on MOUNTPOINT (a regular file, normally\n"
            "/dev/zmk_dlp inside tools/dlp-sandbox) and records them in DIRECTORY "
            "($DLP_DEVICE_STATE,\n"
            "else /run/zmk_dlp): opens, requests, lock.<id>, extensions.<id>; a file \"fail\" "
            "there,\n"
            "lines \"0x<request> <errno>\", makes requests fail. Prints \"ready\" once mounted.\n");
    return status;
}

}  // namespace

int main(int argc, char* argv[]) {
    const char* environmentDirectory = getenv("DLP_DEVICE_STATE");
    stateDirectory = environmentDirectory != nullptr && environmentDirectory[0] != '\0'
                             ? environmentDirectory
                             : kDefaultStateDirectory;
    const char* mountpoint = nullptr;
    for (int i = 1; i < argc; ++i) {
        if (strcmp(argv[i], "--help") == 0) return usage(stdout, 0);
        if (strcmp(argv[i], "--state-directory") == 0 && i + 1 < argc) {
            stateDirectory = argv[++i];
        } else if (argv[i][0] != '-' && mountpoint == nullptr) {
            mountpoint = argv[i];
        } else {
            return usage(stderr, 2);
        }
    }
    if (mountpoint == nullptr) return usage(stderr, 2);
    struct stat directory;
    if (stat(stateDirectory.c_str(), &directory) != 0 || !S_ISDIR(directory.st_mode)) {
        fprintf(stderr, "zmk_dlp_stand_in: %s is not a directory\n", stateDirectory.c_str());
        return 1;
    }

    fuse_lowlevel_ops operations = {};
    operations.getattr = handleGetattr;
    operations.open = handleOpen;
    operations.release = handleRelease;
    operations.ioctl = handleIoctl;

    fuse_args argumentStorage = FUSE_ARGS_INIT(0, nullptr);
    std::unique_ptr<fuse_args, ArgumentsDeleter> arguments(&argumentStorage);
    for (const char* argument :
         {static_cast<const char*>(argv[0]), "-o", "fsname=zmk_dlp_stand_in,subtype=zmk_dlp"}) {
        if (fuse_opt_add_arg(arguments.get(), argument) != 0) return 1;
    }
    std::unique_ptr<fuse_session, SessionDeleter> session(
            fuse_session_new(arguments.get(), &operations, sizeof operations, nullptr));
    if (!session) return 1;
    if (fuse_set_signal_handlers(session.get()) != 0) return 1;
    if (fuse_session_mount(session.get(), mountpoint) != 0) {
        fuse_remove_signal_handlers(session.get());
        return 1;
    }
    printf("ready\n");
    fflush(stdout);

    // Single-threaded: requests are handled, and their state written, one at a time.
    int result = fuse_session_loop(session.get());
    // The loop also ends when its mount goes; a stop asked for from then on must not kill a
    // stand-in that is ending already, once its handlers are gone.
    sigset_t stopSignals;
    sigemptyset(&stopSignals);
    for (int signal : {SIGHUP, SIGINT, SIGTERM}) sigaddset(&stopSignals, signal);
    sigprocmask(SIG_BLOCK, &stopSignals, nullptr);
    fuse_session_unmount(session.get());
    fuse_remove_signal_handlers(session.get());
    // A positive result is the signal that asked the loop to stop.
    return result < 0 ? 1 : 0;
}
