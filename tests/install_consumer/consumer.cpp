// An outside program: it sees only the installed headers and library.
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/process_map.h>

#include <cinttypes>
#include <cstdio>

int main(int, char** argv) {
    std::vector<std::string> tokens = getExtensions("pdf,docx", ',');
    int64_t expiry = get_dlp_file_expiry_time(argv[0]);
    bool valid = mProcessMap.mDefaultExtensions.size() == 25;
    std::printf("%zu %" PRId64 " %d\n", tokens.size(), expiry, valid ? getDLPAuditLogState() : -1);
    return tokens.size() == 2 && expiry == -1 && valid ? 0 : 1;
}
