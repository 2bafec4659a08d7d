#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "processmap/process_map_internal.h"
#include "support/scratch_directory.h"

namespace dlp::test {

using ProcessEntries = std::map<int, std::vector<MapEntry>>;

// uint64_t is unsigned long on 64-bit ABIs, unsigned long long on 32-bit ones.
constexpr const char* kPutPendingInodeValue =
        sizeof(long) == 8 ? "_Z20putPendingInodeValuemi" : "_Z20putPendingInodeValueyi";

template <typename Symbol>
Symbol& symbol(void* library, const char* name) {
    return *reinterpret_cast<Symbol*>(dlsym(library, name));
}

int command(void* library, std::vector<std::string> words) {
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    return symbol<int(int, char**)>(library, "_Z17handleDLPCommandsiPPc")(
            static_cast<int>(argv.size()), argv.data());
}

// The shared library as a caller loads it, with a copy of the state of its own; what one load
// changes, the next one does not see.
TEST(HashMap, EveryLoadStartsFromTheSameState) {
    ScratchDirectory directory;
    const std::string opened = directory.file("opened.pdf", 2000000000);
    for (int load = 0; load < 2; ++load) {
        SCOPED_TRACE(load);
        void* library = dlopen(DLP_SHARED_LIBRARY, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(library, nullptr) << dlerror();
        auto& map = symbol<HashMap>(library, "mProcessMap");
        auto& entries = symbol<ProcessEntries>(library, "_ZN7HashMap19mInternalProcessMapE");
        auto& inodes = symbol<std::map<uint64_t, int>>(library, "_ZN7HashMap16mPendingInodeMapE");
        std::string defaults;
        for (const std::string& extension : map.mDefaultExtensions) defaults += extension + " ";
        EXPECT_EQ(defaults,
                  "xls xlsx doc docx ppt pptx pdf jpg jpeg mp4 zip txt asd xlam htm html "
                  "mht eml msg hwp gul rtf ostrilex png gif ");
        EXPECT_EQ(map.mExtensionGroups.size(), 15u);
        EXPECT_TRUE(map.mExtensionList.empty() && map.mRejectList.empty());
        EXPECT_TRUE(entries.empty() && inodes.empty());
        EXPECT_EQ(symbol<int()>(library, "_Z19getDLPAuditLogStatev")(), 0);
        EXPECT_EQ(map.mFileManagerPid, -1);
        EXPECT_TRUE(symbol<ProcessEntries::iterator>(library, "_ZN7HashMap12mMapIteratorE") ==
                    ProcessEntries::iterator());

        EXPECT_EQ(command(library, {"dlp", "4", "0", std::to_string(getpid()), opened}), 0);
        EXPECT_TRUE(symbol<bool(uint64_t, int)>(library, kPutPendingInodeValue)(42, 7));
        EXPECT_EQ(command(library, {"dlp", "5", "0", "abc,tmp"}), 0);
        EXPECT_EQ(command(library, {"dlp", "6", "100", "2"}), 0);
        EXPECT_EQ(entries.count(getpid()) + inodes.count(42), 2u);
        EXPECT_EQ(map.mExtensionList, (std::vector<std::string>{"abc", "tmp"}));
        EXPECT_EQ(symbol<int()>(library, "_Z19getDLPAuditLogStatev")(), 2);
        EXPECT_EQ(dlclose(library), 0);
    }
}

}  // namespace dlp::test
