#pragma once

#include <dlp_sdk/process_map.h>

namespace dlp::test {

// Brings the process map back to its state right after load.
inline void resetProcessMap() {
    mProcessMap.mExtensionList.clear();
    mProcessMap.mRejectList.clear();
    mProcessMap.mLogState = 0;
    mProcessMap.mFileManagerPid = -1;
    HashMap::mInternalProcessMap.clear();
    HashMap::mPendingInodeMap.clear();
    HashMap::mMapIterator = HashMap::mInternalProcessMap.end();
}

// A freshly loaded process map for as long as it lives, and again after.
struct FreshProcessMap {
    FreshProcessMap() { resetProcessMap(); }
    ~FreshProcessMap() { resetProcessMap(); }
};

}  // namespace dlp::test
