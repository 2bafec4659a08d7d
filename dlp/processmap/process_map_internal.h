#pragma once

#include <dlp_sdk/process_map.h>

#include <string_view>

#include "primitives/expiry_time.h"
#include "primitives/library_lock.h"

// Apps whose processes the expiry rules treat specially, recognised by process name. Constants
// without a destructor, so a call racing the process's exit still finds them.
constexpr std::string_view FILE_MANAGER_PACKAGE = "com.vux.android.app.filbrook";
constexpr std::string_view GALLERY_PACKAGE = "com.vux.android.gallery3d";
constexpr std::string_view HANCOM_OFFICE_PACKAGE = "com.hancom.office";

namespace dlp {

// `mFileManagerPid` when no file-manager process is recorded.
constexpr int kNoPid = -1;

// What lookups hand back when they have no entry to offer.
inline MapEntry emptyMapEntry() {
    return MapEntry{kNoPid, "no_extension", kNoExpiry, kNoExpiry};
}

// Command 6: the audit-log state that getDLPAuditLogState reports.
void setAuditLogState(int logState) REQUIRES(libraryLock);

}  // namespace dlp
