#pragma once

#include <istream>
#include <string>

// Applies the trace read from `input` line by line and prints one line per applied trace line;
// `traceName` names it in messages. With `echoComments`, a line that holds only a comment is
// printed as it stands. Exit status: 0 when every line was applied and met its expectation, 1
// when one was not, 2 when a malformed line stopped the replay.
int replayTrace(std::istream& input, const std::string& traceName, bool echoComments);
