#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include <dlp_sdk/export.h>

// Inside the library these mark what its lock guards, for clang's thread-safety analysis; to
// everyone else they mean nothing.
#ifdef DLP_SDK_BUILDING_LIBRARY
#include "primitives/library_lock.h"
#define DLP_GUARDED_BY_LIBRARY_LOCK GUARDED_BY(::dlp::libraryLock)
#define DLP_REQUIRES_LIBRARY_LOCK REQUIRES(::dlp::libraryLock)
#define DLP_EXCLUDES_LIBRARY_LOCK EXCLUDES(::dlp::libraryLock)
#else
#define DLP_GUARDED_BY_LIBRARY_LOCK
#define DLP_REQUIRES_LIBRARY_LOCK
#define DLP_EXCLUDES_LIBRARY_LOCK
#endif

// One protected file that one process has opened. The empty entry has pid -1, extension
// "no_extension", expiry -1 and open time -1.
struct MapEntry {
    int value_pid;
    std::string value_extension;
    int64_t value_expiry;    // seconds since the epoch
    int64_t value_opentime;  // seconds since the epoch
};

// The members that are not exported are the library's own; they run under its lock.
class HashMap {
  public:
    HashMap();

    // Extension lists and groups.
    int isValidExtension(std::string extension) DLP_REQUIRES_LIBRARY_LOCK;
    int addExtension(std::string extension) DLP_REQUIRES_LIBRARY_LOCK;
    DLP_EXPORT void makeExtensionGroups() DLP_EXCLUDES_LIBRARY_LOCK;
    DLP_EXPORT int getValidMapEntryIndexForExt(std::string extension, std::vector<MapEntry> entries)
            DLP_EXCLUDES_LIBRARY_LOCK;

    // Entries of opened files, per pid.
    bool put(int key, MapEntry value) DLP_REQUIRES_LIBRARY_LOCK;
    MapEntry get(int key, std::string extension) DLP_REQUIRES_LIBRARY_LOCK;
    bool remove(int key) DLP_REQUIRES_LIBRARY_LOCK;
    MapEntry getLastOpenedEntry(int pid) DLP_REQUIRES_LIBRARY_LOCK;

    // Process classification.
    bool isRejectedPid(int pid, MapEntry entry) DLP_REQUIRES_LIBRARY_LOCK;
    bool isWhitelistedProcess(std::string processName, MapEntry entry) DLP_REQUIRES_LIBRARY_LOCK;
    void checkAndDeleteProcessEntry(MapEntry entry) DLP_REQUIRES_LIBRARY_LOCK;

    bool addPendingInode(uint64_t inode, int pid) DLP_REQUIRES_LIBRARY_LOCK;

    std::vector<std::string> mDefaultExtensions;
    std::vector<std::string> mExtensionList DLP_GUARDED_BY_LIBRARY_LOCK;
    std::map<std::string, std::vector<std::string>> mExtensionGroups DLP_GUARDED_BY_LIBRARY_LOCK;
    std::map<int, std::string> mRejectList DLP_GUARDED_BY_LIBRARY_LOCK;
    int mLogState DLP_GUARDED_BY_LIBRARY_LOCK;
    int mFileManagerPid DLP_GUARDED_BY_LIBRARY_LOCK;

    DLP_EXPORT static std::map<int, std::vector<MapEntry>> mInternalProcessMap
            DLP_GUARDED_BY_LIBRARY_LOCK;
    DLP_EXPORT static std::map<uint64_t, int> mPendingInodeMap DLP_GUARDED_BY_LIBRARY_LOCK;
    DLP_EXPORT static std::map<int, std::vector<MapEntry>>::iterator mMapIterator
            DLP_GUARDED_BY_LIBRARY_LOCK;
};

// The one process map of the library.
DLP_EXPORT extern HashMap mProcessMap;

// The audit-log state last set by command 6; 0 after load.
DLP_EXPORT int getDLPAuditLogState();

// Splits `list` at every `delimiter`; empty tokens are kept.
DLP_EXPORT std::vector<std::string> getExtensions(const char* list, char delimiter);
