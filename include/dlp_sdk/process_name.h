#pragma once

#include <string>

#include <dlp_sdk/export.h>

// The first argument of the process's command line (its package name for an app), or "???" when
// it cannot be read.
DLP_EXPORT std::string getProcessNameByPid(int pid);
