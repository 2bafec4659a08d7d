#pragma once

#include <dlp_sdk/commands.h>

#include <string>
#include <vector>

namespace dlp::test {

// Runs one command vector as the file-event source sends it, behind argv[0], which is not read.
inline int runCommand(std::vector<std::string> words) {
    words.insert(words.begin(), "dlp");
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    return handleDLPCommands(static_cast<int>(words.size()), argv.data());
}

}  // namespace dlp::test
