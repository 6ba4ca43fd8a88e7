// A rotation that removes many versions of many files, beside `rm -rf` of the same folders. Both
// flush the file system at the end, and both find it flushed at the start.
//
// BENCH_TARGET (default /tmp) is where the versions are made: set it to a mounted test disk.
// BENCH_VERSIONS (default 256) and BENCH_FILES (default 2000) are their number and size.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "db/log-db.h"
#include "db/task-info.h"
#include "host/host-paths.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "strategy/rotation-handler.h"
#include "utils/confined-path.h"

namespace {

namespace fs = std::filesystem;

constexpr int KEPT = 8;
constexpr int FILES_PER_FOLDER = 100;
constexpr uint32_t NOW = 1800000000;

int NumberFrom(const char* variable, int fallback) {
    const char* value = std::getenv(variable);
    return value != nullptr ? std::atoi(value) : fallback;
}

class Versions {
public:
    Versions() {
        const char* target = std::getenv("BENCH_TARGET");
        m_root = std::string(target != nullptr ? target : "/tmp") + "/rotation-bench";
        fs::remove_all(m_root);
        fs::create_directories(m_root + "/share");
        fs::create_directories(m_root + "/@Ferrix/task/1");
        FILE* conf = fopen((m_root + "/host.conf").c_str(), "we");
        fprintf(conf, "[share bench]\npath = %s/share\n", m_root.c_str());
        fclose(conf);
        keld_host::HostPaths paths;
        paths.hostConf = m_root + "/host.conf";
        keld_host::SetPaths(paths);
        fs::create_directories(m_root + "/etc");
        SetPackageFolderForTest(m_root);
        if (!SetRepoVolPath(m_root)) std::abort();
        if (LogDB::GetInstance().Init(m_root + "/log-db.sqlite") < 0) std::abort();
        for (int n = 0; n < NumberFrom("BENCH_VERSIONS", 256); ++n) Make(n);
        Flush();
    }
    ~Versions() {
        LogDB::GetInstance().Close();
        SetPackageFolderForTest("");
        keld_host::SetPaths({});
        fs::remove_all(m_root);
    }
    Versions(const Versions&) = delete;
    Versions& operator=(const Versions&) = delete;

    // The folders that a rotation removes, the oldest first.
    [[nodiscard]] std::vector<std::string> Old() const {
        return {m_paths.begin(), m_paths.end() - KEPT};
    }
    [[nodiscard]] std::string Share() const { return m_root + "/share"; }
    [[nodiscard]] bool IsRotated() const {
        const auto entries = fs::directory_iterator(Share());
        return std::distance(fs::begin(entries), fs::end(entries)) == KEPT;
    }
    void Flush() const {
        const int fd = open(m_root.c_str(), O_RDONLY | O_CLOEXEC);
        if (syncfs(fd) != 0) std::abort();
        close(fd);
    }

private:
    void Make(int number) {
        char name[64];
        snprintf(name, sizeof(name), "Ferrix Copy_2024-01-%02d_%02d0000", 1 + number / 24,
                 number % 24);
        m_paths.push_back(Share() + "/" + name);
        fs::create_directory(m_paths.back());
        std::string folder;
        for (int n = 0; n < NumberFrom("BENCH_FILES", 2000); ++n) {
            if (n % FILES_PER_FOLDER == 0) {
                folder = m_paths.back() + "/folder-" + std::to_string(n / FILES_PER_FOLDER);
                fs::create_directory(folder);
            }
            const std::string path = folder + "/img-" + std::to_string(n) + ".jpg";
            const int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
            if (write(fd, path.data(), path.size()) < 0) std::abort();
            close(fd);
        }
    }

    std::string m_root;
    std::vector<std::string> m_paths;
};

template <typename Work>
void Measure(benchmark::State& state, const Work& work) {
    for (auto _ : state) {
        const Versions versions;
        const auto start = std::chrono::steady_clock::now();
        work(versions);
        versions.Flush();
        const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - start;
        state.SetIterationTime(seconds.count());
        if (!versions.IsRotated()) state.SkipWithError("not removed");
    }
}

void Rotation(benchmark::State& state) {
    Measure(state, [&](const Versions& versions) {
        TaskRunInfo task;
        task.task_id = 1;
        task.task_name = "bench";
        task.copy_strategy = COPY_STRATEGY_VERSION;
        task.dst_dir_path = versions.Share();
        task.dst_root = std::make_shared<ConfinedRoot>(versions.Share());
        task.max_version_count = KEPT;
        task.rotation_policy = ROTATION_POLICY_OLDEST;
        RotationHandler rotation(NOW);
        rotation.Init(task);
        if (rotation.Run() < 0) state.SkipWithError("rotation failed");
    });
}

void RmRf(benchmark::State& state) {
    Measure(state, [&](const Versions& versions) {
        std::string command = "rm -rf";
        for (const std::string& path : versions.Old()) command += " '" + path + "'";
        if (system(command.c_str()) != 0) state.SkipWithError("rm failed");
    });
}

BENCHMARK(RmRf)->UseManualTime()->Iterations(1)->Unit(benchmark::kMillisecond);
BENCHMARK(Rotation)->UseManualTime()->Iterations(1)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
