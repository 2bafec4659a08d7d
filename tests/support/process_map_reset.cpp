#include "support/process_map_reset.h"

#include <dlp_sdk/process_map.h>

namespace dlp::test {

void resetProcessMap() {
    mProcessMap.mExtensionList.clear();
    mProcessMap.mRejectList.clear();
    mProcessMap.mLogState = 0;
    mProcessMap.mFileManagerPid = -1;
    HashMap::mInternalProcessMap.clear();
    HashMap::mPendingInodeMap.clear();
    HashMap::mMapIterator = HashMap::mInternalProcessMap.end();
}

}  // namespace dlp::test
