// Cost of one copied file: small and large, inside one file system and between two, beside the
// plain open, read, write and close that cannot be avoided.
//
// BENCH_TARGET (default /tmp) is where files are copied to; sources lie there too, or, for copies
// between two file systems, in BENCH_SOURCE (default /dev/shm). Set them to mounted test disks for
// numbers about those.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <keld/copy.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "host/host-paths.h"

namespace {

namespace fs = std::filesystem;
constexpr int64_t SMALL_SIZE = 33000;
constexpr int64_t LARGE_SIZE = int64_t{256} << 20;
// So many names are used in turn: a folder that grows for ever would be measured instead.
constexpr int NAMES = 1000;

std::string FolderFrom(const char* variable, const char* fallback) {
    const char* value = std::getenv(variable);
    return value != nullptr ? value : fallback;
}

// Two shares with a source file in each and an empty target folder.
class CopyBench {
public:
    explicit CopyBench(int64_t size) {
        WriteSource(m_near / "source", size);
        WriteSource(m_far / "source", size);
        const std::string conf = m_near / "host.conf";
        FILE* file = fopen(conf.c_str(), "we");
        fprintf(file, "[share near]\npath = %s\n[share far]\npath = %s\n", m_near.c_str(),
                m_far.c_str());
        fclose(file);
        keld_host::HostPaths paths;
        paths.hostConf = conf;
        keld_host::SetPaths(paths);
        EmptyTarget();
    }
    ~CopyBench() {
        keld_host::SetPaths({});
        fs::remove_all(m_near);
        fs::remove_all(m_far);
    }
    CopyBench(const CopyBench&) = delete;
    CopyBench& operator=(const CopyBench&) = delete;

    void EmptyTarget() const {
        fs::remove_all(m_near / "target");
        fs::create_directory(m_near / "target");
        sync();
    }
    [[nodiscard]] std::string Source(bool is_near) const {
        return (is_near ? m_near : m_far) / "source";
    }
    [[nodiscard]] std::string Target(int number) const {
        return m_near / "target" / ("file-" + std::to_string(number));
    }

private:
    static fs::path MakeFolder(const std::string& base) {
        std::string pattern = base + "/copy-bench-XXXXXX";
        if (mkdtemp(pattern.data()) == nullptr) abort();
        return pattern;
    }
    static void WriteSource(const fs::path& path, int64_t size) {
        const std::vector<char> block(1 << 20, 'x');
        FILE* file = fopen(path.c_str(), "we");
        for (int64_t at = 0; at < size; at += static_cast<int64_t>(block.size())) {
            const auto left = static_cast<size_t>(size - at);
            fwrite(block.data(), 1, std::min(block.size(), left), file);
        }
        fclose(file);
    }

    const fs::path m_near = MakeFolder(FolderFrom("BENCH_TARGET", "/tmp"));
    const fs::path m_far = MakeFolder(FolderFrom("BENCH_SOURCE", "/dev/shm"));
};

bool CopyByPlatform(const std::string& from, const std::string& to) {
    const KELDCopyOptions options{1, 0, 1, 0, 1, 0, 0, 0, 1024, 100, 0};
    return KELDFileCopy_r(from.c_str(), to.c_str(), &options, nullptr) == 0;
}

// What any copy has to do, straight into the final name.
bool CopyPlainly(const std::string& from, const std::string& to) {
    static std::vector<char> buffer(128 * 1024);
    const int in = open(from.c_str(), O_RDONLY | O_CLOEXEC);
    const int out = open(to.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    ssize_t got = 0;
    bool is_good = in >= 0 && out >= 0;
    while (is_good && (got = read(in, buffer.data(), buffer.size())) > 0) {
        is_good = write(out, buffer.data(), static_cast<size_t>(got)) == got;
    }
    close(in);
    return close(out) == 0 && is_good && got == 0;
}

using CopyFunction = bool (*)(const std::string& from, const std::string& to);

void NewFiles(benchmark::State& state, CopyFunction copy, int64_t size, bool is_near) {
    const CopyBench bench(size);
    const std::string source = bench.Source(is_near);
    const int names = size == SMALL_SIZE ? NAMES : 4;
    int number = 0;
    for (auto _ : state) {
        if (!copy(source, bench.Target(number++))) state.SkipWithError("a copy failed");
        if (number < names) continue;
        state.PauseTiming();
        bench.EmptyTarget();
        number = 0;
        state.ResumeTiming();
    }
    state.SetBytesProcessed(state.iterations() * size);
}

void ReplacedFiles(benchmark::State& state) {
    const CopyBench bench(SMALL_SIZE);
    int number = 0;
    for (int i = 0; i < NAMES; ++i) CopyByPlatform(bench.Source(false), bench.Target(i));
    for (auto _ : state) {
        number = (number + 1) % NAMES;
        if (!CopyByPlatform(bench.Source(false), bench.Target(number))) {
            state.SkipWithError("a copy failed");
        }
    }
}

BENCHMARK_CAPTURE(NewFiles, small_between, CopyByPlatform, SMALL_SIZE, false)->UseRealTime();
BENCHMARK_CAPTURE(NewFiles, small_between_plainly, CopyPlainly, SMALL_SIZE, false)->UseRealTime();
BENCHMARK_CAPTURE(NewFiles, small_inside, CopyByPlatform, SMALL_SIZE, true)->UseRealTime();
BENCHMARK_CAPTURE(NewFiles, small_inside_plainly, CopyPlainly, SMALL_SIZE, true)->UseRealTime();
BENCHMARK(ReplacedFiles)->UseRealTime();
BENCHMARK_CAPTURE(NewFiles, large_between, CopyByPlatform, LARGE_SIZE, false)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(NewFiles, large_between_plainly, CopyPlainly, LARGE_SIZE, false)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(NewFiles, large_inside, CopyByPlatform, LARGE_SIZE, true)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(NewFiles, large_inside_plainly, CopyPlainly, LARGE_SIZE, true)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
