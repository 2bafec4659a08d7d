#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

namespace dlp::test {

// A sleeping child whose argv[0] is `name`, as an app process carries its package name. Killed
// and reaped on destruction.
class ChildProcess {
  public:
    explicit ChildProcess(const std::string& name, const std::vector<std::string>& arguments = {});
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    pid_t pid() const { return pid_; }
    // Kills the child and waits until it is a zombie, without reaping it.
    void killWithoutReaping();

  private:
    pid_t pid_ = -1;
};

// A pid that belongs to no process right now.
pid_t unusedPid();

}  // namespace dlp::test
