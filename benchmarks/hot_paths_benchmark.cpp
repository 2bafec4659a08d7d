// The library runs on every file open and create of the device: these print what they cost.
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/expiry_attribute.h>
#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/new_file_expiry.h>
#include <dlp_sdk/process_map.h>

#include <android/log.h>
#include <benchmark/benchmark.h>
#include <malloc.h>
#include <unistd.h>

#include <cstdio>
#include <ctime>
#include <string>

#include "support/child_process.h"

namespace {

constexpr int kContainerId = 120;

// Messages are formatted as on a device, but go nowhere.
void discardMessage(const __android_logger_data*, const char*) {}

class ScratchFile {
  public:
    explicit ScratchFile(const char* name) : path_(std::string("/tmp/dlp-benchmark-") + name) {
        FILE* file = fopen(path_.c_str(), "we");
        if (file != nullptr) fclose(file);
    }
    ~ScratchFile() { unlink(path_.c_str()); }
    char* path() { return path_.data(); }

  private:
    std::string path_;
};

void FileOpenOfProtectedFile(benchmark::State& state) {
    ScratchFile file("protected.pdf");
    set_dlp_file_expiry_time(file.path(), time(nullptr) + 3600);
    for (auto _ : state) benchmark::DoNotOptimize(addOrUpdateMapEntry(4242, file.path()));
    mProcessMap.remove(4242);
}
BENCHMARK(FileOpenOfProtectedFile);

void FileOpenOfUnprotectedFile(benchmark::State& state) {
    ScratchFile file("plain.pdf");
    for (auto _ : state) benchmark::DoNotOptimize(addOrUpdateMapEntry(4243, file.path()));
}
BENCHMARK(FileOpenOfUnprotectedFile);

// A whitelisted app is named from /proc on every create; the inherited expiry is written.
void NewFileInheritedByWhitelistedApp(benchmark::State& state) {
    dlp::test::ChildProcess office("com.hancom.office.editor");
    ScratchFile opened("opened.docx");
    ScratchFile created("created.doc");
    set_dlp_file_expiry_time(opened.path(), time(nullptr) + 3600);
    addOrUpdateMapEntry(office.pid(), opened.path());
    for (auto _ : state) {
        benchmark::DoNotOptimize(setExpiryforFile(office.pid(), created.path(), kContainerId));
    }
    mProcessMap.remove(office.pid());
}
BENCHMARK(NewFileInheritedByWhitelistedApp);

// A rejected app is answered from the reject list; the duration comes from the cache.
void NewFileOfOtherApp(benchmark::State& state) {
    dlp::test::ChildProcess other("org.example.viewer");
    ScratchFile opened("viewed.pdf");
    ScratchFile created("saved.pdf");
    set_expiryAfter_time(kContainerId, 86400);
    set_dlp_file_expiry_time(opened.path(), time(nullptr) + 3600);
    addOrUpdateMapEntry(other.pid(), opened.path());
    for (auto _ : state) {
        benchmark::DoNotOptimize(setExpiryforFile(other.pid(), created.path(), kContainerId));
    }
    mProcessMap.remove(other.pid());
}
BENCHMARK(NewFileOfOtherApp);

// Lookup cost and heap held with many tracked processes, five entries each.
void LookupAmongTrackedProcesses(benchmark::State& state) {
    const int processes = static_cast<int>(state.range(0));
    const char* extensions[] = {"pdf", "docx", "xlsx", "pptx", "jpg"};
    size_t heapBefore = mallinfo2().uordblks;
    for (int pid = 100000; pid < 100000 + processes; ++pid) {
        for (const char* extension : extensions) {
            mProcessMap.put(pid, MapEntry{pid, extension, time(nullptr) + 3600, time(nullptr)});
        }
    }
    size_t heapAfter = mallinfo2().uordblks;
    int pid = 100000;
    for (auto _ : state) {
        benchmark::DoNotOptimize(mProcessMap.get(pid, "doc"));
        if (++pid == 100000 + processes) pid = 100000;
    }
    state.counters["heap_bytes_per_entry"] =
            static_cast<double>(heapAfter - heapBefore) / (processes * 5.0);
    for (int removed = 100000; removed < 100000 + processes; ++removed) {
        mProcessMap.remove(removed);
    }
}
BENCHMARK(LookupAmongTrackedProcesses)->Arg(100)->Arg(10000);

}  // namespace

int main(int argc, char** argv) {
    __android_log_set_logger(discardMessage);
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return 0;
}
