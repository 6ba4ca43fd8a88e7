// What it costs to add the names of one folder in random order and to read them back in order,
// beside sorting the same names in a std::vector. The goal for 1,000,000 names is a factor of 3.
// Run with --benchmark_repetitions=5 and compare the medians.
#include <benchmark/benchmark.h>
#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#include "utils/file-list.h"

namespace {

// Names as cameras and people give them, about 20 characters, in random order.
std::vector<std::string> Names(size_t count) {
    std::vector<std::string> names;
    names.reserve(count);
    for (size_t i = 0; i < count; ++i) {
        names.push_back((i % 2 == 0 ? "IMG_20240712_" : "Document no. ") +
                        std::to_string(1000000 + i) + ".jpg");
    }
    std::shuffle(names.begin(), names.end(), std::mt19937(4711));
    return names;
}

void SortVector(benchmark::State& state) {
    const auto names = Names(static_cast<size_t>(state.range(0)));
    for (auto _ : state) {
        state.PauseTiming();
        std::vector<std::string> copy = names;
        state.ResumeTiming();
        std::sort(copy.begin(), copy.end());
        benchmark::DoNotOptimize(copy.data());
        state.PauseTiming();
        copy = {};
        state.ResumeTiming();
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(SortVector)->Arg(1000)->Arg(100000)->Arg(1000000)->Unit(benchmark::kMillisecond);

size_t HeapBytes() {
    const struct mallinfo2 info = mallinfo2();
    return info.uordblks + info.hblkhd;
}

void AddAndReadBack(benchmark::State& state) {
    const auto names = Names(static_cast<size_t>(state.range(0)));
    size_t bytes = 0;
    for (auto _ : state) {
        const size_t before = HeapBytes();
        NamePool pool;
        FileList list(pool);
        for (const std::string& name : names) {
            if (list.AddFile(FileList::ROOT, name, 1, 2) != 0) std::abort();
        }
        size_t count = 0;
        size_t length = 0;
        for (auto it = list.begin(); it != list.end(); it.next(), ++count)
            length += it->path.size();
        benchmark::DoNotOptimize(length);
        if (count != names.size()) std::abort();
        bytes = HeapBytes() - before;
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
    state.counters["bytes_per_name"] =
        static_cast<double>(bytes) / static_cast<double>(names.size());
}
BENCHMARK(AddAndReadBack)->Arg(1000)->Arg(100000)->Arg(1000000)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
