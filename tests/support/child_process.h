#pragma once

#include <sys/types.h>

#include <string>

namespace dlp::test {

// A sleeping child whose argv[0] is `name`, as an app process carries its package name; killed
// and reaped with this object.
class ChildProcess {
  public:
    explicit ChildProcess(const std::string& name);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    pid_t pid() const { return pid_; }
    // Kills the child and leaves it a zombie, whose command line reads empty.
    void killWithoutReaping();

  private:
    pid_t pid_ = -1;
};

}  // namespace dlp::test
