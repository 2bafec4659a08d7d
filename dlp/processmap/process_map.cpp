#include "processmap/process_map_internal.h"

#include "processmap/extension_rules.h"

// Definition order is construction order; destruction runs the other way round.
HashMap mProcessMap;
std::map<int, std::vector<MapEntry>> HashMap::mInternalProcessMap;
std::map<int, std::vector<MapEntry>>::iterator HashMap::mMapIterator;
std::map<uint64_t, int> HashMap::mPendingInodeMap;

namespace {

// Built last, so destroyed first: from then on the lock stays taken, and a thread still calling
// in while the process exits waits for the end instead of reaching the state destroyed above.
struct LockedAtExit {
    ~LockedAtExit() NO_THREAD_SAFETY_ANALYSIS { dlp::libraryLock.lock(); }
} lockedAtExit;

}  // namespace

HashMap::HashMap() : mLogState(0), mFileManagerPid(dlp::kNoPid) {
    for (const char* extension : dlp::kBuiltInExtensions) mDefaultExtensions.push_back(extension);
    makeExtensionGroups();
}

int getDLPAuditLogState() {
    dlp::LibraryLockGuard guard;
    return mProcessMap.mLogState;
}

namespace dlp {

void setAuditLogState(int logState) {
    mProcessMap.mLogState = logState;
}

}  // namespace dlp
