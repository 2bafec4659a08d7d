#include "support/child_process.h"

#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <stdexcept>

extern char** environ;

namespace dlp::test {

ChildProcess::ChildProcess(const std::string& name, const std::vector<std::string>& arguments) {
    std::vector<std::string> words{name};
    words.insert(words.end(), arguments.begin(), arguments.end());
    words.push_back("1000");  // sleep reads its last argument as the duration
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    if (posix_spawn(&pid_, "/bin/sleep", nullptr, nullptr, argv.data(), environ) != 0) {
        throw std::runtime_error("cannot start /bin/sleep");
    }
    // posix_spawn returns while the kernel still builds the child's new stack; until then its
    // command line reads empty. Wait for it (bounded), so the child can be named at once.
    std::string commandLine = "/proc/" + std::to_string(pid_) + "/cmdline";
    for (int attempt = 0; attempt < 10000; ++attempt) {
        if (std::ifstream(commandLine).get() != std::ifstream::traits_type::eof()) return;
        usleep(1000);
    }
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
    throw std::runtime_error("child " + std::to_string(pid_) + " never showed its command line");
}

ChildProcess::~ChildProcess() {
    if (pid_ <= 0) return;
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
}

void ChildProcess::killWithoutReaping() {
    kill(pid_, SIGKILL);
    siginfo_t info{};
    waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
}

pid_t unusedPid() {
    for (pid_t pid = 4000000; pid > 1; --pid) {
        if (kill(pid, 0) != 0 && errno == ESRCH) return pid;
    }
    return -1;
}

}  // namespace dlp::test
