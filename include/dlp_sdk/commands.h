#pragma once

#include <dlp_sdk/export.h>

// Runs one command vector: argv[1] is the command number (1 to 6), argv[2] onward its arguments.
// 0 on success, negative or the failing store's result otherwise.
DLP_EXPORT int handleDLPCommands(int argc, char** argv);
