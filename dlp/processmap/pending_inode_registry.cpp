#include <dlp_sdk/pending_inode.h>

#include "primitives/library_lock.h"
#include "primitives/platform_log.h"
#include "processmap/hash_map.h"

bool HashMap::addPendingInode(unsigned long inode, int pid) {
    // The first pid parked for an inode stays.
    mPendingInodeMap.emplace(inode, pid);
    return true;
}

bool putPendingInodeValue(unsigned long inode, int pid) {
    auto lock = dlp::lockLibraryState();
    if (inode == 0 || pid < 0) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <putPendingInodeValue> Invalid parameter inode/pid. Return false");
        return false;
    }
    return mProcessMap.addPendingInode(inode, pid);
}

int getPidByInode(unsigned long inode) {
    auto lock = dlp::lockLibraryState();
    if (inode == 0) {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <getPidByInode> Invalid parameter inode. Return false");
        return 0;
    }
    auto pair = HashMap::mPendingInodeMap.find(inode);
    return pair == HashMap::mPendingInodeMap.end() ? -1 : pair->second;
}

bool clearPendingInode(unsigned long inode) {
    if (inode == 0) return false;
    auto lock = dlp::lockLibraryState();
    HashMap::mPendingInodeMap.erase(inode);
    return true;
}
