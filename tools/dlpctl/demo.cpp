#include "demo.h"

#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include "sandbox_check.h"
#include "trace.h"

namespace {

// Played with the scratch directory as the working directory.
constexpr const char* kDemoTrace =
        R"(# The administrator keeps the new files of container 150 for one day.
3 150 86400 => 0
# A report, stamped to expire in one hour.
file Report.docx +1h
# An office-suite process and another app open it.
process 101 com.hancom.office.viewer
process 102 org.example.browser
4 0 101 Report.docx => 0
4 0 102 Report.docx => 0
# The office suite is whitelisted: its new draft inherits the report's expiry.
file Draft.doc
create 101 Draft.doc 150 => 0
# The other app is not: its copy gets the container's one day.
file Copy.doc
create 102 Copy.doc 150 => 0
# The file manager writes a zip without having opened one: it expires at the end of the day.
process 103 com.vux.android.app.filbrook
file Backup.zip
create 103 Backup.zip 150 => 0
# What every file carries now.
show Report.docx
show Draft.doc
show Copy.doc
show Backup.zip
)";

int runThroughSandbox(bool showLog) {
    std::string sandbox = findSandbox();
    std::string program = programPath();
    if (sandbox.empty() || program.empty()) {
        fprintf(stderr,
                "dlpctl: demo: dlp-sandbox not found; pass --system to use this machine's "
                "/data/system/users/dlp/dlpinfo.db\n");
        return 2;
    }
    std::vector<std::string> words{sandbox, program};
    if (showLog) words.push_back("--log");
    words.push_back("demo");
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    argv.push_back(nullptr);
    execv(sandbox.c_str(), argv.data());
    fprintf(stderr, "dlpctl: demo: cannot run %s: %s\n", sandbox.c_str(), strerror(errno));
    return 1;
}

}  // namespace

int runDemo(bool showLog, bool useSystemPaths) {
    if (!useSystemPaths && !insideSandbox()) return runThroughSandbox(showLog);

    // The library takes the extension from the whole path: no "." in the directory's name, and
    // the trace names its files relative to it.
    char directory[] = "/tmp/dlpctl-demo-XXXXXX";
    android::base::unique_fd startDirectory(open(".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!startDirectory.ok() || mkdtemp(directory) == nullptr || chdir(directory) != 0) {
        fprintf(stderr, "dlpctl: demo: cannot work in %s: %s\n", directory, strerror(errno));
        return 1;
    }
    std::istringstream trace(kDemoTrace);
    int status = replayTrace(trace, "demo", true);
    bool returned = fchdir(startDirectory.get()) == 0;
    std::error_code removeError;
    std::filesystem::remove_all(directory, removeError);
    if (!returned || removeError) {
        fprintf(stderr, "dlpctl: demo: cannot clean up %s\n", directory);
        return 1;
    }
    return status;
}
