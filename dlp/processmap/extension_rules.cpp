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

// No built-in extension is longer than eight bytes, so each one packs into a number, and a
// multiplicative hash that gives each of them a slot of its own finds it with one comparison
// instead of 25 string comparisons. The length goes with the bytes: "pdf" and "pdf\0" differ.
struct PackedExtension {
    uint64_t bytes = 0;
    size_t size = 0;
};

constexpr size_t kLongestBuiltInExtension = 8;
constexpr unsigned kSlotBits = 8;

constexpr PackedExtension pack(std::string_view extension) {
    PackedExtension packed{0, extension.size()};
    for (char byte : extension) packed.bytes = packed.bytes << 8 | static_cast<unsigned char>(byte);
    return packed;
}

constexpr size_t slotOf(uint64_t bytes, uint64_t multiplier) {
    return static_cast<size_t>((bytes * multiplier) >> (64 - kSlotBits));
}

using SlotTable = std::array<PackedExtension, size_t{1} << kSlotBits>;

// The first multiplier of a sequence of odd ones under which no two built-ins share a slot; a
// failed search stops the build.
constexpr uint64_t findMultiplier() {
    for (uint64_t multiplier = 0x9E3779B97F4A7C15u;; multiplier += 0xD6E8FEB86659FD94u) {
        SlotTable slots{};
        bool distinct = true;
        for (const char* extension : dlp::kBuiltInExtensions) {
            PackedExtension& slot = slots[slotOf(pack(extension).bytes, multiplier)];
            distinct = distinct && slot.size == 0;
            slot = pack(extension);
        }
        if (distinct) return multiplier;
    }
}

constexpr uint64_t kMultiplier = findMultiplier();

constexpr SlotTable builtInSlots() {
    SlotTable slots{};
    for (const char* extension : dlp::kBuiltInExtensions) {
        slots[slotOf(pack(extension).bytes, kMultiplier)] = pack(extension);
    }
    return slots;
}

constexpr SlotTable kBuiltInSlots = builtInSlots();

bool isBuiltIn(std::string_view extension) {
    if (extension.size() > kLongestBuiltInExtension) return false;
    PackedExtension packed = pack(extension);
    const PackedExtension& slot = kBuiltInSlots[slotOf(packed.bytes, kMultiplier)];
    return slot.size == packed.size && slot.bytes == packed.bytes && packed.size != 0;
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
