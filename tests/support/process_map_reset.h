#pragma once

namespace dlp::test {

// Brings the process map back to its state right after load.
void resetProcessMap();

}  // namespace dlp::test
