#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "processmap/process_map_internal.h"
#include "support/library_messages.h"
#include "support/log_capture.h"
#include "support/process_map_reset.h"

namespace dlp::test {
namespace {

using Tokens = std::vector<std::string>;

class ExtensionRulesTest : public ::testing::Test {
  protected:
    FreshProcessMap map_;
    LogCapture log_;
};

std::vector<MapEntry> entriesWith(const Tokens& extensions) {
    std::vector<MapEntry> entries;
    for (const std::string& extension : extensions) {
        entries.push_back(MapEntry{100, extension, 2000000000, 1700000000});
    }
    return entries;
}

int relatedIndex(const std::string& extension, const Tokens& extensions) {
    return mProcessMap.getValidMapEntryIndexForExt(extension, entriesWith(extensions));
}

TEST_F(ExtensionRulesTest, ProtectedExtensionsAreComparedByteForByte) {
    for (const std::string& extension : mProcessMap.mDefaultExtensions) {
        EXPECT_EQ(mProcessMap.isValidExtension(extension), 1) << extension;
    }
    EXPECT_EQ(mProcessMap.isValidExtension("ostrilex"), 1);
    for (const char* refused : {"PDF", "Pdf", "tmp", "", " pdf", "pdf ", "pd", "pdfx", ".pdf"}) {
        EXPECT_EQ(mProcessMap.isValidExtension(refused), 0) << refused;
    }
    expectRecords(log_, {});
}

TEST_F(ExtensionRulesTest, AddExtensionKeepsOneCopyOfEachNewExtension) {
    EXPECT_EQ(mProcessMap.addExtension("pdf"), 1);
    EXPECT_TRUE(mProcessMap.mExtensionList.empty());

    EXPECT_EQ(mProcessMap.addExtension("tmp"), 1);
    EXPECT_EQ(mProcessMap.addExtension("tmp"), 1);
    EXPECT_EQ(mProcessMap.addExtension("TMP"), 1);
    EXPECT_EQ(mProcessMap.addExtension(""), 1);
    EXPECT_EQ(mProcessMap.addExtension(""), 1);
    EXPECT_EQ(mProcessMap.mExtensionList, (Tokens{"tmp", "TMP", ""}));
    EXPECT_EQ(mProcessMap.isValidExtension("tmp"), 1);
    EXPECT_EQ(mProcessMap.isValidExtension(""), 1);
    EXPECT_EQ(mProcessMap.isValidExtension("Tmp"), 0);
    EXPECT_EQ(mProcessMap.mDefaultExtensions.size(), 25u);
}

TEST_F(ExtensionRulesTest, GetExtensionsSplitsAtEveryDelimiter) {
    EXPECT_EQ(getExtensions("pdf,docx", ','), (Tokens{"pdf", "docx"}));
    EXPECT_EQ(getExtensions("pdf", ','), (Tokens{"pdf"}));
    EXPECT_EQ(getExtensions("pdf,", ','), (Tokens{"pdf", ""}));
    EXPECT_EQ(getExtensions(",pdf", ','), (Tokens{"", "pdf"}));
    EXPECT_EQ(getExtensions("a,,b", ','), (Tokens{"a", "", "b"}));
    EXPECT_EQ(getExtensions(",", ','), (Tokens{"", ""}));
    EXPECT_EQ(getExtensions(" Pdf,DOCX ,pdf,pdf", ','), (Tokens{" Pdf", "DOCX ", "pdf", "pdf"}));
    EXPECT_EQ(getExtensions("pdf;docx", ','), (Tokens{"pdf;docx"}));
    EXPECT_EQ(getExtensions("pdf;docx,txt", ';'), (Tokens{"pdf", "docx,txt"}));
    EXPECT_EQ(getExtensions("", ','), Tokens{});
    EXPECT_EQ(getExtensions(nullptr, ','), Tokens{});
    expectRecords(log_, {emptyExtensionListMessage(), emptyExtensionListMessage()});
    EXPECT_TRUE(mProcessMap.mExtensionList.empty());
}

TEST_F(ExtensionRulesTest, GroupTable) {
    const std::map<std::string, Tokens> expected = {
            {"tmp", {"xlsx", "xls", "docx", "doc", "rtf", "txt", "ppt", "pptx"}},
            {"xlsx", {"xls"}},
            {"xls", {"xlsx"}},
            {"doc", {"docx", "rtf", "txt"}},
            {"docx", {"doc", "rtf", "txt"}},
            {"rtf", {"doc", "docx", "txt"}},
            {"txt", {"doc", "docx", "rtf"}},
            {"ppt", {"pptx"}},
            {"pptx", {"ppt"}},
            {"htm", {"html"}},
            {"html", {"htm"}},
            {"jpg", {"jpeg", "png", "gif"}},
            {"jpeg", {"jpg", "png", "gif"}},
            {"png", {"jpeg", "jpg", "gif"}},
            {"gif", {"jpeg", "jpg", "png"}},
    };
    EXPECT_EQ(mProcessMap.mExtensionGroups, expected);

    // A key already present keeps its group; missing keys are added again.
    HashMap map;
    EXPECT_EQ(map.mExtensionGroups, expected);
    map.mExtensionGroups["doc"] = {"odt"};
    map.mExtensionGroups.erase("gif");
    map.makeExtensionGroups();
    EXPECT_EQ(map.mExtensionGroups.at("doc"), (Tokens{"odt"}));
    EXPECT_EQ(map.mExtensionGroups.at("gif"), expected.at("gif"));
    EXPECT_EQ(map.mExtensionGroups.size(), 15u);
}

TEST_F(ExtensionRulesTest, RelatedEntryIsTheMostRecentOfTheGroup) {
    EXPECT_EQ(relatedIndex("doc", {"docx", "pdf", "txt"}), 2);
    EXPECT_EQ(relatedIndex("doc", {"docx", "docx"}), 1);
    EXPECT_EQ(relatedIndex("doc", {"txt", "rtf", "docx", "pdf"}), 2);
    EXPECT_EQ(relatedIndex("doc", {"doc"}), -2);
    EXPECT_EQ(relatedIndex("doc", {"DOCX"}), -2);
    EXPECT_EQ(relatedIndex("doc", {}), -2);
    // The highest index wins whatever the order of the group.
    EXPECT_EQ(relatedIndex("jpg", {"gif", "png", "jpeg"}), 2);
    EXPECT_EQ(relatedIndex("jpg", {"jpeg", "png", "gif", "pdf"}), 2);
    EXPECT_EQ(relatedIndex("jpg", {"gif", "jpeg"}), 1);
    EXPECT_EQ(relatedIndex("htm", {"html", "pdf"}), 0);
    EXPECT_EQ(relatedIndex("pptx", {"pptx", "ppt", "pptx"}), 1);
    EXPECT_EQ(relatedIndex("tmp", {"xlsx", "pdf", "pptx"}), 2);
    EXPECT_EQ(relatedIndex("tmp", {"pdf"}), -2);
    EXPECT_EQ(relatedIndex("xls", {"xlsx", "pdf"}), 0);
    EXPECT_EQ(relatedIndex("xlsx", {"pdf", "xls"}), 1);
    EXPECT_EQ(relatedIndex("xls", {"xls"}), -2);
    EXPECT_EQ(relatedIndex("xlsx", {"xlsx"}), -2);
    expectRecords(log_, {});
}

TEST_F(ExtensionRulesTest, ExtensionWithoutGroupIsReported) {
    EXPECT_EQ(relatedIndex("pdf", {"pdf", "docx"}), -2);
    EXPECT_EQ(relatedIndex("pdf", {}), -2);
    EXPECT_EQ(relatedIndex("DOC", {"docx"}), -2);
    expectRecords(log_, {missingGroupMessage("pdf"), missingGroupMessage("pdf"),
                         missingGroupMessage("DOC")});
}

}  // namespace
}  // namespace dlp::test
