#include "named_process.h"

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace {

constexpr int kCommandLineAttempts = 5000;
constexpr useconds_t kCommandLinePollMicroseconds = 1000;

void killAndReap(pid_t pid) {
    kill(pid, SIGKILL);
    while (waitpid(pid, nullptr, 0) < 0 && errno == EINTR) {
    }
}

bool hasCommandLine(pid_t pid) {
    std::string path = "/proc/" + std::to_string(pid) + "/cmdline";
    android::base::unique_fd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    char first = 0;
    return file.ok() && read(file.get(), &first, 1) == 1;
}

// The child's pid once it runs /bin/sleep, or -1 with the reason in `error`.
pid_t startSleeper(const std::string& name, std::string& error) {
    std::string nameCopy = name;
    char infinity[] = "infinity";
    char* argv[] = {nameCopy.data(), infinity, nullptr};
    int pipeEnds[2];
    if (pipe2(pipeEnds, O_CLOEXEC) != 0) {
        error = strerror(errno);
        return -1;
    }
    android::base::unique_fd execReport(pipeEnds[0]);
    android::base::unique_fd execReportWriter(pipeEnds[1]);
    // The child must not hold this program's output open, or a reader would wait for it too.
    android::base::unique_fd nowhere(open("/dev/null", O_RDWR | O_CLOEXEC));
    if (!nowhere.ok()) {
        error = strerror(errno);
        return -1;
    }
    pid_t parent = getpid();
    pid_t child = fork();
    if (child == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        for (int standard = 0; standard < 3; ++standard) dup2(nowhere.get(), standard);
        if (getppid() == parent) execv("/bin/sleep", argv);
        int execError = errno;
        ssize_t ignored = write(execReportWriter.get(), &execError, sizeof(execError));
        (void)ignored;
        _exit(127);
    }
    if (child < 0) {
        error = strerror(errno);
        return -1;
    }
    execReportWriter.reset();
    // The pipe closes at a successful exec; a failed one sends its errno first.
    int execError = 0;
    ssize_t length;
    do {
        length = read(execReport.get(), &execError, sizeof(execError));
    } while (length < 0 && errno == EINTR);
    if (length > 0) {
        killAndReap(child);
        error = std::string("cannot run /bin/sleep: ") + strerror(execError);
        return -1;
    }
    return child;
}

}  // namespace

NamedProcess::NamedProcess(const std::string& name) {
    pid_t child = startSleeper(name, error_);
    if (child < 0) return;
    // Right after the exec the kernel may still build the new stack: the command line reads
    // empty until then, and the library would not know the app yet.
    for (int attempt = 0; !hasCommandLine(child); ++attempt) {
        if (attempt == kCommandLineAttempts) {
            killAndReap(child);
            error_ = "the child never showed its command line";
            return;
        }
        usleep(kCommandLinePollMicroseconds);
    }
    pid_ = child;
}

NamedProcess::~NamedProcess() {
    if (pid_ > 0) killAndReap(pid_);
}

void NamedProcess::killWithoutReaping() {
    kill(pid_, SIGKILL);
    siginfo_t info{};
    waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
}
