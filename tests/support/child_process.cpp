#include "support/child_process.h"

#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <stdexcept>

extern char** environ;

namespace dlp::test {

ChildProcess::ChildProcess(const std::string& name) {
    std::string argument0 = name, duration = "1000";
    char* argv[] = {argument0.data(), duration.data(), nullptr};
    if (posix_spawn(&pid_, "/bin/sleep", nullptr, nullptr, argv, environ) != 0) {
        throw std::runtime_error("cannot start /bin/sleep");
    }
    // Until the kernel has built the child's stack its command line reads empty: wait for it.
    std::string commandLine = "/proc/" + std::to_string(pid_) + "/cmdline";
    for (int attempt = 0; attempt < 10000; ++attempt) {
        if (std::ifstream(commandLine).get() != std::ifstream::traits_type::eof()) return;
        usleep(1000);
    }
    throw std::runtime_error("child " + std::to_string(pid_) + " never showed its command line");
}

ChildProcess::~ChildProcess() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
}

void ChildProcess::killWithoutReaping() {
    kill(pid_, SIGKILL);
    siginfo_t info{};
    waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
}

}  // namespace dlp::test
