#pragma once

#include <string>

// True inside dlp-sandbox: there /data/system/users is a tmpfs of its own.
bool insideSandbox();

// This program's own path, "" when it cannot be read.
std::string programPath();

// dlp-sandbox next to this program, else in the source tree's tools/, else on PATH; "" when none.
std::string findSandbox();
