// The source goes only after its copy: flushed with its folder entries, read back from the medium
// and found equal.
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <thread>
#include <utility>

#include "db/task-info.h"
#include "flush-faults.h"
#include "inc-backup-fixture.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::UnorderedElementsAre;

class IncBackupMoveTest : public IncBackupFixture {
protected:
    IncBackupMoveTest() { m_task.remove_src_file = true; }

    void Scribble(const std::string& path, const std::string& content, time_t mtime) {
        std::ofstream(path) << content;
        SetMtime(path, mtime);
    }
    // File systems take the time from a clock that goes in steps of up to 10 ms.
    static void PassATick() { std::this_thread::sleep_for(std::chrono::milliseconds(20)); }
    // Runs once, when the next copy has been compared with its source and the source is about to
    // go: that is when the device is asked for the first time after the copy.
    void JustBeforeTheRemoval(std::function<void()> action) {
        m_is_removal_near = false;
        m_fake.OnCall("KELDFileCopy_r", [this] { m_is_removal_near = !m_has_acted; });
        m_has_acted = false;
        m_fake.OnCall("KELDDevIsPresent", [this, action] {
            if (!std::exchange(m_is_removal_near, false)) return;
            m_has_acted = true;
            PassATick();
            action();
        });
    }
    [[nodiscard]] bool HasToldOfChange(const std::string& path) const {
        return m_log.Has("[ERR] Source file '" + Src(path) +
                         "' has changed since it was copied, it stays, should retry.");
    }

    bool m_is_removal_near = false;
    bool m_has_acted = false;
};

TEST_F(IncBackupMoveTest, AMovedFileLeavesNoSourceAndNoRecord) {
    WriteSrc("/d/a", "bytes", 1000);
    RunWell();
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/d/", "/d/a=bytes@1000"));
    EXPECT_THAT(NamesOf(Src()), ElementsAre("/d/"));
    EXPECT_EQ("-", Recorded("/d/a"));
}

TEST_F(IncBackupMoveTest, AFileOfTheSameNameThatComesLaterIsCopiedAsNew) {
    WriteSrc("/a", "first", 1000);
    RunWell();
    WriteSrc("/a", "first", 1000);
    RunWell();
    EXPECT_EQ(2, TakeCopies());
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a=first@1000"));
}

TEST_F(IncBackupMoveTest, UnderRenameTwoPicturesOfOneNameFromTwoCardsBothLive) {
    SetRenamePolicy();
    SetNaming(false, false, false);
    WriteSrc("/DCIM/IMG_1.JPG", "first card", 1000);
    RunWell();
    WriteSrc("/DCIM/IMG_1.JPG", "second card", 2000);
    RunTask();
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/IMG_1.JPG=second card",
                            MatchesRegex("/IMG_1_Ferrix_.*_Conflict.JPG=first card")));
    EXPECT_THAT(NamesOf(Src()), ElementsAre("/DCIM/"));
}

// A burst of a camera: under either policy the second must not take the place of the first, whose
// source is gone.
TEST_F(IncBackupMoveTest, PicturesOfOneSecondAllLive) {
    SetNaming(false, false, true);
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        m_task.conflict_policy = policy;
        for (const char* name : {"/1.JPG", "/2.JPG", "/3.JPG"}) WriteSrc(name, name, 1683356889);
        RunWell();
        EXPECT_THAT(NamesOf(Src()), IsEmpty());
        std::vector<std::string> contents;
        for (const auto& entry : fs::directory_iterator(Dst())) {
            contents.push_back(ReadWholeFile(entry.path().string()));
        }
        EXPECT_THAT(contents, UnorderedElementsAre("/1.JPG", "/2.JPG", "/3.JPG"));
        EXPECT_TRUE(IsThere(Dst("/2023-05-06_070809.JPG")));
        EXPECT_TRUE(IsThere(Dst("/2023-05-06_070809 (1).JPG")));
        EXPECT_TRUE(IsThere(Dst("/2023-05-06_070809 (2).JPG")));
        fs::remove_all(Dst());
        fs::create_directory(Dst());
    }
}

TEST_F(IncBackupMoveTest, PicturesOfOneSecondAllLiveAcrossARunThatWasBrokenOff) {
    SetNaming(false, false, true);
    WriteSrc("/2.JPG", "two", 1683356889);
    WriteSrc("/1.JPG", "one", 1683356889);
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION, 1, 1);
    EXPECT_EQ(ERR_NO_PERMISSION, RunTask());
    EXPECT_EQ(1U, NamesOf(Src()).size());
    ReopenFileDB();
    RunWell();
    EXPECT_THAT(NamesOf(Src()), IsEmpty());
    EXPECT_EQ(2U, NamesOf(Dst()).size());
    // The run is over: from now on the name is free for what the policy says.
    WriteSrc("/3.JPG", "three", 1683356889);
    RunWell();
    EXPECT_EQ(2U, NamesOf(Dst()).size());
    EXPECT_EQ("three", ReadWholeFile(Dst("/2023-05-06_070809.JPG")));
}

TEST_F(IncBackupMoveTest, ASourceThatCannotBeRemovedTakesTheSameNameAgain) {
    SetNaming(false, false, true);
    WriteSrc("/1.JPG", "one", 1683356889);
    m_fake.AddShare({.name = "usb", .path = m_usb, .recycle_bin = true});
    m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1", .recycle_bin = true});
    m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath", KELDERR_NO_PERMISSION, FakeKeld::ALWAYS);
    EXPECT_EQ(ERR_FILE_OPERATION, RunTask());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + Src("/1.JPG") + "'"));
    EXPECT_THAT(NamesOf(Src()), ElementsAre("/1.JPG=one"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/2023-05-06_070809.JPG=one"));
    m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath", KELDERR_NO_PERMISSION, 0);
    RunTask();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/2023-05-06_070809.JPG=one"));
}

// --- What fails ---

TEST_F(IncBackupMoveTest, AFailedFlushLeavesTheSource) {
    WriteSrc("/d/a", "bytes", 1000);
    for (const std::string part : {"/d/a", "/d", "/copy", "/photos"}) {
        int failed = 0;
        {
            const OnFlush faults([&](const std::string& what) {
                const bool hit = what.ends_with(part) && !what.starts_with("fs:");
                failed += hit ? 1 : 0;
                return hit ? EIO : 0;
            });
            EXPECT_EQ(ERR_IO, HandleCopy("/d/a")) << part;
        }
        EXPECT_EQ(1, failed) << part << ": a failed flush is not repeated";
        EXPECT_EQ("bytes", ReadWholeFile(Src("/d/a"))) << part;
        EXPECT_FALSE(IsThere(Dst("/d/a"))) << "nobody knows what reached the disk";
        EXPECT_TRUE(m_log.Contains("[ERR] Failed to flush '"));
    }
    EXPECT_EQ(0, HandleCopy("/d/a"));
    EXPECT_FALSE(IsThere(Src("/d/a")));
}

TEST_F(IncBackupMoveTest, ACopyThatDiffersLeavesTheSource) {
    WriteSrc("/a", "bytes", 1000);
    {
        // Between the copy and the comparison the medium loses a bit.
        const OnFlush faults([&](const std::string& what) {
            if (what == Dst("/a")) Scribble(what, "bytez", 1000);
            return 0;
        });
        EXPECT_EQ(ERR_IO, HandleCopy("/a"));
    }
    EXPECT_EQ("bytes", ReadWholeFile(Src("/a")));
    EXPECT_FALSE(IsThere(Dst("/a")));
    EXPECT_TRUE(
        m_log.Has("[ERR] File '" + Dst("/a") + "' differs from '" + Src("/a") + "' on the disk"));
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_EQ("bytes", ReadWholeFile(Dst("/a")));
    EXPECT_FALSE(IsThere(Src("/a")));
}

TEST_F(IncBackupMoveTest, ACopyOfAnotherLengthLeavesTheSource) {
    const std::string large(3 << 20, 'x');
    for (const std::string& damaged : {large + "y", large.substr(1), std::string()}) {
        WriteSrc("/a", large, 1000);
        const OnFlush faults([&](const std::string& what) {
            if (what == Dst("/a")) Scribble(what, damaged, 1000);
            return 0;
        });
        EXPECT_EQ(ERR_IO, HandleCopy("/a"));
        EXPECT_TRUE(IsThere(Src("/a")));
    }
}

TEST_F(IncBackupMoveTest, EveryByteOfALargeFileIsCompared) {
    std::string large(5000000, '\0');
    for (size_t i = 0; i < large.size(); ++i) large[i] = static_cast<char>(i * 31 >> 8);
    for (const size_t at :
         {size_t{0}, size_t{1} << 20, (size_t{1} << 20) - 1, size_t{4097}, large.size() - 1}) {
        WriteSrc("/a", large, 1000);
        std::string damaged = large;
        damaged[at] = static_cast<char>(damaged[at] ^ 1);
        {
            const OnFlush faults([&](const std::string& what) {
                if (what == Dst("/a")) Scribble(what, damaged, 1000);
                return 0;
            });
            EXPECT_EQ(ERR_IO, HandleCopy("/a")) << at;
        }
        EXPECT_TRUE(IsThere(Src("/a"))) << at;
    }
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_EQ(large, ReadWholeFile(Dst("/a")));
    EXPECT_FALSE(IsThere(Src("/a")));
}

TEST_F(IncBackupMoveTest, AnAbortDuringTheComparisonLeavesTheSource) {
    WriteSrc("/a", "bytes", 1000);
    const OnFlush faults([&](const std::string& /*what*/) {
        m_abort = 1;
        return 0;
    });
    EXPECT_EQ(ERR_INTERRUPTED, HandleCopy("/a"));
    EXPECT_TRUE(IsThere(Src("/a")));
}

TEST_F(IncBackupMoveTest, ACardThatGoesDuringTheComparisonLosesNothing) {
    WriteSrc("/a", "bytes", 1000);
    const OnFlush faults([&](const std::string& /*what*/) {
        m_fake.Pull(m_usb);
        return 0;
    });
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleCopy("/a"));
    EXPECT_TRUE(IsThere(Src("/a")));
    EXPECT_EQ("bytes", ReadWholeFile(Dst("/a")));
}

TEST_F(IncBackupMoveTest, AFileThatOnlyLooksEqualIsNoCopy) {
    SetRenamePolicy();
    WriteSrc("/a", "mine!", 1000);
    WriteDst("/a", "other", 1000);
    RunTask();
    EXPECT_THAT(NamesOf(Src()), IsEmpty());
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/a=mine!", MatchesRegex("/a_Ferrix_.*_Conflict=other")));
}

TEST_F(IncBackupMoveTest, AFailedFlushDoesNotRemoveSomebodysFile) {
    SetRenamePolicy();
    WriteSrc("/a", "bytes", 1000);
    WriteDst("/a", "bytes", 1000);
    {
        const OnFlush faults([](const std::string& /*what*/) { return EIO; });
        EXPECT_EQ(ERR_IO, HandleCopy("/a"));
    }
    EXPECT_TRUE(IsThere(Dst("/a")));
    EXPECT_TRUE(IsThere(Src("/a")));
}

TEST_F(IncBackupMoveTest, AFileSystemThatFlushesNoSingleFolderIsFlushedWhole) {
    WriteSrc("/a", "bytes", 1000);
    int whole = 0;
    const OnFlush faults([&](const std::string& what) {
        if (what.starts_with("fs:")) ++whole;
        return !what.starts_with("fs:") && fs::is_directory(what) ? EINVAL : 0;
    });
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_LE(1, whole);
    EXPECT_FALSE(IsThere(Src("/a")));
}

// --- A source that somebody writes to meanwhile ---

TEST_F(IncBackupMoveTest, ASourceThatIsWrittenToAfterTheComparisonStays) {
    const struct {
        const char* what;
        std::function<void(const std::string& path)> change;
    } changes[] = {
        {"written to",                  [](auto& path) { std::ofstream(path) << "newer"; }   },
        {"written to, of its old date", [this](auto& path) { Scribble(path, "newer", 1000); }},
        {"another file saved over it",
         [this](auto& path) {
             Scribble(m_dir / "saved", "newer", 1000);
             fs::rename(m_dir / "saved", path);
         }                                                                                   },
        {"removed and made anew",
         [this](auto& path) {
             fs::remove(path);
             Scribble(path, "newer", 1000);
         }                                                                                   },
    };
    for (const auto& [what, change] : changes) {
        WriteSrc("/a", "older", 1000);
        JustBeforeTheRemoval([this, &change] { change(Src("/a")); });
        EXPECT_EQ(ERR_FILE_OPERATION, HandleCopy("/a")) << what;
        EXPECT_EQ("newer", ReadWholeFile(Src("/a"))) << what;
        EXPECT_EQ("older", ReadWholeFile(Dst("/a"))) << what;
        EXPECT_TRUE(HasToldOfChange("/a")) << what;
        EXPECT_EQ(0, HandleCopy("/a")) << what;
        EXPECT_FALSE(IsThere(Src("/a"))) << what;
        EXPECT_EQ("newer", ReadWholeFile(Dst("/a"))) << what;
        m_log.Clear();
    }
}

// Whatever was noted of the first copy: the next attempt does not take it for that of the changed
// file.
TEST_F(IncBackupMoveTest, TheChangedSourceIsCopiedAnewAndThenGoes) {
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        for (const bool keeps_folders : {true, false}) {
            for (const time_t mtime : {1000, 2000}) {
                m_task.conflict_policy = policy;
                SetNaming(keeps_folders, false, false);
                WriteSrc("/a", "older", 1000);
                JustBeforeTheRemoval([&] { Scribble(Src("/a"), "newer", mtime); });
                RunTask();
                EXPECT_TRUE(HasToldOfChange("/a"));
                EXPECT_THAT(NamesOf(Src()), IsEmpty());
                std::vector<std::string> contents;
                for (const auto& entry : fs::directory_iterator(Dst())) {
                    contents.push_back(ReadWholeFile(entry.path().string()));
                }
                EXPECT_THAT(contents, testing::Contains("newer"))
                    << policy << " " << keeps_folders << " " << mtime;
                m_log.Clear();
                fs::remove_all(Dst());
                fs::create_directory(Dst());
            }
        }
    }
}

TEST_F(IncBackupMoveTest, ASourceThatIsSavedAnewDuringTheCopyLeavesNoNote) {
    SetNaming(false, false, false);
    WriteSrc("/a", "bytes", 1000);
    {
        // The same bytes: the comparison finds nothing.
        const OnFlush faults([&](const std::string& what) {
            if (what == Dst("/a")) {
                PassATick();
                Scribble(Src("/a"), "bytes", 1000);
            }
            return 0;
        });
        EXPECT_EQ(ERR_FILE_OPERATION, HandleCopy("/a"));
    }
    EXPECT_TRUE(HasToldOfChange("/a"));
    EXPECT_TRUE(IsThere(Src("/a")));
    EXPECT_EQ(0, m_task.file_db->IsDestinationTaken("/a"));
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_EQ(1, m_task.file_db->IsDestinationTaken("/a"));
    EXPECT_FALSE(IsThere(Src("/a")));
}

TEST_F(IncBackupMoveTest, WhereSourcesStayAChangedOneIsNoFailure) {
    m_task.remove_src_file = false;
    WriteSrc("/a", "older", 1000);
    m_fake.OnCall("KELDFileCopy_r", [this] { SetMtime(Src("/a"), 1000); });
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_TRUE(IsThere(Src("/a")));
}

// --- The order, as the system sees it ---

TEST_F(IncBackupMoveTest, AFileInAFolderIsMovedWhole) {
    const std::string content(3000000, 'p');
    WriteSrc("/folder/precious", content, 1000);
    EXPECT_EQ(0, HandleCopy("/folder/precious"));
    EXPECT_EQ(content, ReadWholeFile(Dst("/folder/precious")));
    EXPECT_FALSE(IsThere(Src("/folder/precious")));
}

// Where in the trace the first line stands, from one on, that has all of these parts; -1 for none.
int LineWith(const std::vector<std::string>& trace, const std::vector<std::string>& parts,
             int from = 0) {
    for (size_t i = static_cast<size_t>(from); i < trace.size(); ++i) {
        const bool has_all = std::all_of(parts.begin(), parts.end(), [&](const std::string& part) {
            return trace[i].find(part) != std::string::npos;
        });
        if (has_all) return static_cast<int>(i);
    }
    return -1;
}

TEST_F(IncBackupMoveTest, TheTraceShowsFlushThenReadBackThenRemoval) {
    if (std::system("strace -V > /dev/null 2>&1") != 0) GTEST_SKIP() << "strace is not installed";
    const std::string file = m_dir / "trace";
    // The leak sanitizer does not work in a traced process.
    const std::string command =
        "ASAN_OPTIONS=\"$ASAN_OPTIONS:detect_leaks=0\" strace -f -y -o '" + file + "' '" +
        fs::read_symlink("/proc/self/exe").string() +
        "' --gtest_filter=IncBackupMoveTest.AFileInAFolderIsMovedWhole > '" + (m_dir / "output") +
        "' 2>&1";
    const int status = std::system(command.c_str());
    if (ReadWholeFile(m_dir / "output").find("PTRACE_TRACEME") != std::string::npos) {
        GTEST_SKIP() << "no process may be traced here";
    }
    ASSERT_EQ(0, status) << ReadWholeFile(m_dir / "output");
    std::vector<std::string> trace;
    std::ifstream lines(file);
    for (std::string line; std::getline(lines, line);) trace.push_back(line);

    const std::string copy = "/photos/copy/folder/precious>";
    const int flushed = LineWith(trace, {"fsync(", copy, "= 0"});
    const int folder = LineWith(trace, {"fsync(", "/photos/copy/folder>", "= 0"});
    const int above = LineWith(trace, {"fsync(", "/photos/copy>", "= 0"});
    const int root = LineWith(trace, {"fsync(", "/photos>", "= 0"});
    const int dropped = LineWith(trace, {"fadvise64(", copy, "POSIX_FADV_DONTNEED", "= 0"});
    const int read = LineWith(trace, {"pread64(", copy}, dropped);
    const int last = LineWith(trace, {"pread64(", copy, ", 2097152"}, dropped);
    const int removed = LineWith(trace, {"unlinkat(", "/usb/data/folder", "\"precious\"", "= 0"});
    EXPECT_LT(0, flushed);
    EXPECT_LT(flushed, folder);
    EXPECT_LT(folder, above);
    EXPECT_LT(above, root);
    EXPECT_LT(root, dropped);
    EXPECT_LT(dropped, read);
    EXPECT_LE(read, last);
    EXPECT_LT(last, removed);
    EXPECT_EQ(-1, LineWith(trace, {"write(", copy}, flushed)) << "nothing is written after it";
}

}  // namespace
