#include "support/library_lock_probe.h"

#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <fstream>
#include <string>
#include <thread>

#include "primitives/library_lock.h"

namespace dlp::test {

bool waitsForLibraryLock(const std::function<void()>& call,
                         const std::function<void()>& whileHeld) {
    dlp::libraryLock.lock();
    std::atomic<bool> started{false}, finished{false};
    char task[64] = {};
    std::thread caller([&] {
        readlink("/proc/thread-self", task, sizeof(task) - 1);
        started = true;
        call();
        finished = true;
    });
    while (!started) std::this_thread::yield();
    // No clock: the caller either finishes or sleeps in the kernel on the held lock.
    const std::string futex = std::to_string(SYS_futex);
    std::string syscall;
    while (!finished && syscall != futex) {
        std::this_thread::yield();
        std::ifstream status(std::string("/proc/") + task + "/syscall");
        if (!status) {
            ADD_FAILURE() << "cannot watch thread " << task;
            break;
        }
        status >> syscall;
    }
    bool waited = !finished;
    if (waited) whileHeld();
    dlp::libraryLock.unlock();
    caller.join();
    return waited;
}

}  // namespace dlp::test
