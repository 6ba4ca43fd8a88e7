// Whole mirror runs over random trees, worked off by hand: the destination must equal the source,
// and the recycle bin must hold exactly what was replaced or removed.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <map>
#include <random>
#include <set>

#include "event/event-generator.h"
#include "event/event-manager.h"
#include "strategy-fixture.h"

namespace fs = std::filesystem;

namespace {

using testing::IsEmpty;

// Names that have been trouble somewhere; all are in the normal form that events need.
const char* const NAMES[] = {"a",        "b.txt", "B.TXT",       "with space ", " lead", "%s%n",
                             "l\nf",     "it's",  "\"q\"",       "a b.tar.gz",  ".hid",  "\xc3\xa9",
                             "\xff\xfe", "-rf",   "back\\slash", "~",           "x;y",   "*"};

class MirrorRunTest : public StrategyFixture {
protected:
    void EnableBin() { m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true}); }
    size_t Random(size_t below) { return m_random() % below; }
    std::string RandomName() {
        return std::string(NAMES[Random(std::size(NAMES))]) +
               (Random(3) == 0 ? std::to_string(Random(4)) : "");
    }
    std::string RandomContent() {
        std::string content(Random(6) == 0 ? Random(200000) : Random(40), '\0');
        for (char& byte : content) byte = static_cast<char>(m_random());
        return content;
    }
    // Never a date twice, so that a changed file shows.
    void WriteRandomFile(const std::string& path) {
        std::ofstream(path, std::ios::binary) << RandomContent();
        SetMtime(path, 1000000 + ++m_clock);
    }
    void GrowTree(const std::string& folder, int depth) {
        fs::create_directory(folder);
        for (size_t left = Random(7) + (depth == 0 ? 4 : 0); left > 0; --left) {
            const std::string path = folder + "/" + RandomName();
            if (IsThere(path)) continue;
            if (depth < 5 && Random(3) == 0)
                GrowTree(path, depth + 1);
            else
                WriteRandomFile(path);
        }
    }
    // Changes some entries of the source: bytes, removal, another type, a new neighbour.
    void ChangeSource() {
        std::vector<std::string> paths;
        for (const auto& entry : fs::recursive_directory_iterator(Src())) {
            paths.push_back(entry.path().string());
        }
        for (const std::string& path : paths) {
            if (!IsThere(path) || Random(4) != 0) continue;
            const bool is_dir = fs::is_directory(path);
            const size_t kind = Random(4);
            if (kind == 0 && !is_dir) WriteRandomFile(path);
            if (kind == 1 || kind == 2) fs::remove_all(path);
            if (kind == 2 && is_dir) WriteRandomFile(path);
            if (kind == 2 && !is_dir) GrowTree(path, 3);
            if (kind == 3 && is_dir) GrowTree(path + "/new" + std::to_string(++m_clock), 3);
        }
    }
    std::vector<std::string> RunMirror() {
        EventGenerator(TASK_ID).PushScanEvent("/");
        return DrainEvents();
    }
    // Files of the destination with their content, by path.
    static std::map<std::string, std::string> FilesOf(const std::string& root) {
        std::map<std::string, std::string> files;
        for (const auto& entry : fs::recursive_directory_iterator(root)) {
            if (entry.is_regular_file()) {
                files[entry.path().string().substr(root.size())] = ReadWholeFile(entry.path());
            }
        }
        return files;
    }
    // The contents of what the source no longer has as it was, and so of what the bin must hold.
    static std::multiset<std::string> Replaced(const std::map<std::string, std::string>& before,
                                               const std::map<std::string, std::string>& after) {
        std::multiset<std::string> contents;
        for (const auto& [path, content] : before) {
            const auto found = after.find(path);
            if (found == after.end() || found->second != content) contents.insert(content);
        }
        return contents;
    }
    std::multiset<std::string> TakeBin() {
        std::multiset<std::string> contents;
        const std::string bin = m_share + "/#recycle";
        if (!IsThere(bin)) return contents;
        for (const auto& [path, content] : FilesOf(bin)) contents.insert(content);
        fs::remove_all(bin);
        return contents;
    }

    std::mt19937 m_random;
    time_t m_clock = 0;
};

TEST_F(MirrorRunTest, SeededRoundsOfChangesEndEqualAndTheBinHoldsWhatWasReplaced) {
    EnableBin();
    for (const unsigned seed : {1U, 2U, 3U, 4U}) {
        m_random.seed(seed);
        fs::remove_all(Src());
        GrowTree(Src(), 0);
        for (int round = 0; round < 5; ++round) {
            const auto before = FilesOf(Dst());
            EXPECT_THAT(RunMirror(), IsEmpty()) << "seed " << seed << " round " << round;
            EXPECT_EQ(TreeOf(Src()), TreeOf(Dst())) << "seed " << seed << " round " << round;
            EXPECT_EQ(Replaced(before, FilesOf(Dst())), TakeBin())
                << "seed " << seed << " round " << round;
            ChangeSource();
        }
    }
}

TEST_F(MirrorRunTest, ASecondRunWithoutChangesDoesNothing) {
    m_random.seed(5);
    fs::remove_all(Src());
    GrowTree(Src(), 0);
    EXPECT_THAT(RunMirror(), IsEmpty());
    m_fake.ForgetCalls();
    m_log.Clear();
    EXPECT_THAT(RunMirror(), IsEmpty());
    EXPECT_EQ(0, m_fake.CallCount("KELDFileCopy_r"));
    for (const std::string& issued : TakeIssued()) EXPECT_EQ("scan ", issued.substr(0, 5));
}

TEST_F(MirrorRunTest, AnExportMirrorsTheShareToTheDevice) {
    MakeExport();
    m_random.seed(6);
    fs::remove_all(Src());
    GrowTree(Src(), 0);
    WriteDst("/old", "gone");
    EXPECT_THAT(RunMirror(), IsEmpty());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

TEST_F(MirrorRunTest, WhatTheTaskFilterRefusesIsNeitherCopiedNorRemoved) {
    SetTaskFilterNames({"secret"});
    WriteSrc("/secret", "not copied");
    WriteSrc("/d/secret/x", "not copied");
    WriteSrc("/plain", "copied");
    WriteDst("/e/secret", "stays");
    MakeSrcDir("/e");
    RunMirror();
    EXPECT_THAT(NamesOf(Dst()),
                testing::ElementsAre("/d/", "/e/", "/e/secret=stays", "/plain=copied"));
}

TEST_F(MirrorRunTest, OneBadFileDoesNotStopTheOthers) {
    for (const char* name : {"/a", "/b", "/c"}) WriteSrc(name, "s");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(1U, RunMirror().size());
    EXPECT_EQ(2U, TreeOf(Dst()).size());
    EXPECT_THAT(RunMirror(), IsEmpty());
    EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
}

TEST_F(MirrorRunTest, ADeepTreeIsCopiedAndRemoved) {
    constexpr int DEPTH = 300;  // deeper than a path that the system takes at once
    std::string path;
    for (int n = 0; n < DEPTH; ++n) path += "/folder-name-" + std::to_string(n);
    // Made step by step: the whole path is too long for one call.
    int at = open(Src().c_str(), O_PATH | O_DIRECTORY);
    for (int n = 0; n < DEPTH; ++n) {
        const std::string name = "folder-name-" + std::to_string(n);
        ASSERT_EQ(0, mkdirat(at, name.c_str(), 0755));
        const int next = openat(at, name.c_str(), O_PATH | O_DIRECTORY);
        close(at);
        at = next;
    }
    const int file = openat(at, "file", O_WRONLY | O_CREAT, 0644);
    ASSERT_EQ(5, write(file, "bytes", 5));
    close(file);
    close(at);
    EXPECT_THAT(RunMirror(), IsEmpty());
    m_fake.ForgetCalls();
    EXPECT_THAT(RunMirror(), IsEmpty()) << "a second run finds it";
    EXPECT_EQ(0, m_fake.CallCount("KELDFileCopy_r"));
    ASSERT_EQ(0, system(("rm -rf '" + Src("/folder-name-0") + "'").c_str()));
    EXPECT_THAT(RunMirror(), IsEmpty());
    EXPECT_THAT(TreeOf(Dst()), IsEmpty());
}

}  // namespace
