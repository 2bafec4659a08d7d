#pragma once

#include <dlp_sdk/process_map.h>

#include <string>
#include <string_view>
#include <vector>

#include "primitives/library_lock.h"

namespace dlp {

// The extensions that are always protected, in the order `mDefaultExtensions` holds them.
extern const char* const kBuiltInExtensions[25];

// getValidMapEntryIndexForExt when no entry has a related extension.
constexpr int kNoEntryIndex = -2;

// HashMap::isValidExtension without a copy of the extension: it runs on every file open and
// create.
bool isProtectedExtension(const HashMap& map, std::string_view extension) REQUIRES(libraryLock);

// Command 5: the administrator's list becomes `extensions`, less duplicates and built-ins.
void replaceExtensionList(std::vector<std::string> extensions) REQUIRES(libraryLock);

// getValidMapEntryIndexForExt for callers that hold the lock, without copying the entries.
int relatedEntryIndex(const HashMap& map, const std::string& extension,
                      const std::vector<MapEntry>& entries) REQUIRES(libraryLock);

}  // namespace dlp
