// The library runs on every file open and create of a phone. Each case here runs beside its
// floor, the system calls that the same work cannot do without, under three log configurations.
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/process_map.h>

#include <android-base/unique_fd.h>
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <exception>
#include <functional>
#include <string>
#include <vector>

#include "command_vector.h"
#include "log_configuration.h"
#include "named_process.h"
#include "primitives/library_lock.h"
#include "process_map_population.h"
#include "support/duration_database.h"
#include "support/scratch_directory.h"

namespace {

using dlp::benchmarks::applyLogConfiguration;
using dlp::benchmarks::LogConfiguration;
using dlp::test::expiryValue;
using dlp::test::kDatabasePath;

constexpr const char* kExpiryAttribute = "user.zorvat_dlp";
constexpr size_t kExpiryValueSize = 16;
constexpr int kContainerId = 120;
constexpr int kDurationSeconds = 86400;
constexpr int64_t kWeekSeconds = 7 * 86400;
constexpr int kProcessCounts[] = {10, 10000, 100000};
// A zip copy rewrites a stamp that lies at most this far ahead; the source zip expires this far
// ahead, so every timed call of one run writes.
constexpr int64_t kZipCopyWindowSeconds = 20;

using ExpiryValue = std::vector<unsigned char>;

// The expiry on the file, -1 when it has none.
int64_t storedExpiry(const std::string& path) {
    ExpiryValue value = dlp::test::readAttribute(path);
    if (value.size() != kExpiryValueSize) return -1;
    uint64_t bits = 0;
    for (size_t i = 0; i < 8; ++i) bits |= static_cast<uint64_t>(value[i]) << (8 * i);
    return static_cast<int64_t>(bits);
}

void forgetProcess(pid_t pid) {
    runCommandVector({"1", std::to_string(pid)});
}

// Whether the pid's most recent entry is the file just reported.
bool storedLast(pid_t pid, const std::string& extension, int64_t expiry) {
    dlp::LibraryLockGuard guard;
    auto slot = HashMap::mInternalProcessMap.find(pid);
    if (slot == HashMap::mInternalProcessMap.end()) return false;
    const MapEntry& last = slot->second.back();
    return last.value_pid == pid && last.value_extension == extension &&
           last.value_expiry == expiry;
}

bool hasEntries(pid_t pid) {
    dlp::LibraryLockGuard guard;
    return HashMap::mInternalProcessMap.count(pid) != 0;
}

bool isRejected(pid_t pid) {
    dlp::LibraryLockGuard guard;
    return mProcessMap.mRejectList.count(pid) != 0;
}

// Moves the database away while it lives: a duration read meanwhile can only come from the
// cache.
class DatabaseAside {
  public:
    DatabaseAside() : moved_(rename(kDatabasePath, aside().c_str()) == 0) {}
    ~DatabaseAside() {
        if (moved_) rename(aside().c_str(), kDatabasePath);
    }
    DatabaseAside(const DatabaseAside&) = delete;
    DatabaseAside& operator=(const DatabaseAside&) = delete;
    bool moved() const { return moved_; }

  private:
    static std::string aside() { return std::string(kDatabasePath) + "-aside"; }
    bool moved_;
};

// The files and app processes that the cases act on, built once for the whole run.
struct Scene {
    int64_t start = getCurrentTimeInSec();
    dlp::test::ScratchDirectory directory;
    NamedProcess office{"com.hancom.office.viewer"};
    NamedProcess notes{"org.example.notes"};
    NamedProcess fileManager{"com.vux.android.app.filbrook"};

    int64_t protectedExpiry = start + kWeekSeconds;
    std::string protectedFile = directory.file("protected.docx", protectedExpiry);
    std::string plainFile = directory.file("plain.docx");

    int64_t officeOpenedExpiry = start + kWeekSeconds + 1;
    std::string officeOpened = directory.file("report.docx", officeOpenedExpiry);
    std::string officeCreated = directory.file("report-copy.doc");

    std::string notesOpened = directory.file("notes.docx", start + kWeekSeconds + 2);
    std::string notesCreated = directory.file("notes-copy.doc");

    std::string archiveOpened = directory.file("bundle.zip");
    std::string archiveCreated = directory.file("bundle-copy.zip");
};

Scene* scene = nullptr;

std::string processCommandLinePath(pid_t pid) {
    return "/proc/" + std::to_string(pid) + "/cmdline";
}

// What the library reads to name a process: open, one read of at most 254 bytes, close.
ssize_t readCommandLine(const char* path, char (&buffer)[255]) {
    android::base::unique_fd file(open(path, O_RDONLY | O_CLOEXEC));
    return read(file.get(), buffer, sizeof(buffer) - 1);
}

bool commandLineNames(const std::string& path, const char* name) {
    char buffer[255] = {};
    ssize_t length = readCommandLine(path.c_str(), buffer);
    return length > 0 && strcmp(buffer, name) == 0;
}

// Command 4, exactly as callers send it.
void fileOpen(benchmark::State& state, LogConfiguration configuration, bool isProtected) {
    dlp::benchmarks::useProcessMapPopulation(0);
    applyLogConfiguration(configuration);
    pid_t pid = getpid();
    CommandVector fileOpenCommand(
            {"4", "0", std::to_string(pid), isProtected ? scene->protectedFile : scene->plainFile});
    forgetProcess(pid);
    if (fileOpenCommand.run() != 0) return state.SkipWithError("command 4 failed");
    if (isProtected && !storedLast(pid, "docx", scene->protectedExpiry)) {
        return state.SkipWithError("command 4 stored no entry for the protected file");
    }
    if (!isProtected && hasEntries(pid)) {
        return state.SkipWithError("command 4 stored an entry for an unprotected file");
    }
    for (auto _ : state) benchmark::DoNotOptimize(fileOpenCommand.run());
}

void fileOpenFloor(benchmark::State& state, bool isProtected) {
    const char* path = (isProtected ? scene->protectedFile : scene->plainFile).c_str();
    ExpiryValue value(kExpiryValueSize);
    ssize_t expected = isProtected ? static_cast<ssize_t>(kExpiryValueSize) : -1;
    if (getxattr(path, kExpiryAttribute, value.data(), value.size()) != expected) {
        return state.SkipWithError("getxattr did not answer as the case's file should");
    }
    state.SetLabel("getxattr");
    for (auto _ : state) {
        benchmark::DoNotOptimize(getxattr(path, kExpiryAttribute, value.data(), value.size()));
    }
}

// The office app opened a protected docx and now creates a doc: it inherits the docx's expiry.
void inheritingCreate(benchmark::State& state, LogConfiguration configuration) {
    dlp::benchmarks::useProcessMapPopulation(0);
    applyLogConfiguration(configuration);
    pid_t pid = scene->office.pid();
    std::string created = scene->officeCreated;
    forgetProcess(pid);
    runCommandVector({"4", "0", std::to_string(pid), scene->officeOpened});
    if (!storedLast(pid, "docx", scene->officeOpenedExpiry)) {
        return state.SkipWithError("the office app's docx was not recorded");
    }
    removexattr(created.c_str(), kExpiryAttribute);
    if (setExpiryforFile(pid, created.data(), kContainerId) != 0 ||
        storedExpiry(created) != scene->officeOpenedExpiry || isRejected(pid)) {
        return state.SkipWithError("the new doc did not inherit the docx's expiry");
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(setExpiryforFile(pid, created.data(), kContainerId));
    }
}

void inheritingCreateFloor(benchmark::State& state) {
    std::string commandLine = processCommandLinePath(scene->office.pid());
    const char* created = scene->officeCreated.c_str();
    ExpiryValue value = expiryValue(scene->officeOpenedExpiry);
    char name[255];
    if (!commandLineNames(commandLine, "com.hancom.office.viewer") ||
        setxattr(created, kExpiryAttribute, value.data(), value.size(), 0) != 0) {
        return state.SkipWithError("the floor's system calls failed");
    }
    state.SetLabel("/proc read + setxattr");
    for (auto _ : state) {
        benchmark::DoNotOptimize(readCommandLine(commandLine.c_str(), name));
        benchmark::DoNotOptimize(
                setxattr(created, kExpiryAttribute, value.data(), value.size(), 0));
    }
}

// An ordinary app, already on the reject list, creates a file: now + the cached duration.
void rejectedCreate(benchmark::State& state, LogConfiguration configuration) {
    dlp::benchmarks::useProcessMapPopulation(0);
    applyLogConfiguration(configuration);
    pid_t pid = scene->notes.pid();
    std::string created = scene->notesCreated;
    forgetProcess(pid);
    runCommandVector({"4", "0", std::to_string(pid), scene->notesOpened});
    setExpiryforFile(pid, created.data(), kContainerId);
    if (!isRejected(pid)) return state.SkipWithError("the app was not put on the reject list");
    {
        DatabaseAside aside;
        if (!aside.moved()) return state.SkipWithError("cannot move the database aside");
        int64_t before = getCurrentTimeInSec();
        int result = setExpiryforFile(pid, created.data(), kContainerId);
        int64_t after = getCurrentTimeInSec();
        int64_t expiry = storedExpiry(created);
        if (result != 0 || expiry < before + kDurationSeconds ||
            expiry > after + kDurationSeconds) {
            return state.SkipWithError("the new file did not get now + the cached duration");
        }
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(setExpiryforFile(pid, created.data(), kContainerId));
    }
}

void rejectedCreateFloor(benchmark::State& state) {
    const char* created = scene->notesCreated.c_str();
    ExpiryValue value = expiryValue(getCurrentTimeInSec() + kDurationSeconds);
    if (setxattr(created, kExpiryAttribute, value.data(), value.size(), 0) != 0) {
        return state.SkipWithError("setxattr failed");
    }
    state.SetLabel("setxattr");
    for (auto _ : state) {
        benchmark::DoNotOptimize(
                setxattr(created, kExpiryAttribute, value.data(), value.size(), 0));
    }
}

// The file manager writes a zip after opening a protected zip: the new zip takes its expiry.
void zipCopy(benchmark::State& state, LogConfiguration configuration) {
    dlp::benchmarks::useProcessMapPopulation(0);
    applyLogConfiguration(configuration);
    pid_t pid = scene->fileManager.pid();
    std::string created = scene->archiveCreated;
    int64_t openedExpiry = getCurrentTimeInSec() + kZipCopyWindowSeconds;
    dlp::test::writeAttribute(scene->archiveOpened, expiryValue(openedExpiry));
    forgetProcess(pid);
    runCommandVector({"4", "0", std::to_string(pid), scene->archiveOpened});
    if (!storedLast(pid, "zip", openedExpiry)) {
        return state.SkipWithError("the file manager's zip was not recorded");
    }
    removexattr(created.c_str(), kExpiryAttribute);
    if (setExpiryforFile(pid, created.data(), kContainerId) != 0 ||
        storedExpiry(created) != openedExpiry) {
        return state.SkipWithError("the new zip did not take the opened zip's expiry");
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(setExpiryforFile(pid, created.data(), kContainerId));
    }
    if (getCurrentTimeInSec() > openedExpiry) {
        state.SkipWithError("ran past the opened zip's expiry: later calls left the file alone");
    }
}

void zipCopyFloor(benchmark::State& state) {
    std::string commandLine = processCommandLinePath(scene->fileManager.pid());
    const char* created = scene->archiveCreated.c_str();
    ExpiryValue value = expiryValue(getCurrentTimeInSec() + kZipCopyWindowSeconds);
    ExpiryValue current(kExpiryValueSize);
    char name[255];
    if (!commandLineNames(commandLine, "com.vux.android.app.filbrook") ||
        setxattr(created, kExpiryAttribute, value.data(), value.size(), 0) != 0 ||
        getxattr(created, kExpiryAttribute, current.data(), current.size()) !=
                static_cast<ssize_t>(kExpiryValueSize)) {
        return state.SkipWithError("the floor's system calls failed");
    }
    state.SetLabel("/proc read + getxattr + setxattr");
    for (auto _ : state) {
        benchmark::DoNotOptimize(readCommandLine(commandLine.c_str(), name));
        benchmark::DoNotOptimize(
                getxattr(created, kExpiryAttribute, current.data(), current.size()));
        benchmark::DoNotOptimize(
                setxattr(created, kExpiryAttribute, value.data(), value.size(), 0));
    }
}

void cachedDuration(benchmark::State& state, LogConfiguration configuration) {
    applyLogConfiguration(configuration);
    {
        DatabaseAside aside;
        if (!aside.moved()) return state.SkipWithError("cannot move the database aside");
        if (get_time(kContainerId) != kDurationSeconds) {
            return state.SkipWithError("the duration did not come from the cache");
        }
    }
    for (auto _ : state) benchmark::DoNotOptimize(get_time(kContainerId));
}

int durationSlots[100];

// Kept out of line so that the floor pays for a call, as the case does.
[[gnu::noinline]] int durationSlot(int id) {
    return durationSlots[id - 100];
}

void cachedDurationFloor(benchmark::State& state) {
    durationSlots[kContainerId - 100] = kDurationSeconds;
    volatile int id = kContainerId;
    state.SetLabel("call reading an array slot");
    for (auto _ : state) benchmark::DoNotOptimize(durationSlot(id));
}

// HashMap::get as setExpiryforFile calls it: on mProcessMap, with the library lock held. The lock
// is the entry point's cost, which the create cases measure; here it is taken once.
void mapLookup(benchmark::State& state, LogConfiguration configuration, int processCount,
               const std::string& extension) {
    const auto& population = dlp::benchmarks::useProcessMapPopulation(processCount);
    applyLogConfiguration(configuration);
    const std::vector<int>& pids = population.lookupOrder;
    {
        dlp::LibraryLockGuard guard;
        MapEntry found = mProcessMap.get(pids.front(), extension);
        if (found.value_pid != pids.front() || found.value_extension != "docx") {
            return state.SkipWithError("HashMap::get did not find the pid's docx");
        }
    }
    size_t next = 0;
    dlp::LibraryLockGuard guard;
    for (auto _ : state) {
        int pid = pids[next];
        if (++next == pids.size()) next = 0;
        benchmark::DoNotOptimize(mProcessMap.get(pid, extension));
    }
    state.counters["heap_bytes_per_entry"] = population.heapBytesPerEntry;
}

void mapLookupFloor(benchmark::State& state, int processCount) {
    const auto& population = dlp::benchmarks::useProcessMapPopulation(processCount);
    const std::vector<int>& pids = population.lookupOrder;
    auto& map = HashMap::mInternalProcessMap;
    if (map.find(pids.front()) == map.end()) return state.SkipWithError("the pid is not mapped");
    state.SetLabel("std::map::find");
    size_t next = 0;
    for (auto _ : state) {
        int pid = pids[next];
        if (++next == pids.size()) next = 0;
        benchmark::DoNotOptimize(map.find(pid));
    }
}

using LibraryCase = std::function<void(benchmark::State&, LogConfiguration)>;
using Floor = std::function<void(benchmark::State&)>;

// The floor first, then the case under each log configuration: NAME/floor, NAME/silenced, ...
void registerCase(const std::string& name, const LibraryCase& libraryCase, const Floor& floor) {
    benchmark::RegisterBenchmark((name + "/floor").c_str(), floor);
    for (LogConfiguration configuration : dlp::benchmarks::kLogConfigurations) {
        std::string fullName = name + "/" + dlp::benchmarks::logConfigurationName(configuration);
        benchmark::RegisterBenchmark(fullName.c_str(), libraryCase, configuration);
    }
}

void registerCases() {
    using std::placeholders::_1;
    using std::placeholders::_2;
    registerCase("command4_protected", std::bind(fileOpen, _1, _2, true),
                 std::bind(fileOpenFloor, _1, true));
    registerCase("command4_unprotected", std::bind(fileOpen, _1, _2, false),
                 std::bind(fileOpenFloor, _1, false));
    registerCase("create_inheriting", inheritingCreate, inheritingCreateFloor);
    registerCase("create_rejected", rejectedCreate, rejectedCreateFloor);
    registerCase("create_zip_copy", zipCopy, zipCopyFloor);
    registerCase("get_time_cached", cachedDuration, cachedDurationFloor);
    for (const char* extension : {"docx", "doc"}) {
        for (int processCount : kProcessCounts) {
            std::string name =
                    std::string(extension) == "docx" ? "map_get_exact/" : "map_get_related/";
            name += std::to_string(processCount);
            registerCase(name, std::bind(mapLookup, _1, _2, processCount, std::string(extension)),
                         std::bind(mapLookupFloor, _1, processCount));
        }
    }
}

}  // namespace

int main(int argc, char** argv) {
    dlp::benchmarks::rememberStartingLogSettings();
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
    if (!dlp::test::databaseIsThrowaway()) {
        printf("/data/system/users is not a throwaway tmpfs: run inside tools/dlp-sandbox\n");
        return 77;
    }
    try {
        Scene built;
        scene = &built;
        if (runCommandVector(
                    {"3", std::to_string(kContainerId), std::to_string(kDurationSeconds)}) != 0) {
            printf("command 3 could not store the container's duration\n");
            return 1;
        }
        // Building a population starts threads, and glibc leaves its single-threaded shortcuts
        // for good once a process has had a second thread: every case runs after that, as in
        // the library's multi-threaded callers.
        for (int processCount : kProcessCounts) {
            dlp::benchmarks::useProcessMapPopulation(processCount);
        }
        dlp::benchmarks::useProcessMapPopulation(0);
        registerCases();
        benchmark::RunSpecifiedBenchmarks();
        scene = nullptr;
    } catch (const std::exception& error) {
        printf("cannot set the benchmark up: %s\n", error.what());
        return 1;
    }
    benchmark::Shutdown();
    return 0;
}
