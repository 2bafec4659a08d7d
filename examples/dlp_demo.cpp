// Walks a protected document through the library the way the file-event source and the
// framework drive it: an administrator's duration, a stamped file, an app that opens it and
// creates new files.
#include <dlp_sdk/commands.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/new_file_expiry.h>

#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <android/log.h>

#include <cstdio>
#include <ctime>
#include <string>
#include <vector>

extern char** environ;

namespace {

constexpr int kContainerId = 150;

// An app process: a sleeping child whose command line starts with the package name.
class AppProcess {
  public:
    explicit AppProcess(const char* packageName) {
        char* argv[] = {const_cast<char*>(packageName), const_cast<char*>("600"), nullptr};
        if (posix_spawn(&pid_, "/bin/sleep", nullptr, nullptr, argv, environ) != 0) pid_ = -1;
    }
    ~AppProcess() {
        if (pid_ <= 0) return;
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
    AppProcess(const AppProcess&) = delete;
    AppProcess& operator=(const AppProcess&) = delete;
    int pid() const { return pid_; }

  private:
    pid_t pid_ = -1;
};

int runCommand(std::vector<std::string> words) {
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    return handleDLPCommands(static_cast<int>(argv.size()), argv.data());
}

bool createFile(const std::string& path) {
    FILE* file = fopen(path.c_str(), "we");
    if (file == nullptr) return false;
    fputs("demo\n", file);
    return fclose(file) == 0;
}

std::string describeExpiry(const std::string& path, long now) {
    long expiry = get_dlp_file_expiry_time(path.c_str());
    if (expiry < 0) return "no expiry";
    char text[96];
    tm local{};
    time_t seconds = expiry;
    localtime_r(&seconds, &local);
    char when[40];
    strftime(when, sizeof(when), "%Y-%m-%d %H:%M:%S", &local);
    snprintf(text, sizeof(text), "%s (now %+ld s)", when, expiry - now);
    return text;
}

}  // namespace

int main(int argc, char** argv) {
    // The library logs every step; the demo shows only its own lines unless asked to.
    if (argc < 2 || std::string(argv[1]) != "--verbose") {
        __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
    }
    char directoryTemplate[] = "/tmp/dlp-demo-XXXXXX";
    if (mkdtemp(directoryTemplate) == nullptr) {
        perror("mkdtemp");
        return 1;
    }
    std::string directory = directoryTemplate;
    long now = time(nullptr);

    printf("administrator: container %d keeps new files for one day -> %d\n", kContainerId,
           runCommand({"dlp", "3", std::to_string(kContainerId), "86400"}));

    std::string report = directory + "/Report.docx";
    createFile(report);
    printf("administrator: stamp %s to expire in one hour -> %d\n", report.c_str(),
           runCommand(
                   {"dlp", "2", std::to_string(kContainerId), report, std::to_string(now + 3600)}));

    AppProcess office("com.hancom.office.viewer");
    AppProcess browser("org.example.browser");
    for (const AppProcess* app : {&office, &browser}) {
        printf("pid %d opens %s -> %d\n", app->pid(), report.c_str(),
               runCommand({"dlp", "4", "0", std::to_string(app->pid()), report}));
    }

    std::string draft = directory + "/Draft.doc";
    std::string copy = directory + "/Copy.doc";
    createFile(draft);
    createFile(copy);
    printf("office suite (pid %d) creates %s -> %d\n", office.pid(), draft.c_str(),
           setExpiryforFile(office.pid(), draft.data(), kContainerId));
    printf("other app (pid %d) creates %s -> %d\n", browser.pid(), copy.c_str(),
           setExpiryforFile(browser.pid(), copy.data(), kContainerId));

    printf("\n%-40s %s\n", "file", "expiry");
    for (const std::string& path : {report, draft, copy}) {
        printf("%-40s %s\n", path.c_str(), describeExpiry(path, now).c_str());
    }
    printf("\nThe office suite's new file inherits the report's expiry; the other app's new file\n"
           "gets the container's duration.\n");

    for (const std::string& path : {report, draft, copy}) unlink(path.c_str());
    rmdir(directory.c_str());
    return 0;
}
