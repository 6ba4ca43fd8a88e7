// What the operations of a file database cost with ten thousand rows and with a million: a lookup
// by either path, a write, the lists of a folder of 100 files and of a root of 10 folders.
#include <benchmark/benchmark.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <memory>
#include <random>
#include <string>

#include "db/file-db.h"
#include "utils/file-list.h"
#include "utils/log.h"

namespace {

constexpr int64_t kFilesInFolder = 100;
constexpr int64_t kFoldersInRoot = 10;

void Drop(int /*priority*/, std::string_view /*line*/) {}

std::string FolderOf(int64_t file) {
    const int64_t folder = file / kFilesInFolder;
    return "/card" + std::to_string(folder % kFoldersInRoot) + "/" +
           std::to_string(100000 + folder);
}

std::string SourceOf(int64_t file) {
    return FolderOf(file) + "/IMG_" + std::to_string(1000000 + file) + ".JPG";
}

std::string DestinationOf(int64_t file) {
    return "/2023-05-06/2023-05-06_" + std::to_string(1000000 + file * 7919 % 1000003) + ".JPG";
}

// A database of `rows` files with their folders, made once for all benchmarks.
class Filled {
public:
    explicit Filled(int64_t count) : rows(count) {
        char folder[] = "/tmp/file-db-bench.XXXXXX";
        if (mkdtemp(folder) == nullptr) std::abort();
        m_folder = folder;
        const std::string path = m_folder + "/file-db.sqlite";
        if (db.Init(path) < 0) std::abort();
        Fill(path);
    }
    ~Filled() {
        db.Close();
        std::filesystem::remove_all(m_folder);
    }

    FileDB db;
    const int64_t rows;
    std::mt19937_64 random{1};

private:
    void Fill(const std::string& path) const {
        sqlite3* raw = nullptr;
        sqlite3_stmt* insert = nullptr;
        sqlite3_open(path.c_str(), &raw);
        sqlite3_exec(raw, "BEGIN", nullptr, nullptr, nullptr);
        sqlite3_prepare_v2(raw,
                           "INSERT OR IGNORE INTO file_info_table (source_path, destination_path, "
                           "file_type, size, mtime) VALUES (?1, ?2, ?3, 5, 6)",
                           -1, &insert, nullptr);
        for (int64_t n = 0; n < rows; ++n) {
            if (n % kFilesInFolder == 0) Insert(insert, FolderOf(n), "", 1);
            if (n < kFoldersInRoot) Insert(insert, "/card" + std::to_string(n), "", 1);
            Insert(insert, SourceOf(n), DestinationOf(n), 0);
        }
        sqlite3_finalize(insert);
        sqlite3_exec(raw, "DELETE FROM unproven_table; COMMIT; PRAGMA wal_checkpoint(TRUNCATE)",
                     nullptr, nullptr, nullptr);
        sqlite3_close(raw);
    }
    static void Insert(sqlite3_stmt* insert, const std::string& source,
                       const std::string& destination, int type) {
        sqlite3_bind_text(insert, 1, source.c_str(), -1, SQLITE_TRANSIENT);
        sqlite3_bind_text(insert, 2, destination.c_str(), -1, SQLITE_TRANSIENT);
        sqlite3_bind_int(insert, 3, type);
        if (sqlite3_step(insert) != SQLITE_DONE) std::abort();
        sqlite3_reset(insert);
    }

    std::string m_folder;
};

Filled& FilledWith(int64_t rows) {
    static std::map<int64_t, std::unique_ptr<Filled>> all;
    auto& filled = all[rows];
    if (!filled) filled = std::make_unique<Filled>(rows);
    return *filled;
}

int64_t RandomFile(Filled& filled) {
    return static_cast<int64_t>(filled.random() % static_cast<uint64_t>(filled.rows));
}

void BySource(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    FileInfo info;
    for (auto _ : state) {
        if (filled.db.GetFileInfoBySourcePath(SourceOf(RandomFile(filled)), info) != 1)
            std::abort();
    }
}

void ByDestination(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    FileInfo info;
    for (auto _ : state) {
        const std::string path = DestinationOf(RandomFile(filled));
        if (filled.db.GetFileInfoByDestinationPath(path, info) != 1) std::abort();
    }
}

void Upsert(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    uint32_t time = 0;
    for (auto _ : state) {
        const int64_t file = RandomFile(filled);
        const FileInfo info{SourceOf(file), DestinationOf(file), FILE_INFO_FILE, 7, ++time};
        if (filled.db.SetFileInfoBySourcePath(info) != 0) std::abort();
    }
}

// New rows as a run writes them: in batches, one folder after the other, proven every 500.
void Insert(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    static int64_t next = 100000000;
    for (auto _ : state) {
        const int64_t file = ++next;
        const FileInfo info{SourceOf(file), DestinationOf(file), FILE_INFO_FILE, 7, 8};
        if (filled.db.SetFileInfoInBatch(info) != 0) std::abort();
        if (next % 500 != 0) continue;
        int64_t mark = 0;
        if (filled.db.GetUnprovenMark(mark) < 0 || filled.db.ProveFileInfo(mark) < 0) std::abort();
    }
}

void List(Filled& filled, const std::string& path, size_t count) {
    NamePool pool;
    FileList list(pool);
    if (filled.db.GetFileListBySourcePath(path, false, list) != 0) std::abort();
    if (list.FileCount(FileList::ROOT) + list.DirCount(FileList::ROOT) < count) std::abort();
}

void ListFolder(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    for (auto _ : state) List(filled, FolderOf(RandomFile(filled)), kFilesInFolder);
}

void ListRoot(benchmark::State& state) {
    Filled& filled = FilledWith(state.range(0));
    for (auto _ : state) List(filled, "/", kFoldersInRoot);
}

// Pictures of one second: what the name of the next one costs when N have theirs.
void NextNumber(benchmark::State& state) {
    Filled filled(100);
    FileInfo info;
    for (int64_t n = 1; n <= state.range(0); ++n) {
        info.source_path = "/s" + std::to_string(n);
        info.destination_path = FileDB::NumberedPath("/x", "JPG", static_cast<uint64_t>(n));
        if (filled.db.SetFileInfoBySourcePath(info) != 0) std::abort();
    }
    uint64_t number = 0;
    for (auto _ : state) {
        if (filled.db.GetFreeNumber("/x", "JPG", number) != 0) std::abort();
    }
}

BENCHMARK(BySource)->Arg(10000)->Arg(1000000);
BENCHMARK(ByDestination)->Arg(10000)->Arg(1000000);
BENCHMARK(ListFolder)->Arg(10000)->Arg(1000000);
BENCHMARK(ListRoot)->Arg(10000)->Arg(1000000);
BENCHMARK(Upsert)->Arg(10000)->Arg(1000000);
BENCHMARK(Insert)->Arg(10000)->Arg(1000000);
BENCHMARK(NextNumber)->Arg(10)->Arg(10000);

}  // namespace

int main(int argc, char** argv) {
    LogSetSink(Drop);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
}
