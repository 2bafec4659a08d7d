#include <gtest/gtest.h>

#include <sstream>

#include "processmap/process_map_internal.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {

using Tokens = std::vector<std::string>;

TEST(getExtensions, SplitsAtEveryDelimiterAndKeepsEveryByte) {
    const std::tuple<const char*, char, Tokens> rows[] = {
            {"pdf,docx", ',', {"pdf", "docx"}}, {",pdf", ',', {"", "pdf"}},
            {"pdf,", ',', {"pdf", ""}},         {"a,,b", ',', {"a", "", "b"}},
            {"pdf,docx", ';', {"pdf,docx"}},    {" Pdf;DOC;pdf", ';', {" Pdf", "DOC", "pdf"}}};
    LogCapture log;
    for (auto& [list, delimiter, tokens] : rows) EXPECT_EQ(getExtensions(list, delimiter), tokens);
    EXPECT_EQ(getExtensions("", ','), Tokens{});
    EXPECT_EQ(log.take(), (std::vector<LogRecord>{systemError(
                                  "DLP_LIBDLP : <getExtensions> extention list is empty \n")}));
}

TEST(HashMap_isValidExtension, AcceptsTheBuiltInsAndTheAdministratorsExtensions) {
    FreshProcessMap fresh;
    LibraryLockGuard guard;
    // The list itself is pinned by the process map's own test.
    for (const std::string& builtIn : mProcessMap.mDefaultExtensions)
        EXPECT_EQ(mProcessMap.isValidExtension(builtIn), 1) << builtIn;
    for (const char* other : {"PDF", "tmp", "", "xostrilex", "abc"})
        EXPECT_EQ(mProcessMap.isValidExtension(other), 0) << other;
    EXPECT_EQ(mProcessMap.isValidExtension(std::string("\0pdf", 4)), 0);
    EXPECT_EQ(mProcessMap.addExtension("abc"), 1);
    EXPECT_EQ(mProcessMap.isValidExtension("abc"), 1);
}

// addExtension's duplicates, built-ins and empty tokens show through command 5's test.

TEST(HashMap_getValidMapEntryIndexForExt, FindsTheMostRecentRelatedEntry) {
    // (extension, the extensions of the entries, oldest first, expected index)
    const std::tuple<const char*, const char*, int> rows[] = {
            {"doc", "docx pdf txt", 2}, {"doc", "docx docx", 1},     {"doc", "doc", -2},
            {"pdf", "pdf", -2},         {"tmp", "xlsx pdf pptx", 2}, {"xls", "pdf xlsx", 1},
            {"xlsx", "xls pdf", 0},     {"jpg", "gif png pdf", 1},   {"doc", "", -2}};
    LogCapture log;
    for (auto [extension, opened, index] : rows) {
        std::vector<MapEntry> entries;
        std::istringstream words(opened);
        for (std::string word; words >> word;) entries.push_back({1, word, 2, 3});
        EXPECT_EQ(mProcessMap.getValidMapEntryIndexForExt(extension, entries), index)
                << extension << " over " << opened;
    }
    // Only the extension without a group says so.
    EXPECT_EQ(log.take(), (std::vector<LogRecord>{systemError(
                                  "DLP_LIBDLP : <HashMap::getValidMapEntryIndexForExt> record with "
                                  "key[pdf] not found.")}));
}

}  // namespace dlp::test
