// Destinations that ignore case: two names of the source are one there. What was moved must not be
// replaced or removed for the other.
#include <filesystem>

#include "db/task-info.h"
#include "inc-backup-fixture.h"
#include "spelling-faults.h"
#include "strategy/destination.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

class IncBackupSpellingTest : public IncBackupFixture {
protected:
    IncBackupSpellingTest() { m_task.remove_src_file = true; }

    // What stands under `stored` is from now on found as `found`; such a file system would list it
    // under its own name, which OtherSpelling() does.
    void FindAs(const std::string& stored, const std::string& found) const {
        fs::rename(Dst(stored), Dst(found));
    }
};

TEST_F(IncBackupSpellingTest, AMovedFileIsNotReplacedByOneOfAnotherSpelling) {
    for (const int policy : {CONFLICT_POLICY_OVERWRITE, CONFLICT_POLICY_RENAME}) {
        m_task.conflict_policy = policy;
        WriteSrc("/img.jpg", "first", 1000);
        RunWell();
        FindAs("/img.jpg", "/IMG.JPG");
        WriteSrc("/IMG.JPG", "other", 2000);
        {
            const OtherSpelling spelling(Dst(), "IMG.JPG", "img.jpg");
            EXPECT_EQ(0, RunTask());
        }
        EXPECT_THAT(NamesOf(Src()), IsEmpty());
        EXPECT_THAT(NamesOf(Dst()), ElementsAre("/IMG.JPG=other",
                                                MatchesRegex("/IMG_Ferrix_.*_Conflict.JPG=first")));
        fs::remove_all(Dst());
        fs::create_directory(Dst());
    }
}

TEST_F(IncBackupSpellingTest, NeitherIsOneInAFolderOfAnotherSpelling) {
    WriteSrc("/dcim/a", "first", 1000);
    RunWell();
    FindAs("/dcim", "/DCIM");
    fs::remove(Src("/dcim"));
    WriteSrc("/DCIM/a", "other", 2000);
    {
        const OtherSpelling spelling(Dst(), "DCIM", "dcim");
        EXPECT_EQ(0, RunTask());
    }
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/DCIM/", "/DCIM/a=other",
                                            MatchesRegex("/DCIM/a_Ferrix_.*_Conflict=first")));
}

TEST_F(IncBackupSpellingTest, ARecordOfAnEarlierRunDoesNotMakeItReplaceable) {
    m_task.remove_src_file = false;
    WriteSrc("/IMG.JPG", "mine!", 1000);
    RunWell();
    m_task.remove_src_file = true;
    WriteDst("/IMG.JPG", "other", 1000);  // of the size and the time that the record tells
    WriteSrc("/IMG.JPG", "newer", 2000);
    {
        const OtherSpelling spelling(Dst(), "IMG.JPG", "img.jpg");
        EXPECT_EQ(0, RunTask());
    }
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/IMG.JPG=newer", MatchesRegex("/IMG_Ferrix_.*_Conflict.JPG=other")));
}

TEST_F(IncBackupSpellingTest, TwoThatAreEqualAreOne) {
    WriteSrc("/img.jpg", "bytes", 1000);
    RunWell();
    FindAs("/img.jpg", "/IMG.JPG");
    WriteSrc("/IMG.JPG", "bytes", 1000);
    {
        const OtherSpelling spelling(Dst(), "IMG.JPG", "img.jpg");
        RunWell();
    }
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/IMG.JPG=bytes"));
    EXPECT_THAT(NamesOf(Src()), IsEmpty());
}

TEST_F(IncBackupSpellingTest, AFolderOfMovedFilesIsNotRemovedForAFile) {
    WriteSrc("/dcim/a", "first", 1000);
    RunWell();
    FindAs("/dcim", "/DCIM");
    fs::remove(Src("/dcim"));
    WriteSrc("/DCIM", "a file", 2000);
    {
        const OtherSpelling spelling(Dst(), "DCIM", "dcim");
        EXPECT_EQ(0, RunTask());
    }
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/DCIM=a file", MatchesRegex("/DCIM_Ferrix_.*_TypeConflict/"),
                            MatchesRegex("/DCIM_Ferrix_.*_TypeConflict/a=first")));
}

TEST_F(IncBackupSpellingTest, AMovedFileIsNotRemovedForAFolder) {
    WriteSrc("/dcim", "first", 1000);
    RunWell();
    FindAs("/dcim", "/DCIM");
    MakeSrcDir("/DCIM");
    {
        const OtherSpelling spelling(Dst(), "DCIM", "dcim");
        EXPECT_EQ(ERR_DST_TYPE_CONFLICT, HandleCreate("/DCIM"));
        EXPECT_EQ(0, HandleCreate("/DCIM"));
    }
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre("/DCIM/", MatchesRegex("/DCIM_Ferrix_.*_TypeConflict=first")));
}

TEST_F(IncBackupSpellingTest, OfTheSameSpellingThePolicyHolds) {
    WriteSrc("/img.jpg", "first", 1000);
    RunWell();
    WriteSrc("/img.jpg", "other", 2000);
    RunWell();
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/img.jpg=other"));
}

TEST_F(IncBackupSpellingTest, WhereSourcesStayThePolicyHolds) {
    m_task.remove_src_file = false;
    WriteDst("/IMG.JPG", "old", 1000);
    WriteSrc("/IMG.JPG", "new", 2000);
    {
        const OtherSpelling spelling(Dst(), "IMG.JPG", "img.jpg");
        RunWell();
    }
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/IMG.JPG=new"));
}

TEST_F(IncBackupSpellingTest, WhatIsMissingHasNoOtherSpelling) {
    WriteDst("/d/a", "x");
    EXPECT_FALSE(IsSpelledOtherwise(Dst(), Dst("/d/a")));
    EXPECT_FALSE(IsSpelledOtherwise(Dst(), Dst("/d/b")));
    EXPECT_FALSE(IsSpelledOtherwise(Dst(), Dst("/e/a")));
    EXPECT_FALSE(IsSpelledOtherwise(Dst(), Dst()));
    const OtherSpelling spelling(Dst(), "d", "D");
    EXPECT_TRUE(IsSpelledOtherwise(Dst(), Dst("/d/a")));
    EXPECT_TRUE(IsSpelledOtherwise(Dst(), Dst("/d")));
}

}  // namespace
