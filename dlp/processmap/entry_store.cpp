#include "processmap/entry_store.h"

#include "primitives/platform_log.h"
#include "primitives/process_name.h"
#include "processmap/extension_rules.h"
#include "processmap/process_map_internal.h"

bool HashMap::put(int key, MapEntry value) {
    DLP_SYSTEM_DEBUG(
            "DLP_LIBDLP : <HashMap::put> key[%d], value.pid[%d], value.expiry[%d], "
            "value.extension[%s], value.value_opentime[%d]",
            key, value.value_pid, static_cast<int>(value.value_expiry),
            value.value_extension.c_str(), static_cast<int>(value.value_opentime));
    if (value.value_expiry < 0) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <HashMap::put> expiry is less than 0[%d]. ignoring add to map",
                static_cast<int>(value.value_expiry));
        return false;
    }
    if (!dlp::isProtectedExtension(*this, value.value_extension)) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <HashMap::put> extension passed is not valid. ignoring add to map");
        return false;
    }
    auto slot = mInternalProcessMap.find(key);
    mMapIterator = slot;
    if (slot == mInternalProcessMap.end()) {
        mInternalProcessMap.emplace(key, std::vector<MapEntry>{std::move(value)});
        return true;
    }
    // One entry per extension, the most recently stored last.
    std::vector<MapEntry>& entries = slot->second;
    for (auto entry = entries.begin(); entry != entries.end(); ++entry) {
        if (entry->value_extension == value.value_extension) {
            entries.erase(entry);
            break;
        }
    }
    entries.push_back(std::move(value));
    return true;
}

MapEntry HashMap::get(int key, std::string extension) {
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <HashMap::get> key[%d], value.value_extension[%s]", key,
                     extension.c_str());
    if (!dlp::isProtectedExtension(*this, extension)) return dlp::emptyMapEntry();
    mMapIterator = mInternalProcessMap.find(key);
    if (mMapIterator == mInternalProcessMap.end()) {
        DLP_SYSTEM_DEBUG("DLP_LIBDLP : <HashMap::get> record with key[%d] not found.", key);
        return dlp::emptyMapEntry();
    }
    const std::vector<MapEntry>& entries = mMapIterator->second;

    // A zip that the file manager opened last is what it is unpacking or copying now.
    char name[dlp::kProcessNameBufferSize];
    if (entries.back().value_extension == std::string_view("zip") &&
        dlp::readProcessName(key, name) == FILE_MANAGER_PACKAGE) {
        MapEntry result = entries.back();
        result.value_extension = dlp::kUnpackedFromZipExtension;
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::get> zip file is opened in Filbrook most recently with "
                "expiry [%d]. Return this.",
                static_cast<int>(result.value_expiry));
        return result;
    }

    for (const MapEntry& entry : entries) {
        if (entry.value_extension == extension) {
            DLP_SYSTEM_DEBUG(
                    "DLP_LIBDLP : <HashMap::get> record with extension found. with expiry [%d]",
                    static_cast<int>(entry.value_expiry));
            return entry;
        }
    }

    int index = dlp::relatedEntryIndex(*this, extension, entries);
    if (index != dlp::kNoEntryIndex) {
        const MapEntry& result = entries[index];
        DLP_SYSTEM_DEBUG(
                "DLP_LIBDLP : <HashMap::get> extension not matching with [%s]. returning last "
                "matching entry [%s][%d]",
                extension.c_str(), result.value_extension.c_str(),
                static_cast<int>(result.value_expiry));
        return result;
    }
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <HashMap::get> record with key[%d] found but ext[%s] not found",
                     key, extension.c_str());
    return dlp::emptyMapEntry();
}

bool HashMap::remove(int key) {
    DLP_SYSTEM_DEBUG("DLP_LIBDLP : <HashMap::remove> key[%d]", key);
    auto slot = mInternalProcessMap.find(key);
    if (slot != mInternalProcessMap.end()) mInternalProcessMap.erase(slot);
    // Never left on an erased element.
    mMapIterator = mInternalProcessMap.end();
    mRejectList.erase(key);
    if (mFileManagerPid == key) mFileManagerPid = dlp::kNoPid;
    return true;
}

MapEntry HashMap::getLastOpenedEntry(int pid) {
    mMapIterator = mInternalProcessMap.find(pid);
    if (mMapIterator == mInternalProcessMap.end()) return dlp::emptyMapEntry();
    return mMapIterator->second.back();
}
