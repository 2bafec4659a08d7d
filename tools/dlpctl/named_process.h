#pragma once

#include <sys/types.h>

#include <string>

// A sleeping child whose argv[0] is `name`, as an app process carries its package name. It dies
// with this object, and with the program that started it on every road, a signal included.
class NamedProcess {
  public:
    // Returns once the child shows its name; pid() is -1 and error() says why when it cannot.
    explicit NamedProcess(const std::string& name);
    ~NamedProcess();
    NamedProcess(const NamedProcess&) = delete;
    NamedProcess& operator=(const NamedProcess&) = delete;

    pid_t pid() const { return pid_; }
    const std::string& error() const { return error_; }
    // Kills the child and leaves it a zombie, whose command line reads empty.
    void killWithoutReaping();

  private:
    pid_t pid_ = -1;
    std::string error_;
};
