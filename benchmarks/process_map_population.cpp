#include "process_map_population.h"

#include <dlp_sdk/file_open_tracking.h>
#include <dlp_sdk/process_map.h>

#include <benchmark/benchmark.h>
#include <malloc.h>
#include <pthread.h>

#include <algorithm>
#include <functional>
#include <map>
#include <memory>
#include <numeric>
#include <random>
#include <stdexcept>
#include <vector>

#include "log_configuration.h"
#include "primitives/library_lock.h"

namespace dlp::benchmarks {

namespace {

// Valid pids that no process of the sandbox reaches.
constexpr int kFirstPid = 1000000;
constexpr int64_t kWeekSeconds = 7 * 86400;
const char* const kOpenedExtensions[] = {"pdf", "docx"};

struct StoredPopulation {
    ProcessMapPopulation population;
    std::map<int, std::vector<MapEntry>> parkedMap;
};

std::map<int, StoredPopulation>& storedPopulations() {
    static std::map<int, StoredPopulation> populations;
    return populations;
}

int loadedProcessCount = 0;

// Unlike std::thread, allocates nothing on the calling thread.
void runOnFreshThread(std::function<void()> work) {
    pthread_t thread;
    auto run = [](void* argument) -> void* {
        (*static_cast<std::function<void()>*>(argument))();
        return nullptr;
    };
    if (pthread_create(&thread, nullptr, run, &work) != 0) {
        throw std::runtime_error("cannot start a thread");
    }
    pthread_join(thread, nullptr);
}

void fill(ProcessMapPopulation& population, int processCount) {
    std::mt19937 random(static_cast<unsigned>(processCount));
    std::vector<int> pids(processCount);
    std::iota(pids.begin(), pids.end(), kFirstPid);
    std::shuffle(pids.begin(), pids.end(), random);
    int64_t now = getCurrentTimeInSec();
    applyLogConfiguration(LogConfiguration::kSilenced);
    // A fresh thread starts with an empty glibc thread cache and gives it back when it ends, so
    // chunks that wait there freed, before or after, count neither as taken nor as in use. Its
    // arena's own bookkeeping counts as in use too: a first thread sets that arena up, and the
    // filling thread takes it over.
    runOnFreshThread([] { benchmark::DoNotOptimize(std::make_unique<int>()); });
    size_t heapBefore = mallinfo2().uordblks;
    runOnFreshThread([&] {
        dlp::LibraryLockGuard guard;
        for (int pid : pids) {
            for (const char* extension : kOpenedExtensions) {
                mProcessMap.put(pid, MapEntry{pid, extension, now + kWeekSeconds, now});
            }
        }
    });
    size_t heapAfter = mallinfo2().uordblks;
    population.heapBytesPerEntry =
            static_cast<double>(heapAfter - heapBefore) /
            (static_cast<double>(processCount) * std::size(kOpenedExtensions));
    std::shuffle(pids.begin(), pids.end(), random);
    population.lookupOrder = std::move(pids);
}

}  // namespace

const ProcessMapPopulation& useProcessMapPopulation(int processCount) {
    auto& populations = storedPopulations();
    if (processCount != loadedProcessCount) {
        dlp::LibraryLockGuard guard;
        populations[loadedProcessCount].parkedMap.swap(HashMap::mInternalProcessMap);
        HashMap::mInternalProcessMap.swap(populations[processCount].parkedMap);
        HashMap::mMapIterator = HashMap::mInternalProcessMap.end();
        loadedProcessCount = processCount;
    }
    ProcessMapPopulation& population = populations[processCount].population;
    if (processCount > 0 && population.lookupOrder.empty()) fill(population, processCount);
    return population;
}

}  // namespace dlp::benchmarks
