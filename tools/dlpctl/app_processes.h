#pragma once

#include <sys/types.h>

#include <map>
#include <memory>
#include <string>

#include "named_process.h"

// The app processes that a trace declares, each standing in for a pid that the trace names. All
// still running die with this object.
class AppProcesses {
  public:
    // Starts the child that stands for `tracePid`: its real pid, or -1 and the reason in `error`.
    pid_t start(int tracePid, const std::string& name, std::string& error);
    // Kills and reaps the child of `tracePid`; false when it has none running.
    bool stop(int tracePid);
    // The real pid that stands for `tracePid`, or `tracePid` itself when no child was declared.
    int realPid(int tracePid) const;

  private:
    std::map<int, pid_t> realPids_;
    std::map<pid_t, std::unique_ptr<NamedProcess>> running_;
};
