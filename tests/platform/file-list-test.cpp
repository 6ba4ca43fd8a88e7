#include "utils/file-list.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstring>
#include <map>
#include <random>

#include "support/log-capture.h"

namespace {

using testing::ElementsAre;

std::vector<std::string> Paths(const FileList& list) {
    std::vector<std::string> paths;
    for (auto it = list.begin(); it != list.end(); it.next()) {
        paths.push_back(it->is_dir ? it->path + "/" : it->path);
    }
    return paths;
}

class FileListTest : public testing::Test {
protected:
    NamePool m_pool;
    FileList m_list{m_pool};
};

TEST_F(FileListTest, AnEmptyListBeginsAtItsEnd) {
    EXPECT_TRUE(m_list.begin() == m_list.end());
    EXPECT_FALSE(m_list.begin() != m_list.end());
}

TEST_F(FileListTest, AFlatListComesInDescendingOrder) {
    for (const char* name : {"b", "a", "c"}) ASSERT_EQ(0, m_list.AddFile(0, name, 1, 2));
    EXPECT_THAT(Paths(m_list), ElementsAre("/c", "/b", "/a"));
}

TEST_F(FileListTest, AFolderComesAfterItsContents) {
    const int x = m_list.AddDir(FileList::ROOT, "x", 7);
    ASSERT_EQ(1, x);
    ASSERT_EQ(0, m_list.AddFile(x, "y", 8, 9));
    auto it = m_list.begin();
    EXPECT_EQ("/x/y", it->path);
    EXPECT_FALSE(it->is_dir);
    EXPECT_EQ(8u, it->mtime);
    EXPECT_EQ(9u, it->size);
    it.next();
    EXPECT_EQ("/x", it->path);
    EXPECT_TRUE(it->is_dir);
    EXPECT_EQ(7u, it->mtime);
    EXPECT_EQ(0u, it->size);
    it.next();
    EXPECT_TRUE(it == m_list.end());
}

TEST_F(FileListTest, FilesAndFoldersAreMerged) {
    const int b = m_list.AddDir(0, "b", 0);
    const int d = m_list.AddDir(0, "d", 0);
    for (const char* name : {"a", "c", "e"}) ASSERT_EQ(0, m_list.AddFile(0, name, 0, 0));
    ASSERT_EQ(0, m_list.AddFile(b, "z", 0, 0));
    ASSERT_EQ(0, m_list.AddFile(d, "1", 0, 0));
    EXPECT_EQ(5, m_list.AddDir(m_list.AddDir(d, "0", 0), "deep", 0) + 1);
    EXPECT_THAT(Paths(m_list),
                ElementsAre("/e", "/d/1", "/d/0/deep/", "/d/0/", "/d/", "/c", "/b/z", "/b/", "/a"));
}

TEST_F(FileListTest, EmptyFoldersAloneComeInDescendingOrder) {
    for (const char* name : {"b", "a"}) ASSERT_LT(0, m_list.AddDir(0, name, 0));
    EXPECT_THAT(Paths(m_list), ElementsAre("/b/", "/a/"));
}

TEST_F(FileListTest, NamesAreOrderedByTheirBytes) {
    // A prefix comes before its extensions, and bytes above 127 are the greatest.
    for (const char* name :
         {"a", "ab", "a.b", "A", "\xff", "\xc3\xa4", "b\n", "b", "aaaaaaaaab", "aaaaaaaaaa"}) {
        ASSERT_EQ(0, m_list.AddFile(0, name, 0, 0));
    }
    EXPECT_THAT(Paths(m_list), ElementsAre("/\xff", "/\xc3\xa4", "/b\n", "/b", "/ab", "/aaaaaaaaab",
                                           "/aaaaaaaaaa", "/a.b", "/a", "/A"));
}

TEST_F(FileListTest, ANameAddedTwiceLeavesTheFirstUnchanged) {
    ASSERT_EQ(0, m_list.AddFile(0, "f", 1, 2));
    ASSERT_EQ(1, m_list.AddDir(0, "d", 3));
    EXPECT_EQ(-1, m_list.AddFile(0, "f", 9, 9));
    EXPECT_EQ(-1, m_list.AddDir(0, "f", 9));
    EXPECT_EQ(-1, m_list.AddFile(0, "d", 9, 9));
    EXPECT_EQ(-1, m_list.AddDir(0, "d", 9));
    EXPECT_EQ(1u, m_list.FileCount(0));
    EXPECT_EQ(1u, m_list.DirCount(0));
    auto it = m_list.begin();
    EXPECT_EQ(1u, it->mtime);
    it.next();
    EXPECT_EQ(3u, it->mtime);
    EXPECT_EQ(2, m_list.AddDir(1, "d", 0)) << "in another folder it is another name";
    EXPECT_EQ(0, m_list.AddFile(1, "f", 0, 0));
}

TEST_F(FileListTest, ANegativeFolderIsRefused) {
    EXPECT_EQ(-1, m_list.AddFile(-1, "a", 0, 0));
    EXPECT_EQ(-1, m_list.AddDir(-1, "a", 0));
    EXPECT_TRUE(m_list.begin() == m_list.end());
}

TEST_F(FileListTest, AListCanBeReadAddedToAndReadAgain) {
    ASSERT_EQ(0, m_list.AddFile(0, "b", 0, 0));
    EXPECT_THAT(Paths(m_list), ElementsAre("/b"));
    ASSERT_EQ(0, m_list.AddFile(0, "a", 0, 0));
    ASSERT_EQ(0, m_list.AddFile(0, "c", 0, 0));
    EXPECT_THAT(Paths(m_list), ElementsAre("/c", "/b", "/a"));
    EXPECT_EQ(-1, m_list.AddFile(0, "b", 0, 0));
}

TEST_F(FileListTest, ListsOfOnePoolStoreANameOnce) {
    FileList other(m_pool);
    ASSERT_EQ(0, m_list.AddFile(0, "same", 0, 0));
    ASSERT_EQ(0, other.AddFile(0, "same", 0, 0));
    EXPECT_EQ(1u, m_pool.Size());
    EXPECT_TRUE(m_list.begin() != other.begin()) << "cursors of two lists are never equal";
}

TEST_F(FileListTest, CursorsAreEqualByFolderAndStateNotByFile) {
    ASSERT_EQ(0, m_list.AddFile(0, "a", 0, 0));
    ASSERT_EQ(0, m_list.AddFile(0, "b", 0, 0));
    auto one = m_list.begin();
    auto two = m_list.begin();
    one.next();
    EXPECT_TRUE(one == two);
    one.next();
    EXPECT_TRUE(one != two);
}

TEST_F(FileListTest, AFileAddedByPathMakesItsFolders) {
    const LogCapture log;
    EXPECT_EQ(0, m_list.AddFileByPath("/a/b/c", 5, 6));
    EXPECT_EQ(0, m_list.AddFileByPath("/a/d", 7, 8));
    EXPECT_EQ(0, m_list.AddFileByPath("e", 0, 0)) << "without a slash in front";
    EXPECT_THAT(Paths(m_list), ElementsAre("/e", "/a/d", "/a/b/c", "/a/b/", "/a/"));
    EXPECT_TRUE(log.Has("[DBG] searching parent '/a/b'"));
    EXPECT_TRUE(log.Has("[DBG] adding file 'c'"));
}

TEST_F(FileListTest, AFolderAddedByPathTakesTheNewTime) {
    const LogCapture log;
    EXPECT_EQ(0, m_list.AddFileByPath("/a/b/c", 5, 6));
    EXPECT_EQ(0, m_list.AddDirByPath("/a/b", 9));
    EXPECT_EQ(0, m_list.AddDirByPath("/a/x", 3));
    EXPECT_TRUE(log.Has("[DBG] adding directory 'x'"));
    std::map<std::string, uint32_t> times;
    for (auto it = m_list.begin(); it != m_list.end(); ++it) times[it->path] = (*it).mtime;
    EXPECT_EQ((std::map<std::string, uint32_t>{
                  {"/a",     0},
                  {"/a/b",   9},
                  {"/a/b/c", 5},
                  {"/a/x",   3}
    }),
              times);
}

TEST_F(FileListTest, BadPathsAreRefused) {
    ASSERT_EQ(0, m_list.AddFileByPath("/file", 0, 0));
    for (const std::string& path : {std::string(), std::string("/"), std::string("/a/"),
                                    "/" + std::string(1024, 'x'), std::string(1024, 'x') + "/a",
                                    std::string("/file/below"), std::string("/file/below/more")}) {
        EXPECT_EQ(-1, m_list.AddFileByPath(path, 0, 0)) << path;
        EXPECT_EQ(-1, m_list.AddDirByPath(path, 0)) << path;
    }
    EXPECT_EQ(-1, m_list.AddFileByPath("/file", 0, 0)) << "there already";
    EXPECT_EQ(-1, m_list.AddDirByPath("/file", 0)) << "there already, as a file";
    EXPECT_THAT(Paths(m_list), ElementsAre("/file"));
}

TEST_F(FileListTest, PathsUpToTheLimitsAreTaken) {
    EXPECT_EQ(0, m_list.AddFileByPath("/" + std::string(1023, 'x'), 0, 0));
    std::string path;
    while (path.size() < 4094) path += "/d";
    EXPECT_EQ(0, m_list.AddDirByPath(path + "/f", 0));
    EXPECT_EQ(-1, m_list.AddDirByPath(path + "/ff", 0));
    EXPECT_EQ(2048 + 1, static_cast<int>(Paths(m_list).size()));
}

TEST_F(FileListTest, RandomTreesComeAsASortedTreeDoes) {
    std::mt19937 random(7);
    for (int round = 0; round < 50; ++round) {
        NamePool pool;
        FileList list(pool);
        std::vector<std::string> dirs = {""};
        std::vector<std::string> wanted;
        for (int i = 0; i < 200; ++i) {
            const size_t parent = random() % dirs.size();
            std::string name;
            for (size_t k = 1 + random() % 10; k > 0; --k) name += "ab\xc3."[random() % 4];
            const std::string path = dirs[parent] + "/" + name;
            const bool is_new = std::find(wanted.begin(), wanted.end(), path) == wanted.end();
            if (random() % 3 == 0) {
                const int index = list.AddDir(static_cast<int>(parent), name, 0);
                ASSERT_EQ(is_new, index > 0);
                if (is_new) dirs.push_back(path);
            } else {
                ASSERT_EQ(is_new ? 0 : -1, list.AddFile(static_cast<int>(parent), name, 0, 0));
            }
            if (is_new) wanted.push_back(path);
        }
        // Component by component, the greater first, and what lies below before what lies above:
        // "/" as the smallest byte and an end that is smaller still.
        std::sort(wanted.begin(), wanted.end(), [](const std::string& a, const std::string& b) {
            return std::lexicographical_compare(
                b.begin(), b.end(), a.begin(), a.end(), [](char x, char y) {
                    const auto rank = [](char c) {
                        return c == '/' ? 0 : static_cast<unsigned char>(c);
                    };
                    return rank(x) < rank(y);
                });
        });
        std::vector<std::string> got;
        for (auto it = list.begin(); it != list.end(); it.next()) got.push_back(it->path);
        ASSERT_EQ(wanted, got) << "round " << round;
    }
}

// --- The pool

TEST(NamePool, ANameIsStoredOnce) {
    NamePool pool;
    const char* first = nullptr;
    const char* again = nullptr;
    const char* other = nullptr;
    std::string text = "name";
    ASSERT_EQ(0, pool.Add(text, &first));
    text[0] = 'x';
    ASSERT_EQ(0, pool.Add("name", &again));
    ASSERT_EQ(0, pool.Add("names", &other));
    EXPECT_EQ(first, again);
    EXPECT_NE(first, other);
    EXPECT_STREQ("name", first);
    EXPECT_EQ(2u, pool.Size());
    EXPECT_EQ(first, pool.Find("name"));
    EXPECT_EQ(nullptr, pool.Find("nam"));
}

TEST(NamePool, ANameWithANulIsRefused) {
    NamePool pool;
    const char* out = "";
    EXPECT_EQ(-1, pool.Add(std::string_view("a\0b", 3), &out));
    EXPECT_EQ(nullptr, out);
    EXPECT_EQ(0u, pool.Size());
}

TEST(NamePool, BlocksDoubleOrMakeRoomForALongName) {
    NamePool pool;
    const char* out = nullptr;
    EXPECT_EQ(1u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add(std::string(511, 'a'), &out));  // fills the first 512 bytes
    EXPECT_EQ(1u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add(std::string(999, 'b'), &out));  // 1,000 of 2,000 bytes
    EXPECT_EQ(2u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add(std::string(998, 'c'), &out));  // 999 of the other 1,000
    EXPECT_EQ(2u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add("", &out));  // the last byte
    EXPECT_EQ(2u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add("d", &out));  // 2 of 4,000
    EXPECT_EQ(3u, pool.BlockCount());
    ASSERT_EQ(0, pool.Add(std::string(3997, 'e'), &out));  // 3,998 more
    EXPECT_EQ(3u, pool.BlockCount());
}

TEST(NamePool, ANameGoesToTheFirstBlockWithRoom) {
    NamePool pool;
    const char* small = nullptr;
    const char* next = nullptr;
    const char* large = nullptr;
    ASSERT_EQ(0, pool.Add("a", &small));
    ASSERT_EQ(0, pool.Add(std::string(600, 'b'), &large));
    ASSERT_EQ(0, pool.Add("c", &next));
    EXPECT_EQ(small + 2, next);
}

// Thirty-two doubling blocks are more than a machine has: the rule is shown with four.
TEST(NamePool, ABlockMoreThanAllowedIsRefused) {
    EXPECT_EQ(32u, NamePool::MAX_BLOCKS);
    EXPECT_EQ(512u, NamePool::FIRST_BLOCK_BYTES);
    NamePool pool(4);
    FileList list(pool);
    const auto long_name = [](char c, size_t bytes) { return std::string(bytes - 1, c); };
    ASSERT_EQ(0, list.AddFile(0, long_name('a', 512), 1, 1));
    ASSERT_EQ(0, list.AddFile(0, long_name('b', 1024), 1, 1));  // in 2,048
    ASSERT_EQ(0, list.AddFile(0, long_name('c', 1025), 1, 1));  // in 4,096
    ASSERT_EQ(0, list.AddFile(0, long_name('d', 3072), 1, 1));  // in 8,192
    EXPECT_EQ(4u, pool.BlockCount());
    EXPECT_EQ(-1, list.AddFile(0, long_name('e', 5121), 1, 1));
    EXPECT_EQ(-1, list.AddDir(0, long_name('e', 5121), 1));
    EXPECT_EQ(4u, pool.BlockCount());
    EXPECT_EQ(4u, list.FileCount(0)) << "the entry is not added, the others stay";
    EXPECT_EQ(0u, list.DirCount(0));
    EXPECT_EQ(0, list.AddFile(0, long_name('f', 5120), 1, 1)) << "what fits is still taken";
    EXPECT_EQ(-1, list.AddFile(0, long_name('a', 512), 1, 1)) << "there already";
    EXPECT_EQ(1, list.AddDir(0, "short", 1));
    EXPECT_EQ(0, list.AddFile(1, long_name('b', 1024), 1, 1)) << "a known name takes no room";
}

}  // namespace
