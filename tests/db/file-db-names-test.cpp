// The names that are taken at the destination, and the lowest free number of one.
#include <set>

#include "db/file-db-fixture.h"

namespace {

TEST_F(FileDBTest, TheFirstFreeNumberIsOne) { EXPECT_EQ(1U, FreeNumber("/a", "jpg")); }

TEST_F(FileDBTest, NumbersAreGivenOneAfterTheOther) {
    for (uint64_t n = 1; n <= 50; ++n) {
        ASSERT_EQ(n, FreeNumber("/a", "jpg"));
        ASSERT_EQ(n, FreeNumber("/a", "jpg")) << "not taken yet";
        Set("/s" + std::to_string(n), FileDB::NumberedPath("/a", "jpg", n));
    }
}

TEST_F(FileDBTest, AGapIsFilledFirst) {
    for (const char* n : {"1", "2", "4", "5"})
        Set(std::string("/s") + n, "/a (" + std::string(n) + ").jpg");
    EXPECT_EQ(3U, FreeNumber("/a", "jpg"));
    Set("/s3", "/a (3).jpg");
    EXPECT_EQ(6U, FreeNumber("/a", "jpg"));
}

TEST_F(FileDBTest, ANumberThatComesFreeIsGivenAgain) {
    for (int n = 1; n <= 3; ++n) Set("/s" + std::to_string(n), FileDB::NumberedPath("/a", "", n));
    EXPECT_EQ(4U, FreeNumber("/a", ""));
    EXPECT_EQ(0, m_db.RemoveFileInfoBySourcePath("/s2"));
    EXPECT_EQ(2U, FreeNumber("/a", ""));
    Set("/s1", "/elsewhere");
    EXPECT_EQ(1U, FreeNumber("/a", ""));
}

TEST_F(FileDBTest, ANumberThatIsForgottenAsUnprovenIsGivenAgain) {
    Set("/s1", "/a (1)");
    EXPECT_EQ(2U, FreeNumber("/a", ""));
    EXPECT_EQ(0, m_db.ForgetUnproven());
    EXPECT_EQ(1U, FreeNumber("/a", ""));
}

TEST_F(FileDBTest, OnlyExactNamesCount) {
    for (const char* path : {"/a (01).jpg", "/a (1).png", "/a (1)", "/a (1).jpg/x", "/a (0).jpg",
                             "/a ().jpg", "/a (1 ).jpg", "/a (99999999999999999999999).jpg",
                             "/A (1).jpg", "/a(1).jpg", "/a (1).jpgx", "/a (-1).jpg"}) {
        Set(std::string("/s") + path, path);
    }
    EXPECT_EQ(1U, FreeNumber("/a", "jpg"));
    EXPECT_EQ(2U, FreeNumber("/a", ""));
}

TEST_F(FileDBTest, TenThousandPicturesOfOneSecondGetTenThousandNames) {
    std::set<std::string> names;
    for (int n = 1; n <= 10000; ++n) {
        const std::string name = FileDB::NumberedPath("/2023-05-06_070809", "JPG",
                                                      FreeNumber("/2023-05-06_070809", "JPG"));
        names.insert(name);
        const FileInfo info{"/s" + std::to_string(n), name, FILE_INFO_FILE, 1, 1};
        const bool is_moved = n % 50 == 0;  // which waits for the disk
        ASSERT_EQ(0, is_moved ? m_db.AddMovedFile(info) : m_db.SetFileInfoInBatch(info));
    }
    EXPECT_EQ(10000U, names.size());
    ProveAll();
    Reopen();
    EXPECT_EQ(10001U, FreeNumber("/2023-05-06_070809", "JPG"));
}

TEST_F(FileDBTest, MoreNamesThanAreRememberedStayRight) {
    for (int n = 0; n < 5000; ++n) EXPECT_EQ(1U, FreeNumber("/a" + std::to_string(n), "jpg"));
    Set("/s", "/a0 (1).jpg");
    EXPECT_EQ(2U, FreeNumber("/a0", "jpg"));
}

TEST_F(FileDBTest, AMovedFileTakesItsNameWithoutARow) {
    EXPECT_EQ(0, m_db.IsDestinationTaken("/a.jpg"));
    EXPECT_EQ(0, m_db.AddMovedFile({"/s", "/a.jpg", FILE_INFO_FILE, 5, 6}));
    EXPECT_EQ(1, m_db.IsDestinationTaken("/a.jpg"));
    EXPECT_EQ("", ByDestination("/a.jpg"));
    EXPECT_EQ("", BySource("/s"));
    EXPECT_EQ(0, m_db.AddMovedFile({"/t", "/a (1).jpg", FILE_INFO_FILE, 5, 6}));
    EXPECT_EQ(2U, FreeNumber("/a", "jpg"));
    Reopen();
    EXPECT_EQ(1, m_db.IsDestinationTaken("/a.jpg"));
    FileInfo moved{"/s", "", FILE_INFO_FILE, 5, 6};
    EXPECT_EQ(1, m_db.GetMovedFile(moved));
    EXPECT_EQ("/a.jpg", moved.destination_path);
    EXPECT_EQ(0, m_db.ForgetMovedFiles());
    EXPECT_EQ(0, m_db.GetMovedFile(moved));
    EXPECT_EQ(0, m_db.IsDestinationTaken("/a.jpg"));
    EXPECT_EQ(1U, FreeNumber("/a", "jpg"));
}

TEST_F(FileDBTest, AMovedFileIsKnownByItsSourceSizeAndTime) {
    EXPECT_EQ(0, m_db.AddMovedFile({"/s", "/a.jpg", FILE_INFO_FILE, 5, 6}));
    FileInfo same{"/s", "", FILE_INFO_FILE, 5, 6};
    EXPECT_EQ(1, m_db.GetMovedFile(same));
    EXPECT_EQ("/a.jpg", same.destination_path);
    for (FileInfo other : {
             FileInfo{"/s", "", FILE_INFO_FILE, 4, 6},
             {"/s", "", FILE_INFO_FILE, 5, 7},
             {"/t", "", FILE_INFO_FILE, 5, 6}
    }) {
        EXPECT_EQ(0, m_db.GetMovedFile(other));
    }
}

TEST_F(FileDBTest, AMovedFileLosesTheRowThatItHad) {
    Set("/s", "/old (1).jpg");
    Set("/s2", "/s2");
    EXPECT_EQ(2U, FreeNumber("/old", "jpg"));
    EXPECT_EQ(0, m_db.AddMovedFile({"/s", "/new.jpg", FILE_INFO_FILE, 5, 6}));
    EXPECT_EQ("/s2", Sources());
    EXPECT_EQ(1U, FreeNumber("/old", "jpg"));
}

TEST_F(FileDBTest, ARowTakesItsName) {
    Set("/s", "/a.jpg");
    EXPECT_EQ(1, m_db.IsDestinationTaken("/a.jpg"));
    EXPECT_EQ(0, m_db.IsDestinationTaken("/s"));
}

}  // namespace
