// Mirrors to destinations that ignore case: what they spell in another way than the source is
// neither lost nor copied again for that.
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <utility>

#include "event/event-generator.h"
#include "keld/scratch-disk.h"
#include "spelling-faults.h"
#include "strategy-fixture.h"
#include "strategy/destination.h"
#include "strategy/spelling-key.h"
#include "strategy/spelling-pairs.h"
#include "utils/confined-path.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

// --- Names ---

TEST(SpellingKeyTest, SpellingsOfOneNameHaveOneKey) {
    const std::pair<const char*, const char*> pairs[] = {
        {"/A.TXT",             "/a.txt"            },
        {"/DCIM",              "/dcim"             },
        {"/\xc3\x84pfel",      "/\xc3\xa4PFEL"     },
        {"/\xce\x91\xce\xa3",  "/\xce\xb1\xcf\x83" },
        {"/\xd0\x96",          "/\xd0\xb6"         },
        {"/\xc3\xa9",          "/e\xcc\x81"        },
        {"/a.",                "/a"                },
        {"/a .. ",             "/A"                },
        {"/\xff\xfe-NO-UTF-8", "/\xff\xfe-no-utf-8"},
        {"/",                  "/"                 },
        {"/...",               "/.."               },
    };
    for (const auto& [one, other] : pairs) EXPECT_EQ(SpellingKey(one), SpellingKey(other)) << one;
}

TEST(SpellingKeyTest, OtherNamesHaveOtherKeys) {
    const std::pair<const char*, const char*> pairs[] = {
        {"/a",   "/b"       },
        {"/a",   "/\xc3\xa4"},
        {"/a.t", "/a.tx"    },
        {"/a b", "/ab"      },
        {"/.a",  "/a"       },
        {"/[",   "/{"       },
        {"/@",   "/`"       },
    };
    for (const auto& [one, other] : pairs) EXPECT_NE(SpellingKey(one), SpellingKey(other)) << one;
}

// --- Pairs ---

class SpellingPairsTest : public testing::Test {
protected:
    // Both lists filled; the first that is offered is chosen. What was asked is in m_asked.
    SpellingPairs Find(const std::vector<std::string>& src, const std::vector<std::string>& dst) {
        for (const std::string& name : src) EXPECT_EQ(0, m_src.AddFile(0, name, 1, 1));
        for (const std::string& name : dst) EXPECT_EQ(0, m_dst.AddFile(0, name, 2, 2));
        const auto choose = [this](const FileListEntry& entry,
                                   std::vector<FileListEntry>& entries) {
            std::string asked = entry.path + ":";
            for (const FileListEntry& other : entries) asked += " " + other.path;
            m_asked.push_back(asked);
            return m_takes_none ? nullptr : &entries.front();
        };
        return {m_src, m_dst, choose};
    }

    NamePool m_pool;
    FileList m_src{m_pool};
    FileList m_dst{m_pool};
    bool m_takes_none = false;
    std::vector<std::string> m_asked;
};

TEST_F(SpellingPairsTest, OnlyNamesThatOneSideAloneHasAreAskedAbout) {
    const SpellingPairs pairs =
        Find({"both", "Both", "new", "one.TXT", "z"}, {"both", "BOTH", "one.txt", "old"});
    EXPECT_THAT(m_asked, ElementsAre("/one.TXT: /one.txt", "/Both: /BOTH"));
    ASSERT_NE(nullptr, pairs.OtherHalf("/one.TXT"));
    EXPECT_EQ("/one.TXT", pairs.OtherHalf("/one.TXT")->path);
    EXPECT_EQ(2U, pairs.OtherHalf("/one.TXT")->mtime) << "the destination's";
    EXPECT_TRUE(pairs.HasDst("/one.txt"));
    EXPECT_FALSE(pairs.HasDst("/old"));
    EXPECT_FALSE(pairs.HasDst("/both"));
    EXPECT_EQ(nullptr, pairs.OtherHalf("/both"));
    EXPECT_EQ(nullptr, pairs.OtherHalf("/new"));
}

TEST_F(SpellingPairsTest, AnEntryIsTheOtherHalfOfOneAlone) {
    const SpellingPairs pairs = Find({"a.txt", "A.TXT", "A.txt"}, {"a.TXT", "a.Txt"});
    EXPECT_THAT(m_asked, ElementsAre("/a.txt: /a.Txt /a.TXT", "/A.txt: /a.TXT"));
    EXPECT_EQ(nullptr, pairs.OtherHalf("/A.TXT"));
}

TEST_F(SpellingPairsTest, WhatIsNotChosenIsNoPair) {
    m_takes_none = true;
    const SpellingPairs pairs = Find({"a"}, {"A"});
    EXPECT_THAT(m_asked, ElementsAre("/a: /A"));
    EXPECT_EQ(nullptr, pairs.OtherHalf("/a"));
    EXPECT_FALSE(pairs.HasDst("/A"));
}

TEST_F(SpellingPairsTest, WithoutNamesOfItsOwnTheDestinationIsNotAskedAbout) {
    const SpellingPairs pairs = Find({"a", "A", "b"}, {"a", "b"});
    EXPECT_THAT(m_asked, IsEmpty());
    EXPECT_EQ(nullptr, pairs.OtherHalf("/A"));
}

// --- Scans. The destination is listed as it would be, but finds names as they are. ---

class MirrorSpellingTest : public StrategyFixture {};

TEST_F(MirrorSpellingTest, AnEqualFileOfAnotherSpellingIsSkippedInEachRun) {
    WriteSrc("/a.txt", "s");
    WriteDst("/a.txt", "s");
    WriteDst("/old.txt", "gone");
    const OtherSpelling spelling(Dst(), "a.txt", "A.txt");
    for (int run = 0; run < 2; ++run) {
        EXPECT_EQ(0, HandleScan("/"));
        EXPECT_TRUE(m_log.Has("[WARN] MirrorScanHandler: '" + Dst("/a.txt") +
                              "' keeps the spelling '/A.txt'"));
        EXPECT_THAT(TakeIssued(), ElementsAre("remove /old.txt"));
    }
}

TEST_F(MirrorSpellingTest, AChangedFileOfAnotherSpellingIsRemovedAndThenCopied) {
    WriteSrc("/a.txt", "new");
    WriteSrc("/b.txt", "s");
    WriteDst("/a.txt", "s");
    const OtherSpelling spelling(Dst(), "a.txt", "A.txt");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /b.txt", "remove /a.txt", "copy /a.txt"));
}

TEST_F(MirrorSpellingTest, AFolderOfAnotherSpellingIsLookedInto) {
    WriteSrc("/p/dir/a", "s");
    WriteDst("/p/dir/a", "s");
    const OtherSpelling spelling(Dst(), "dir", "Dir");
    EXPECT_EQ(0, HandleScan("/p"));
    EXPECT_THAT(TakeIssued(), ElementsAre("scan /p/dir"));
    EXPECT_EQ(0, HandleScan("/p/dir"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(MirrorSpellingTest, AnotherTypeOfAnotherSpellingIsRemovedFirst) {
    WriteSrc("/dir", "a file");
    MakeDstDir("/dir");
    {
        const OtherSpelling spelling(Dst(), "dir", "Dir");
        EXPECT_EQ(0, HandleScan("/"));
        EXPECT_THAT(TakeIssued(), ElementsAre("remove /dir/", "copy /dir"));
    }
    ASSERT_EQ(0, rmdir(Dst("/dir").c_str()));
    ASSERT_EQ(0, unlink(Src("/dir").c_str()));
    WriteDst("/dir", "a file");
    MakeSrcDir("/dir");
    const OtherSpelling spelling(Dst(), "dir", "Dir");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /dir", "create /dir", "scan /dir"));
}

TEST_F(MirrorSpellingTest, WhereCaseCountsEachSpellingIsAnEntry) {
    WriteSrc("/a.txt", "s");
    WriteDst("/A.txt", "s");
    WriteSrc("/B.txt", "s");
    WriteDst("/b.txt", "s");
    ASSERT_EQ(0, symlink("A.txt", Dst("/a.txt").c_str())) << "a link is no other spelling";
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(),
                ElementsAre("remove /b.txt", "copy /a.txt", "copy /B.txt", "remove /A.txt"));
    EXPECT_TRUE(IsThere(Dst("/A.txt")));
}

// --- The new spelling ---

TEST_F(MirrorSpellingTest, ANameThatFindsTheSameFileIsGivenByWayOfAnother) {
    // Where case counts only one name finds the file: it stands for both.
    WriteDst("/a", "s");
    WriteDst("/.ferrix-respelled", "somebody's");
    EXPECT_EQ(-1, RespellEntry(Dst("/a"), Dst("/a")));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/.ferrix-respelled=somebody's", "/a=s"));
    ASSERT_EQ(0, unlink(Dst("/.ferrix-respelled").c_str()));
    EXPECT_EQ(0, RespellEntry(Dst("/a"), Dst("/a")));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a=s"));
}

TEST_F(MirrorSpellingTest, WhatIsNotThereGetsNoNewName) {
    WriteDst("/b", "s");
    EXPECT_EQ(-1, RespellEntry(Dst("/a"), Dst("/b")));
    EXPECT_EQ(-1, RespellEntry(Dst("/b"), Dst("/missing/b")));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/b=s"));
}

// --- Whole runs, to a real disk ---

constexpr time_t NOON = 1600000000;  // FAT knows no date before 1980 and no odd second
constexpr time_t LATER = NOON + 60;

class MirrorSpellingDiskTest : public StrategyFixture,
                               public testing::WithParamInterface<const char*> {
protected:
    void SetUp() override {
        const std::string reason = ScratchDisk::WhyNot(GetParam());
        if (!reason.empty()) GTEST_SKIP() << reason;
        m_disk = std::make_unique<ScratchDisk>(GetParam(), 64);
        m_task.dst_dir_path = m_disk->Path() + "/copy";
        m_task.dst_root = std::make_shared<ConfinedRoot>(m_disk->Path());
        fs::create_directory(Dst());
        AddDiskShare(false);
    }
    void AddDiskShare(bool has_bin) {
        m_fake.AddShare({.name = "stick", .path = m_disk->Path(), .recycle_bin = has_bin});
    }
    // Nothing may fail, a second run has nothing to do, and both sides are equal after each.
    void RunWell() {
        EXPECT_THAT(Run(), IsEmpty());
        m_copies = m_fake.CallCount("KELDFileCopy_r");
        m_fake.ForgetCalls();
        EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
        m_log.Clear();
        EXPECT_THAT(Run(), IsEmpty());
        for (const std::string& issued : TakeIssued()) EXPECT_EQ("scan ", issued.substr(0, 5));
        EXPECT_EQ(TreeOf(Src()), TreeOf(Dst()));
    }
    std::vector<std::string> Run() {
        EventGenerator(TASK_ID).PushScanEvent("/");
        return DrainEvents();
    }

    std::unique_ptr<ScratchDisk> m_disk;
    int m_copies = 0;
};

TEST_P(MirrorSpellingDiskTest, RenamedFilesAndFoldersGetTheirNewSpellingAndNothingIsCopied) {
    WriteSrc("/A.txt", "a", NOON);
    WriteSrc("/A long name of a file.txt", "l", NOON);
    WriteSrc("/DCIM/Img.JPG", "i", NOON);
    WriteSrc("/DCIM/Sub/x", "x", NOON);
    MakeSrcDir("/Empty");
    RunWell();
    EXPECT_EQ(4, m_copies);
    fs::rename(Src("/A.txt"), Src("/a.txt"));
    fs::rename(Src("/A long name of a file.txt"), Src("/a Long Name of a file.TXT"));
    fs::rename(Src("/DCIM/Img.JPG"), Src("/DCIM/img.jpg"));
    fs::rename(Src("/DCIM/Sub"), Src("/DCIM/sub"));
    fs::rename(Src("/DCIM"), Src("/dcim"));
    fs::rename(Src("/Empty"), Src("/EMPTY"));
    RunWell();
    EXPECT_EQ(0, m_copies);
    EXPECT_THAT(NamesOf(Dst()),
                UnorderedElementsAre("/EMPTY/", "/a Long Name of a file.TXT=l", "/a.txt=a",
                                     "/dcim/", "/dcim/img.jpg=i", "/dcim/sub/", "/dcim/sub/x=x"));
}

TEST_P(MirrorSpellingDiskTest, LettersBeyondAsciiAreNoneTheLessKept) {
    WriteSrc("/\xc3\x84 long enough.txt", "umlaut", NOON);
    WriteSrc("/\xd0\x96/x", "x", NOON);
    RunWell();
    fs::rename(Src("/\xc3\x84 long enough.txt"), Src("/\xc3\xa4 long enough.txt"));
    fs::rename(Src("/\xd0\x96"), Src("/\xd0\xb6"));
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), UnorderedElementsAre("/\xc3\xa4 long enough.txt=umlaut",
                                                     "/\xd0\xb6/", "/\xd0\xb6/x=x"));
}

TEST_P(MirrorSpellingDiskTest, AFileThatIsRenamedAndChangedReplacesTheOld) {
    for (const bool has_bin : {false, true}) {
        AddDiskShare(has_bin);
        WriteSrc("/d/A.txt", "old", NOON);
        RunWell();
        fs::remove(Src("/d/A.txt"));
        WriteSrc("/d/a.txt", "new", LATER);
        // A removal that is tried again takes nothing away either.
        if (has_bin) m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath");
        RunWell();
        EXPECT_EQ(1, m_copies);
        EXPECT_THAT(NamesOf(Dst()), ElementsAre("/d/", "/d/a.txt=new"));
        EXPECT_EQ(has_bin, IsThere(m_disk->Path() + "/#recycle/copy/d/a.txt"));
        fs::remove_all(Src("/d"));
        RunWell();
    }
}

TEST_P(MirrorSpellingDiskTest, AFolderThatBecomesAFileOfAnotherSpellingAndTheOtherWayRound) {
    WriteSrc("/Note/x", "x", NOON);
    WriteSrc("/PAD", "a file", NOON);
    RunWell();
    fs::remove_all(Src("/Note"));
    fs::remove(Src("/PAD"));
    WriteSrc("/note", "a file", LATER);
    WriteSrc("/pad/y", "y", LATER);
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/note=a file", "/pad/", "/pad/y=y"));
}

TEST_P(MirrorSpellingDiskTest, WhatTheTaskFilterRefusesKeepsItsSpelling) {
    WriteSrc("/A.txt", "a", NOON);
    WriteSrc("/B.txt", "b", NOON);
    RunWell();
    fs::rename(Src("/A.txt"), Src("/a.txt"));
    fs::rename(Src("/B.txt"), Src("/b.txt"));
    SetTaskFilterNames({"a.txt"});
    EXPECT_THAT(Run(), IsEmpty());
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/A.txt=a", "/b.txt=b"));
}

// A dot at the end of a name is dropped by FAT: each run finds the file under another name.
TEST_P(MirrorSpellingDiskTest, ANameThatTheDiskCutsShortIsKeptAsWell) {
    WriteSrc("/draft.", "d", NOON);
    WriteSrc("/folder./x", "x", NOON);
    for (int run = 0; run < 3; ++run) {
        EXPECT_THAT(Run(), IsEmpty());
        EXPECT_EQ("d", ReadWholeFile(Dst("/draft."))) << run;
        EXPECT_EQ("x", ReadWholeFile(Dst("/folder./x"))) << run;
    }
}

// exFAT can be had everywhere, through FUSE; vfat where the kernel has it.
std::vector<const char*> Disks() {
    const bool has_vfat = ReadWholeFile("/proc/filesystems").find("vfat") != std::string::npos;
    return has_vfat ? std::vector<const char*>{"exfat", "vfat"} : std::vector<const char*>{"exfat"};
}

INSTANTIATE_TEST_SUITE_P(Disks, MirrorSpellingDiskTest, testing::ValuesIn(Disks()),
                         [](const auto& row) { return std::string(row.param); });

}  // namespace
