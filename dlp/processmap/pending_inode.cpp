#include <dlp_sdk/pending_inode.h>

#include "primitives/library_lock.h"
#include "primitives/platform_log.h"
#include "processmap/process_map_internal.h"

namespace {

constexpr int kNotParked = -1;

}  // namespace

bool HashMap::addPendingInode(uint64_t inode, int pid) {
    // The first pid parked for an inode stays.
    mPendingInodeMap.emplace(inode, pid);
    return true;
}

bool putPendingInodeValue(uint64_t inode, int pid) {
    if (inode == 0 || pid < 0) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <putPendingInodeValue> Invalid parameter inode/pid. Return false");
        return false;
    }
    dlp::LibraryLockGuard guard;
    return mProcessMap.addPendingInode(inode, pid);
}

int getPidByInode(uint64_t inode) {
    if (inode == 0) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <getPidByInode> Invalid parameter inode. Return false");
        return 0;
    }
    dlp::LibraryLockGuard guard;
    auto pair = HashMap::mPendingInodeMap.find(inode);
    return pair == HashMap::mPendingInodeMap.end() ? kNotParked : pair->second;
}

bool clearPendingInode(uint64_t inode) {
    if (inode == 0) return false;
    dlp::LibraryLockGuard guard;
    HashMap::mPendingInodeMap.erase(inode);
    return true;
}
