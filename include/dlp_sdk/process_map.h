#pragma once

#include <map>
#include <string>
#include <vector>

#include <dlp_sdk/export.h>

// One protected file that one process has opened. The empty entry has pid -1, extension
// "no_extension", expiry -1 and open time -1.
struct MapEntry {
    int value_pid;
    std::string value_extension;
    long value_expiry;    // seconds since the epoch
    long value_opentime;  // seconds since the epoch
};

class HashMap {
  public:
    HashMap();

    // Extension lists and groups.
    int isValidExtension(std::string extension);
    int addExtension(std::string extension);
    DLP_EXPORT void makeExtensionGroups();
    DLP_EXPORT int getValidMapEntryIndexForExt(std::string extension,
                                               std::vector<MapEntry> entries);

    // Entries of opened files, per pid.
    bool put(int key, MapEntry value);
    MapEntry get(int key, std::string extension);
    bool remove(int key);
    MapEntry getLastOpenedEntry(int pid);

    // Process classification.
    bool isRejectedPid(int pid, MapEntry entry);
    bool isWhitelistedProcess(std::string processName, MapEntry entry);
    void checkAndDeleteProcessEntry(MapEntry entry);

    bool addPendingInode(unsigned long inode, int pid);

    std::vector<std::string> mDefaultExtensions;
    std::vector<std::string> mExtensionList;
    std::map<std::string, std::vector<std::string>> mExtensionGroups;
    std::map<int, std::string> mRejectList;
    int mLogState;
    int mFileManagerPid;

    DLP_EXPORT static std::map<int, std::vector<MapEntry>> mInternalProcessMap;
    DLP_EXPORT static std::map<unsigned long, int> mPendingInodeMap;
    DLP_EXPORT static std::map<int, std::vector<MapEntry>>::iterator mMapIterator;
};

// The one process map of the library.
DLP_EXPORT extern HashMap mProcessMap;

// The audit-log state last set by command 6; 0 after load.
DLP_EXPORT int getDLPAuditLogState();

// Splits `list` at every `delimiter`; empty tokens are kept.
DLP_EXPORT std::vector<std::string> getExtensions(const char* list, char delimiter);
