#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <ctime>
#include <string>
#include <vector>

#include "processmap/process_map_internal.h"
#include "support/child_process.h"
#include "support/command_vector.h"
#include "support/scratch_directory.h"

namespace dlp::test {
namespace {

using ProcessEntries = std::map<int, std::vector<MapEntry>>;
using PendingInodes = std::map<unsigned long, int>;

const std::vector<std::string> kDefaultExtensions = {
        "xls", "xlsx", "doc", "docx", "ppt",      "pptx", "pdf",  "jpg", "jpeg",
        "mp4", "zip",  "txt", "asd",  "xlam",     "htm",  "html", "mht", "eml",
        "msg", "hwp",  "gul", "rtf",  "ostrilex", "png",  "gif"};

void expectStateAfterLoad(const HashMap& map, const ProcessEntries& entries,
                          const PendingInodes& inodes, ProcessEntries::iterator iterator,
                          int auditLogState) {
    EXPECT_EQ(map.mDefaultExtensions, kDefaultExtensions);
    // The table itself is the extension rules' business.
    EXPECT_EQ(map.mExtensionGroups, HashMap().mExtensionGroups);
    EXPECT_TRUE(map.mExtensionList.empty());
    EXPECT_TRUE(map.mRejectList.empty());
    EXPECT_EQ(map.mLogState, 0);
    EXPECT_EQ(map.mFileManagerPid, -1);
    EXPECT_TRUE(entries.empty());
    EXPECT_TRUE(inodes.empty());
    // Default-constructed: it designates no element, not even the end of the map.
    EXPECT_TRUE(iterator == ProcessEntries::iterator());
    EXPECT_FALSE(iterator == entries.end());
    EXPECT_EQ(auditLogState, 0);
}

TEST(ProcessMapStateTest, StateAfterLoad) {
    expectStateAfterLoad(mProcessMap, HashMap::mInternalProcessMap, HashMap::mPendingInodeMap,
                         HashMap::mMapIterator, getDLPAuditLogState());
    EXPECT_EQ(FILE_MANAGER_PACKAGE, "com.vux.android.app.filbrook");
    EXPECT_EQ(GALLERY_PACKAGE, "com.vux.android.gallery3d");
    EXPECT_EQ(HANCOM_OFFICE_PACKAGE, "com.hancom.office");
}

// The shared library as a caller sees it: its own copy of the state, reached through the exported
// symbols only.
class SharedLibrary {
  public:
    SharedLibrary() : handle_(dlopen(DLP_SHARED_LIBRARY, RTLD_NOW | RTLD_LOCAL)) {}
    ~SharedLibrary() {
        if (handle_ != nullptr) dlclose(handle_);
    }
    SharedLibrary(const SharedLibrary&) = delete;
    SharedLibrary& operator=(const SharedLibrary&) = delete;

    static bool isLoaded() {
        void* handle = dlopen(DLP_SHARED_LIBRARY, RTLD_NOW | RTLD_NOLOAD);
        if (handle != nullptr) dlclose(handle);
        return handle != nullptr;
    }

    bool opened() const { return handle_ != nullptr; }

    template <typename Symbol>
    Symbol* find(const char* name) const {
        return reinterpret_cast<Symbol*>(dlsym(handle_, name));
    }

    HashMap& processMap() const { return *find<HashMap>("mProcessMap"); }
    ProcessEntries& entries() const {
        return *find<ProcessEntries>("_ZN7HashMap19mInternalProcessMapE");
    }
    PendingInodes& inodes() const { return *find<PendingInodes>("_ZN7HashMap16mPendingInodeMapE"); }
    ProcessEntries::iterator iterator() const {
        return *find<ProcessEntries::iterator>("_ZN7HashMap12mMapIteratorE");
    }
    int auditLogState() const { return find<int()>("_Z19getDLPAuditLogStatev")(); }

    int command(const std::vector<std::string>& words) const {
        return runCommand(words, find<int(int, char**)>("_Z17handleDLPCommandsiPPc"));
    }

    bool hasSymbols() const {
        bool found = true;
        for (const char* name :
             {"mProcessMap", "_ZN7HashMap19mInternalProcessMapE", "_ZN7HashMap16mPendingInodeMapE",
              "_ZN7HashMap12mMapIteratorE", "_Z19getDLPAuditLogStatev", "_Z17handleDLPCommandsiPPc",
              "_Z20putPendingInodeValuemi", "_Z13isNewFileCase8MapEntryPcli"}) {
            if (find<void>(name) == nullptr) {
                ADD_FAILURE() << "not exported: " << name;
                found = false;
            }
        }
        return found;
    }

  private:
    void* handle_;
};

TEST(ProcessMapStateTest, ReloadingTheSharedLibraryForgetsEverything) {
    ASSERT_FALSE(SharedLibrary::isLoaded());
    ScratchDirectory directory;
    std::string opened = directory.stampedFile("opened.pdf", 2000000000);
    ChildProcess fileManager("com.vux.android.app.filbrook");

    {
        SharedLibrary library;
        ASSERT_TRUE(library.opened()) << dlerror();
        ASSERT_TRUE(library.hasSymbols());
        expectStateAfterLoad(library.processMap(), library.entries(), library.inodes(),
                             library.iterator(), library.auditLogState());

        EXPECT_EQ(library.command({"6", "100", "2"}), 0);
        EXPECT_EQ(library.command({"5", "0", "abc,tmp"}), 0);
        EXPECT_EQ(library.command({"4", "0", std::to_string(getpid()), opened}), 0);
        EXPECT_TRUE(library.find<bool(unsigned long, int)>("_Z20putPendingInodeValuemi")(42, 7));
        auto isNewFileCase =
                library.find<bool(MapEntry, char*, long, int)>("_Z13isNewFileCase8MapEntryPcli");
        long now = time(nullptr);
        isNewFileCase(MapEntry{getpid(), "pdf", 2000000000, now}, opened.data(), now, getpid());
        isNewFileCase(MapEntry{fileManager.pid(), "pdf", 2000000000, now}, opened.data(), now,
                      fileManager.pid());

        // Everything recorded went into the library's copy, none into the test's own.
        EXPECT_EQ(library.auditLogState(), 2);
        EXPECT_EQ(library.processMap().mExtensionList, (std::vector<std::string>{"abc", "tmp"}));
        ASSERT_EQ(library.entries().count(getpid()), 1u);
        EXPECT_EQ(library.entries().at(getpid()).back().value_expiry, 2000000000);
        EXPECT_EQ(library.inodes(), (PendingInodes{{42, 7}}));
        EXPECT_EQ(library.processMap().mRejectList.count(getpid()), 1u);
        EXPECT_EQ(library.processMap().mFileManagerPid, fileManager.pid());
        expectStateAfterLoad(mProcessMap, HashMap::mInternalProcessMap, HashMap::mPendingInodeMap,
                             HashMap::mMapIterator, getDLPAuditLogState());
    }
    ASSERT_FALSE(SharedLibrary::isLoaded()) << "the library stays mapped after dlclose";

    SharedLibrary reloaded;
    ASSERT_TRUE(reloaded.opened()) << dlerror();
    expectStateAfterLoad(reloaded.processMap(), reloaded.entries(), reloaded.inodes(),
                         reloaded.iterator(), reloaded.auditLogState());
}

}  // namespace
}  // namespace dlp::test
