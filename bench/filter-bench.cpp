// What a check against long lists costs: 200 names and 200 extensions, black and white.
// The goal is under 5 microseconds.
#include <benchmark/benchmark.h>
#include <unistd.h>

#include <cstdlib>
#include <string>

#include "filter/file-filter.h"

namespace {

constexpr int kItems = 200;

FileFilter::Strings Items(const char* stem) {
    FileFilter::Strings items;
    for (int i = 0; i < kItems; ++i) items.push_back(stem + std::to_string(i * 7919));
    return items;
}

// A filter with both lists; every path of the benchmarks passes, so that no check ends early.
class Filter {
public:
    Filter(const FileFilter::Strings& white_names, const FileFilter::Strings& white_exts) {
        char pattern[] = "/tmp/ferrix-bench-XXXXXX";
        const int fd = mkstemp(pattern);
        if (fd >= 0) close(fd);
        if (FileFilter::WriteBlackList(pattern, Items("Excluded Folder "), Items("ext")) != 0 ||
            m_filter.LoadBlackList(pattern) != 0 ||
            FileFilter::WriteWhiteList(pattern, white_names, white_exts) != 0 ||
            m_filter.LoadWhiteList(pattern) != 0) {
            std::abort();
        }
        unlink(pattern);
    }
    FileFilter& Get() { return m_filter; }

private:
    FileFilter m_filter;
};

void Check(benchmark::State& state, FileFilter& filter, const std::string& path, bool is_dir) {
    if (filter.Check(path, is_dir) != 0) state.SkipWithError("the path is refused");
    for (auto _ : state) benchmark::DoNotOptimize(filter.Check(path, is_dir));
}

void CheckFileInFourFolders(benchmark::State& state) {
    Filter filter({"*"}, Items("white"));
    Check(state, filter.Get(), "/Photos/2024/Summer holidays/Day 12/IMG_20240712_101533.JPG",
          false);
}
BENCHMARK(CheckFileInFourFolders);

void CheckFileThatPassesByTheLastWhiteRule(benchmark::State& state) {
    FileFilter::Strings names = Items("Included Folder ");
    names.push_back("day 12");
    Filter filter(names, Items("white"));
    Check(state, filter.Get(), "/Photos/2024/Summer holidays/Day 12/IMG_20240712_101533.JPG",
          false);
}
BENCHMARK(CheckFileThatPassesByTheLastWhiteRule);

void CheckFolder(benchmark::State& state) {
    Filter filter({"*"}, {});
    Check(state, filter.Get(), "/Photos/2024/Summer holidays/Day 12", true);
}
BENCHMARK(CheckFolder);

void CheckFileTwoHundredFoldersDeep(benchmark::State& state) {
    Filter filter({"*"}, {});
    std::string path;
    for (int i = 0; i < 200; ++i) path += "/folder";
    Check(state, filter.Get(), path + "/file.txt", false);
}
BENCHMARK(CheckFileTwoHundredFoldersDeep);

}  // namespace

BENCHMARK_MAIN();
