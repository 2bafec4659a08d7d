#pragma once

#include <vector>

namespace dlp::benchmarks {

// Tracked processes, each having opened a pdf and then a docx that expire in a week.
struct ProcessMapPopulation {
    std::vector<int> lookupOrder;  // every pid once, shuffled apart from the insertion order
    double heapBytesPerEntry = 0;
};

// Makes the library's map hold the population of `processCount` pids, built on first use;
// 0 stands for the map of the scenes' own pids. The map it replaces is kept for its next use:
// swapping the maps is cheap enough to interleave cases of different sizes.
const ProcessMapPopulation& useProcessMapPopulation(int processCount);

}  // namespace dlp::benchmarks
