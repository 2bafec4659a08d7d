#include "processmap/extension_rules.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <utility>

#include "primitives/platform_log.h"

namespace dlp {

constexpr const char* kBuiltInExtensions[25] = {
        "xls", "xlsx", "doc", "docx", "ppt",      "pptx", "pdf",  "jpg", "jpeg",
        "mp4", "zip",  "txt", "asd",  "xlam",     "htm",  "html", "mht", "eml",
        "msg", "hwp",  "gul", "rtf",  "ostrilex", "png",  "gif"};

}  // namespace dlp

namespace {

// No built-in extension is longer than eight bytes, so each one packs, with its length, into a
// key: the built-ins are told by a binary search instead of 25 string comparisons.
struct PackedExtension {
    size_t size;
    uint64_t bytes;
};

constexpr bool operator<(const PackedExtension& left, const PackedExtension& right) {
    return left.size != right.size ? left.size < right.size : left.bytes < right.bytes;
}

constexpr size_t kLongestBuiltInExtension = 8;
constexpr size_t kBuiltInCount = std::size(dlp::kBuiltInExtensions);

constexpr PackedExtension pack(std::string_view extension) {
    uint64_t bytes = 0;
    for (char byte : extension) bytes = bytes << 8 | static_cast<unsigned char>(byte);
    return {extension.size(), bytes};
}

constexpr std::array<PackedExtension, kBuiltInCount> sortedPackedBuiltIns() {
    std::array<PackedExtension, kBuiltInCount> sorted{};
    for (size_t i = 0; i < kBuiltInCount; ++i) {
        PackedExtension value = pack(dlp::kBuiltInExtensions[i]);
        size_t slot = i;
        for (; slot > 0 && value < sorted[slot - 1]; --slot) sorted[slot] = sorted[slot - 1];
        sorted[slot] = value;
    }
    return sorted;
}

constexpr std::array<PackedExtension, kBuiltInCount> kPackedBuiltIns = sortedPackedBuiltIns();

bool isBuiltIn(std::string_view extension) {
    return extension.size() <= kLongestBuiltInExtension &&
           std::binary_search(kPackedBuiltIns.begin(), kPackedBuiltIns.end(), pack(extension));
}

}  // namespace

int HashMap::isValidExtension(std::string extension) {
    return dlp::isProtectedExtension(*this, extension) ? 1 : 0;
}

int HashMap::addExtension(std::string extension) {
    if (!dlp::isProtectedExtension(*this, extension)) {
        mExtensionList.push_back(std::move(extension));
    }
    return 1;
}

std::vector<std::string> getExtensions(const char* list, char delimiter) {
    std::vector<std::string> tokens;
    if (list == nullptr || *list == '\0') {
        DLP_SYSTEM_ERROR("DLP_LIBDLP : <getExtensions> extention list is empty \n");
        return tokens;
    }
    const char* start = list;
    for (const char* cursor = list;; ++cursor) {
        if (*cursor == delimiter || *cursor == '\0') {
            tokens.emplace_back(start, cursor);
            if (*cursor == '\0') return tokens;
            start = cursor + 1;
        }
    }
}

void HashMap::makeExtensionGroups() {
    dlp::LibraryLockGuard guard;
    // "xls" and "xlsx" relate to each other as "ppt" and "pptx" do.
    const std::pair<const char*, std::vector<std::string>> rows[] = {
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
    for (const auto& row : rows) mExtensionGroups.emplace(row.first, row.second);
}

int HashMap::getValidMapEntryIndexForExt(std::string extension, std::vector<MapEntry> entries) {
    dlp::LibraryLockGuard guard;
    return dlp::relatedEntryIndex(*this, extension, entries);
}

namespace dlp {

bool isProtectedExtension(const HashMap& map, std::string_view extension) {
    return isBuiltIn(extension) || std::find(map.mExtensionList.begin(), map.mExtensionList.end(),
                                             extension) != map.mExtensionList.end();
}

void replaceExtensionList(std::vector<std::string> extensions) {
    mProcessMap.mExtensionList.clear();
    for (std::string& extension : extensions) mProcessMap.addExtension(std::move(extension));
}

int relatedEntryIndex(const HashMap& map, const std::string& extension,
                      const std::vector<MapEntry>& entries) {
    auto group = map.mExtensionGroups.find(extension);
    if (group == map.mExtensionGroups.end()) {
        DLP_SYSTEM_ERROR(
                "DLP_LIBDLP : <HashMap::getValidMapEntryIndexForExt> record with key[%s] not "
                "found.",
                extension.c_str());
        return kNoEntryIndex;
    }
    // The most recent entry of any related extension: the highest index that matches.
    int result = kNoEntryIndex;
    for (const std::string& related : group->second) {
        int lowest = result < 0 ? 0 : result + 1;
        for (int index = static_cast<int>(entries.size()) - 1; index >= lowest; --index) {
            if (entries[index].value_extension == related) {
                result = index;
                break;
            }
        }
    }
    return result;
}

}  // namespace dlp
