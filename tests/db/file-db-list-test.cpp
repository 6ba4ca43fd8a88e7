// The lists of a folder's rows, held against the statements that say what they are.
#include <random>

#include "db/file-db-fixture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

TEST_F(FileDBTest, OneLevelOfTheRootIsWhatLiesInIt) {
    SetDir("/a");
    Set("/a/b", "/a/b");
    Set("/c", "/c", 7, 8);
    EXPECT_THAT(List("/"), ElementsAre("/c=7@8", "/a/"));
}

TEST_F(FileDBTest, OneLevelOfAFolderIsWhatLiesInIt) {
    for (const char* path : {"/a/b", "/a/b/c/d", "/ab", "/a/x", "/a-/y"}) Set(path, path);
    SetDir("/a");
    EXPECT_THAT(List("/a"), ElementsAre("/x=1@1000", "/b=1@1000"));
}

TEST_F(FileDBTest, AllLevelsComeWithTheirFolders) {
    SetDir("/a");
    SetDir("/a/b");
    Set("/a/b/c", "/x", 3, 4);
    Set("/a/d", "/y", 5, 6);
    Set("/e", "/z");
    EXPECT_THAT(List("/a", true), ElementsAre("/d=5@6", "/b/c=3@4", "/b/"));
    EXPECT_THAT(List("/", true),
                ElementsAre("/e=1@1000", "/a/d=5@6", "/a/b/c=3@4", "/a/b/", "/a/"));
}

TEST_F(FileDBTest, AFolderWithoutRowsListsEmpty) {
    Set("/a/b", "/x");
    EXPECT_THAT(List("/b"), IsEmpty());
    EXPECT_THAT(List("/a/b"), IsEmpty());
    EXPECT_THAT(List("/a/"), IsEmpty()) << "a path has no slash at its end";
}

TEST_F(FileDBTest, WhatIsAddedIsLogged) {
    SetDir("/f/a");
    Set("/f/b", "/x");
    List("/f");
    EXPECT_TRUE(m_log.Has("[DBG] adding directory to file list: a"));
    EXPECT_TRUE(m_log.Has("[DBG] adding file to file list: b"));
}

TEST_F(FileDBTest, ARowThatAListCannotTakeIsLeftOutAndToldOf) {
    Set("/", "/x");
    Set("/b", "/b");
    EXPECT_THAT(List("/"), ElementsAre("/b=1@1000"));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to add '/' to file list"));
    m_log.Clear();
    EXPECT_THAT(List("/", true), ElementsAre("/b=1@1000"));
    EXPECT_TRUE(m_log.Has("[WARN] Failed to add '/' to file list"));
}

// Random trees with names around the slash in the order of bytes, and what a pattern would take for
// something else.
TEST_F(FileDBTest, ListsEqualWhatTheStatementsSelect) {
    const char* const names[] = {"a",  "a b", "a!", "a-", "a.",       "a/", "a0", "a[1]",
                                 "a1", "*",   "z",  "~",  "\xc3\xa9", "!",  "ab"};
    std::mt19937 random(1);
    for (int n = 0; n < 400; ++n) {
        std::string path;
        for (size_t depth = random() % 4 + 1; depth > 0; --depth) {
            path += "/";
            path += names[random() % std::size(names)];
        }
        while (path.back() == '/') path.pop_back();
        if (random() % 3 == 0) {
            SetDir(path);
        } else {
            Set(path, path);
        }
    }
    for (const char* folder : {"/", "/a", "/a[1]", "/*", "/a/a", "/a!", "/z/~", "/a/a0/a"}) {
        const std::string path = folder;
        const std::string pattern = path == "/" ? "/" : FileDB::EscapeGlob(path + "/");
        const std::string where =
            "SELECT COUNT(DISTINCT source_path) FROM file_info_table WHERE "
            "source_path GLOB '" +
            pattern + "*' AND source_path NOT GLOB '" + pattern + "*/*' AND source_path <> '" +
            path + "/'";
        EXPECT_EQ(Raw(where), std::to_string(List(path).size())) << folder;
    }
}

TEST_F(FileDBTest, ManyRowsBelowAFolderAreNoPartOfOneLevel) {
    SetDir("/a");
    Set("/b", "/b");
    RawDatabase raw(m_path);
    raw.Run(
        "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 20000) INSERT "
        "INTO file_info_table (source_path, destination_path, file_type, size, mtime) SELECT "
        "'/a/' || i, '/x', 0, 1, 1 FROM n;");
    EXPECT_THAT(List("/"), ElementsAre("/b=1@1000", "/a/"));
}

}  // namespace
