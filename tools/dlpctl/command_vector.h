#pragma once

#include <dlp_sdk/commands.h>

#include <string>
#include <utility>
#include <vector>

// One command vector as the file-event source sends it, `words` behind an argv[0] that the
// library does not read. Built once, so that running it again only dispatches.
class CommandVector {
  public:
    explicit CommandVector(std::vector<std::string> words) : words_(std::move(words)) {
        words_.insert(words_.begin(), "dlpctl");
        for (std::string& word : words_) argv_.push_back(word.data());
        argv_.push_back(nullptr);
    }
    int run() { return handleDLPCommands(static_cast<int>(words_.size()), argv_.data()); }

  private:
    std::vector<std::string> words_;
    std::vector<char*> argv_;
};

// Runs `words` once; the library's result.
inline int runCommandVector(std::vector<std::string> words) {
    return CommandVector(std::move(words)).run();
}
