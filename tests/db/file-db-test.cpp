// The rows of a file database: written, changed in place, found by either path, removed.
#include "db/file-db-fixture.h"

namespace {

TEST_F(FileDBTest, ARowIsFoundByBothOfItsPaths) {
    Set("/a/b.jpg", "/2023-05-06/b.jpg", 12, 34);
    EXPECT_EQ("/a/b.jpg /2023-05-06/b.jpg 0 12 34", BySource("/a/b.jpg"));
    EXPECT_EQ("/a/b.jpg /2023-05-06/b.jpg 0 12 34", ByDestination("/2023-05-06/b.jpg"));
}

TEST_F(FileDBTest, ARowThatIsNotThereLeavesTheRecordUntouched) {
    FileInfo info{"s", "d", 7, 8, 9};
    EXPECT_EQ(0, m_db.GetFileInfoBySourcePath("/no", info));
    EXPECT_EQ(0, m_db.GetFileInfoByDestinationPath("/no", info));
    EXPECT_EQ("s d 7 8 9", Text(info));
}

TEST_F(FileDBTest, TheLargestValuesComeBack) {
    Set("/big", "/big", UINT64_MAX, UINT32_MAX);
    EXPECT_EQ("/big /big 0 18446744073709551615 4294967295", BySource("/big"));
}

TEST_F(FileDBTest, AChangeKeepsTheIdOfTheRow) {
    Set("/a", "/a");
    Set("/b", "/b");
    const std::string id = Raw("SELECT id FROM file_info_table WHERE source_path = '/a'");
    Set("/a", "/new", 5, 6);
    EXPECT_EQ("/a /new 0 5 6", BySource("/a"));
    EXPECT_EQ(id, Raw("SELECT id FROM file_info_table WHERE source_path = '/a'"));
    EXPECT_EQ("2", Raw("SELECT COUNT(*) FROM file_info_table"));
}

TEST_F(FileDBTest, AFileMayBecomeAFolder) {
    Set("/a", "/a", 5, 6);
    SetDir("/a");
    EXPECT_EQ("/a /a 1 0 0", BySource("/a"));
}

TEST_F(FileDBTest, AnotherProgramSeesARowAtOnce) {
    RawDatabase other(m_path);
    Set("/a", "/a");
    EXPECT_EQ("/a", other.Read("SELECT source_path FROM file_info_table"));
}

TEST_F(FileDBTest, RemovingAFolderRemovesWhatIsBelowAndNoNeighbour) {
    for (const char* path : {"/a", "/a/b", "/a/b/c", "/ab", "/a.txt", "/a b", "/b", "/a0"}) {
        Set(path, path);
    }
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/a"));
    EXPECT_EQ("/a b|/a.txt|/a0|/ab|/b", Sources());
}

TEST_F(FileDBTest, AFolderMayBeNamedWithASlashAtItsEnd) {
    for (const char* path : {"/a/b", "/a/b/c", "/ab"}) Set(path, path);
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/a/"));
    EXPECT_EQ("/ab", Sources());
}

TEST_F(FileDBTest, RemovingTheRootRemovesAll) {
    for (const char* path : {"/a", "/a/b", "/b"}) Set(path, path);
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/"));
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBTest, RemovingWhatIsNotThereIsNoFailure) {
    Set("/a", "/a");
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/b"));
    EXPECT_EQ("/a", Sources());
}

TEST_F(FileDBTest, AnEmptyPathIsNotRemoved) {
    Set("/a", "/a");
    EXPECT_EQ(-1, m_db.RemoveFileInfoBySourcePath(""));
    EXPECT_TRUE(m_log.Has("[ERR] RemoveFileInfoBySourcePath: src_path is empty"));
    EXPECT_EQ("/a", Sources());
}

// Each of these is a folder with one file; removing one must leave the others alone.
const char* const HOSTILE_NAMES[] = {
    "a[1]", "a1",   "a*",   "ab",       "a?",   "a[",    "a]",     "it's",        "\"q\"", "%Q%s",
    "l\nf", "\xff", "\xfe", "\xc3\xa9", "\xc3", " lead", "trail ", "back\\slash", "-- x",  "a;b"};

TEST_F(FileDBTest, NamesAreBytesAndNoPatterns) {
    for (const char* victim : HOSTILE_NAMES) {
        for (const char* name : HOSTILE_NAMES) {
            SetDir(std::string("/") + name);
            Set(std::string("/") + name + "/file", "/x");
        }
        EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath(std::string("/") + victim));
        for (const char* name : HOSTILE_NAMES) {
            const bool is_left = std::string(name) != victim;
            EXPECT_EQ(is_left, BySource(std::string("/") + name) != "") << name << " - " << victim;
            EXPECT_EQ(is_left, BySource(std::string("/") + name + "/file") != "")
                << name << " - " << victim;
        }
    }
}

TEST_F(FileDBTest, AVeryLongPathIsARowLikeAnyOther) {
    std::string path;
    for (int n = 0; n < 2000; ++n) path += "/a-folder-with-a-name-of-some-length";  // 72 kB
    Set(path, path);
    Set(path + "/file", path + "/file", 3);
    EXPECT_NE("", BySource(path));
    EXPECT_NE("", ByDestination(path));
    EXPECT_FALSE(IsChanged(path, path));
    EXPECT_THAT(List(path), testing::ElementsAre("/file=3@1000"));
    EXPECT_EQ(1U, FreeNumber(path, "jpg"));
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath(path));
    EXPECT_EQ("", Sources());
}

TEST_F(FileDBTest, WhileClosedEveryOperationFails) {
    m_db.Close();
    FileInfo info;
    NamePool pool;
    FileList list(pool);
    bool changed = false;
    uint64_t number = 0;
    int64_t mark = 0;
    EXPECT_EQ(-1, m_db.SetFileInfoBySourcePath(info));
    EXPECT_EQ(-1, m_db.GetFileInfoBySourcePath("/a", info));
    EXPECT_EQ(-1, m_db.GetFileInfoByDestinationPath("/a", info));
    EXPECT_EQ(-1, m_db.RemoveFileInfoBySourcePath("/a"));
    EXPECT_EQ(-1, m_db.GetFileListBySourcePath("/", false, list));
    EXPECT_EQ(-1, m_db.DstPathFormatChanged("/a", "/a", changed));
    EXPECT_EQ(-1, m_db.AddMovedFile(info));
    EXPECT_EQ(-1, m_db.GetMovedFile(info));
    EXPECT_EQ(-1, m_db.ForgetMovedFiles());
    EXPECT_EQ(-1, m_db.IsDestinationTaken("/a"));
    EXPECT_EQ(-1, m_db.GetFreeNumber("/a", "", number));
    EXPECT_EQ(-1, m_db.DoubtFileInfo("/a"));
    EXPECT_EQ(-1, m_db.GetUnprovenMark(mark));
    EXPECT_EQ(-1, m_db.ProveFileInfo(1));
    EXPECT_EQ(-1, m_db.ForgetUnproven());
    EXPECT_EQ(0U, m_db.UnprovenCount());
    EXPECT_EQ(0, m_db.UnprovenSeconds());
    EXPECT_FALSE(m_db.TakeFlushFailure());
    EXPECT_FALSE(m_db.TakeRowLoss());
}

TEST_F(FileDBTest, AFailedWriteIsLoggedAndLeavesNoTransactionBehind) {
    Set("/a", "/a");
    RawDatabase(m_path).Run(
        "CREATE TRIGGER no BEFORE UPDATE ON file_info_table BEGIN SELECT RAISE(FAIL, 'full'); "
        "END;");
    EXPECT_EQ(-1, m_db.SetFileInfoBySourcePath({"/a", "/b", FILE_INFO_FILE, 1, 2}));
    EXPECT_TRUE(m_log.Contains("[ERR] sqlite3_exec: [")) << "the reason";
    EXPECT_TRUE(m_log.Contains("full"));
    EXPECT_EQ("/a /a 0 1 1000", BySource("/a"));
    RawDatabase(m_path).Run("DROP TRIGGER no;");
    Set("/a", "/c");
    EXPECT_EQ("/c", Raw("SELECT destination_path FROM file_info_table")) << "committed";
}

TEST_F(FileDBTest, AFailedReadIsLogged) {
    RawDatabase(m_path).Run("DROP TABLE file_info_table;");
    FileInfo info;
    EXPECT_EQ(-1, m_db.GetFileInfoBySourcePath("/a", info));
    EXPECT_TRUE(m_log.Contains("[ERR] sqlite3_step: [1] no such table"));
}

TEST_F(FileDBTest, TheFormatOfANameIsKnownAgain) {
    struct Case {
        const char* recorded;
        const char* asked;
        bool changed;
    };
    const Case cases[] = {
        {"/a.jpg",      "/a.jpg",     false},
        {"/a (1).jpg",  "/a.jpg",     false},
        {"/a (12).jpg", "/a.jpg",     false},
        {"/a (x).jpg",  "/a.jpg",     false}, // any text between the brackets
        {"/a ().jpg",   "/a.jpg",     false},
        {"/a (1).jpg",  "/a (1).jpg", false},
        {"/a (1)",      "/a.jpg",     true },
        {"/a (1).png",  "/a.jpg",     true },
        {"/a(1).jpg",   "/a.jpg",     true },
        {"/b.jpg",      "/a.jpg",     true },
        {"/d/a.jpg",    "/a.jpg",     true },
        {"/a",          "/a",         false},
        {"/a (3)",      "/a",         false},
        {"/a (3).jpg",  "/a",         true },
        {"/.rc (2)",    "/.rc",       false},
        {"/a[1].jpg",   "/a[1].jpg",  false},
        {"/a[1] (1).j", "/a[1].j",    false},
        {"/a1 (1).j",   "/a[1].j",    true },
        {"/x (1).j",    "/*.j",       true },
        {"/x (1).j",    "/?.j",       true },
        {"/* (1).j",    "/*.j",       false},
        {"/a.x?z",      "/a.x?z",     false},
        {"/a (1).xyz",  "/a.x?z",     true },
    };
    for (const Case& c : cases) {
        Set("/source", c.recorded);
        EXPECT_EQ(c.changed, IsChanged("/source", c.asked)) << c.recorded << " " << c.asked;
    }
}

TEST_F(FileDBTest, TheFormatOfAnUnknownSourceCountsAsChanged) {
    Set("/other", "/a.jpg");
    EXPECT_TRUE(IsChanged("/source", "/a.jpg"));
}

TEST_F(FileDBTest, CharactersOfPatternsAreEscaped) {
    EXPECT_EQ("a[[]1]b[*]c[?]d", FileDB::EscapeGlob("a[1]b*c?d"));
    EXPECT_EQ("plain's %q \\", FileDB::EscapeGlob("plain's %q \\"));
    EXPECT_EQ("", FileDB::EscapeGlob(""));
}

}  // namespace
