#pragma once

#include <dlp_sdk/export.h>

#include <cstdint>

// Parks `pid` against `inode`; an inode already parked keeps its pid. False for inode 0 or a
// negative pid.
DLP_EXPORT bool putPendingInodeValue(uint64_t inode, int pid);

// The parked pid, -1 when none, 0 for inode 0.
DLP_EXPORT int getPidByInode(uint64_t inode);

// Drops the pair of `inode`. False for inode 0 only.
DLP_EXPORT bool clearPendingInode(uint64_t inode);
