#include "processmap/hash_map.h"

#include "primitives/library_lock.h"

// Definition order is construction order; destruction runs the other way round.
const std::string FILE_MANAGER_PACKAGE = "com.vux.android.app.filbrook";
const std::string GALLERY_PACKAGE = "com.vux.android.gallery3d";
const std::string HANCOM_OFFICE_PACKAGE = "com.hancom.office";

HashMap mProcessMap;
std::map<int, std::vector<MapEntry>> HashMap::mInternalProcessMap;
std::map<int, std::vector<MapEntry>>::iterator HashMap::mMapIterator;
std::map<unsigned long, int> HashMap::mPendingInodeMap;

HashMap::HashMap() : mLogState(0), mFileManagerPid(-1) {
    for (const char* extension :
         {"xls", "xlsx", "doc", "docx", "ppt",      "pptx", "pdf",  "jpg", "jpeg",
          "mp4", "zip",  "txt", "asd",  "xlam",     "htm",  "html", "mht", "eml",
          "msg", "hwp",  "gul", "rtf",  "ostrilex", "png",  "gif"}) {
        mDefaultExtensions.push_back(extension);
    }
    makeExtensionGroups();
}

int getDLPAuditLogState() {
    auto lock = dlp::lockLibraryState();
    return mProcessMap.mLogState;
}
