// The event tree with a folder full of waiting copies: the time of one event from push to done, and
// the heap that one waiting event takes.
//
// Log lines are formatted as always and then dropped (LogSetSink), so that what is measured is our
// work and not the log daemon's. Heap growth is what the allocator says is in use (mallinfo2), its
// own headers and rounding included.
//
// Goals: the time for an event does not grow by more than half between 10,000 and 1,000,000 events;
// at most 256 bytes for each waiting event with 20-character names on a 64-bit machine.

#include <benchmark/benchmark.h>
#include <malloc.h>

#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "event/event-manager.h"
#include "event/event-peatree.h"
#include "event/event-pool-peatree.h"
#include "processor/processor.h"
#include "utils/log.h"

namespace {

constexpr uint64_t kTaskId = 7;

size_t HeapInUse() {
    const struct mallinfo2 info = mallinfo2();
    return info.uordblks + info.hblkhd;
}

// "/folder/" and a name of 20 characters.
std::string FilePath(int64_t i) {
    char path[64];
    std::snprintf(path, sizeof(path), "/folder/photo_%010lld.jpg", static_cast<long long>(i));
    return path;
}

Event CopyOf(std::string path) { return {EV_COPY, WAITTING, kTaskId, std::move(path), 0}; }

void DropLog() {
    LogSetSink([](int, std::string_view) {});
}

void SetPerEvent(benchmark::State& state, int64_t count, size_t heap) {
    state.SetItemsProcessed(state.iterations() * count);
    state.counters["time_per_event"] =
        benchmark::Counter(static_cast<double>(state.iterations() * count),
                           benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
    state.counters["bytes_per_waiting_event"] =
        static_cast<double>(heap) / static_cast<double>(count);
}

// Push all, then pop and finish one after the other, in the tree alone.
void BM_Tree(benchmark::State& state) {
    DropLog();
    const int64_t count = state.range(0);
    size_t heap = 0;
    for (auto step : state) {
        EventPeaTree tree;
        const size_t before = HeapInUse();
        for (int64_t i = 0; i < count; ++i) tree.Push(CopyOf(FilePath(i)));
        heap = HeapInUse() - before;
        Event event;
        while (tree.Pop(event) == 1) tree.Done(event);
        if (!tree.IsEmpty()) state.SkipWithError("events were left");
    }
    SetPerEvent(state, count, heap);
}

// The same through the manager and its pool, as the daemon does it.
void BM_Manager(benchmark::State& state) {
    DropLog();
    const int64_t count = state.range(0);
    size_t heap = 0;
    for (auto step : state) {
        EventManager manager;
        Processor worker;
        const size_t before = HeapInUse();
        for (int64_t i = 0; i < count; ++i) manager.PushEvent(CopyOf(FilePath(i)));
        heap = HeapInUse() - before;
        Event event;
        while (manager.PullEvent(&worker, event) == 1) manager.DoneEvent(&worker);
        if (manager.GetEventCount(kTaskId) != 0) state.SkipWithError("events were left");
    }
    SetPerEvent(state, count, heap);
}

// Files spread over many folders that have no event of their own any more: each search has to get
// past them.
void BM_ManyFolders(benchmark::State& state) {
    DropLog();
    const int64_t folders = state.range(0);
    constexpr int64_t kFiles = 100000;
    size_t heap = 0;
    for (auto step : state) {
        EventPeaTree tree;
        const size_t before = HeapInUse();
        for (int64_t i = 0; i < kFiles; ++i) {
            tree.Push(CopyOf("/folder" + std::to_string(i % folders) + FilePath(i)));
        }
        heap = HeapInUse() - before;
        Event event;
        while (tree.Pop(event) == 1) tree.Done(event);
        if (!tree.IsEmpty()) state.SkipWithError("events were left");
    }
    SetPerEvent(state, kFiles, heap);
}

// A full pool is dropped at once.
void BM_Drop(benchmark::State& state) {
    DropLog();
    const int64_t count = state.range(0);
    for (auto step : state) {
        state.PauseTiming();
        EventPeaTree tree;
        for (int64_t i = 0; i < count; ++i) tree.Push(CopyOf(FilePath(i)));
        state.ResumeTiming();
        tree.Clear();
    }
    SetPerEvent(state, count, 0);
}

}  // namespace

BENCHMARK(BM_Tree)->RangeMultiplier(10)->Range(1000, 1000000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Manager)->RangeMultiplier(10)->Range(1000, 1000000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_ManyFolders)->Arg(1)->Arg(100)->Arg(10000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Drop)->Arg(10000)->Arg(1000000)->Unit(benchmark::kMillisecond);
BENCHMARK_MAIN();
