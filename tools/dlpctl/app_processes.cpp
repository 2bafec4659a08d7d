#include "app_processes.h"

pid_t AppProcesses::start(int tracePid, const std::string& name, std::string& error) {
    auto process = std::make_unique<NamedProcess>(name);
    pid_t pid = process->pid();
    if (pid < 0) {
        error = process->error();
        return -1;
    }
    running_.emplace(pid, std::move(process));
    realPids_[tracePid] = pid;
    return pid;
}

bool AppProcesses::stop(int tracePid) {
    auto found = realPids_.find(tracePid);
    return found != realPids_.end() && running_.erase(found->second) != 0;
}

int AppProcesses::realPid(int tracePid) const {
    auto found = realPids_.find(tracePid);
    return found == realPids_.end() ? tracePid : found->second;
}
