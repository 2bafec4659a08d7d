#pragma once

#include <dlp_sdk/process_map.h>

#include <string>

// Apps whose processes the expiry rules treat specially, recognised by process name.
extern const std::string FILE_MANAGER_PACKAGE;
extern const std::string GALLERY_PACKAGE;
extern const std::string HANCOM_OFFICE_PACKAGE;

// What lookups hand back when they have no entry to offer.
inline MapEntry emptyMapEntry() {
    return MapEntry{-1, "no_extension", -1, -1};
}
