#include "strategy/recycle-bin.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include "strategy-fixture.h"

namespace {

using testing::ElementsAre;
using testing::Pair;

class RecycleBinTest : public StrategyFixture {
protected:
    void EnableBin(bool is_admin_only = false) {
        m_fake.AddShare({.name = "photos",
                         .path = m_share,
                         .recycle_bin = true,
                         .recycle_bin_admin_only = is_admin_only});
    }
    RecycleBin m_bin;
};

TEST_F(RecycleBinTest, WithoutABinAFileIsDeletedForGood) {
    WriteDst("/a/b.txt", "x");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/a/b.txt"), false));
    EXPECT_FALSE(IsThere(Dst("/a/b.txt")));
    EXPECT_TRUE(m_fake.Recycled().empty());
    EXPECT_TRUE(m_log.Has("[INFO] RemoveFile: remove path '" + Dst("/a/b.txt") + "'"));
}

TEST_F(RecycleBinTest, WithoutABinAFolderIsDeletedWithAllItHolds) {
    WriteDst("/a/b/c.txt", "x");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/a"), true));
    EXPECT_FALSE(IsThere(Dst("/a")));
}

TEST_F(RecycleBinTest, WithABinAFileGoesThereUnderItsRelativePath) {
    EnableBin();
    WriteDst("/a/b.txt", "bytes");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/a/b.txt"), false));
    EXPECT_FALSE(IsThere(Dst("/a/b.txt")));
    EXPECT_EQ("bytes", ReadWholeFile(m_share + "/#recycle/copy/a/b.txt"));
    EXPECT_THAT(m_fake.Recycled(), ElementsAre(Pair(m_share, "copy/a/b.txt")));
}

TEST_F(RecycleBinTest, AFolderGoesThereWholeAndTheBinLearnsWhoMayEnter) {
    EnableBin(true);
    WriteDst("/a/b.txt", "bytes");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/a"), true));
    EXPECT_EQ("bytes", ReadWholeFile(m_share + "/#recycle/copy/a/b.txt"));
    EXPECT_THAT(m_fake.CallsOf("KELDRecycleRmDirWithSharePath"),
                ElementsAre(ElementsAre(m_share, "copy/a", "0", "1")));
}

TEST_F(RecycleBinTest, ABinForEveryoneIsToldSo) {
    EnableBin(false);
    MakeDstDir("/a");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/a"), true));
    EXPECT_THAT(m_fake.CallsOf("KELDRecycleRmDirWithSharePath"),
                ElementsAre(ElementsAre(m_share, "copy/a", "0", "0")));
}

TEST_F(RecycleBinTest, APathOutsideEveryShareIsRefusedThoughItCouldBeDeleted) {
    const std::string path = m_dir.Write("elsewhere/file", "x");
    EXPECT_EQ(-1, m_bin.RemoveFile(path, false));
    EXPECT_TRUE(IsThere(path));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get share name for '" + path + "'"));
}

TEST_F(RecycleBinTest, AShareWithoutARecordFails) {
    WriteDst("/b.txt", "x");
    m_fake.FailCall("KELDShareGet");
    EXPECT_EQ(-1, m_bin.RemoveFile(Dst("/b.txt"), false));
    EXPECT_TRUE(IsThere(Dst("/b.txt")));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get share info 'photos'"));
}

TEST_F(RecycleBinTest, AFailedRecycleLeavesTheFileWhereItIs) {
    EnableBin();
    WriteDst("/b.txt", "x");
    m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath", KELDERR_NO_SPACE);
    EXPECT_EQ(-1, m_bin.RemoveFile(Dst("/b.txt"), false));
    EXPECT_TRUE(IsThere(Dst("/b.txt")));
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to recycle file for share_path = '" + m_share +
                               "', rel_path = 'copy/b.txt'\n[0x2400 "));
}

TEST_F(RecycleBinTest, AFailedRecycleLeavesTheFolderWhereItIs) {
    EnableBin();
    WriteDst("/a/b.txt", "x");
    m_fake.FailCall("KELDRecycleRmDirWithSharePath", KELDERR_IO);
    EXPECT_EQ(-1, m_bin.RemoveFile(Dst("/a"), true));
    EXPECT_TRUE(IsThere(Dst("/a/b.txt")));
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to recycle dir for share_path = '" + m_share +
                               "', rel_path = 'copy/a'\n[0x6C00 "));
}

TEST_F(RecycleBinTest, ADeviceThatIsAShareWithABinReceivesItsOwnFiles) {
    m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1", .recycle_bin = true});
    WriteSrc("/b.txt", "bytes");
    EXPECT_EQ(0, m_bin.RemoveFile(Src("/b.txt"), false));
    EXPECT_EQ("bytes", ReadWholeFile(m_usb + "/#recycle/data/b.txt"));
}

TEST_F(RecycleBinTest, ALinkGoesItselfAndWhatItLeadsToStays) {
    const std::string file = m_dir.Write("elsewhere/file", "bytes");
    for (const bool has_bin : {true, false}) {
        m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = has_bin});
        for (const std::string& target : {file, m_dir / "elsewhere", std::string("nowhere")}) {
            ASSERT_EQ(0, symlink(target.c_str(), Dst("/link").c_str()));
            EXPECT_EQ(0, m_bin.RemoveFile(Dst("/link"), false)) << has_bin << " " << target;
            EXPECT_FALSE(IsThere(Dst("/link"))) << has_bin << " " << target;
            EXPECT_EQ("bytes", ReadWholeFile(file));
            const std::string recycled = m_share + "/#recycle/copy/link";
            EXPECT_EQ(has_bin, IsThere(recycled));
            if (has_bin) {
                char found[256] = "";
                EXPECT_LT(0, readlink(recycled.c_str(), found, sizeof(found) - 1));
                EXPECT_EQ(target, found);
                ASSERT_EQ(0, unlink(recycled.c_str()));
            }
        }
    }
}

TEST_F(RecycleBinTest, AShareThatDoesNotTellOfABinCountsAsOneWithout) {
    EnableBin();
    WriteDst("/b.txt", "x");
    m_fake.FailCall("KLIBShareRecycleStatusGet");
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/b.txt"), false));
    EXPECT_FALSE(IsThere(Dst("/b.txt")));
    EXPECT_THAT(m_fake.Recycled(), testing::IsEmpty());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get share recycle bin status"));
}

TEST_F(RecycleBinTest, TheBinAndWhatLiesInItIsNeverRemoved) {
    for (const bool has_bin : {true, false}) {
        m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = has_bin});
        m_dir.Write("volume1/photos/#recycle/old/x", "old");
        EXPECT_EQ(-1, m_bin.RemoveFile(m_share + "/#recycle", true));
        EXPECT_EQ(-1, m_bin.RemoveFile(m_share + "/#recycle/old", true));
        EXPECT_EQ(-1, m_bin.RemoveFile(m_share + "/#recycle/old/x", false));
        EXPECT_EQ("old", ReadWholeFile(m_share + "/#recycle/old/x"));
        EXPECT_TRUE(m_log.Has("[ERR] Failed to remove '" + m_share +
                              "/#recycle', it belongs to the recycle bin."));
    }
}

TEST_F(RecycleBinTest, ANameThatOnlyBeginsLikeTheBinIsRemoved) {
    m_dir.Write("volume1/photos/#recycle2", "x");
    m_dir.Write("volume1/photos/copy/#recycle", "x");
    EXPECT_EQ(0, m_bin.RemoveFile(m_share + "/#recycle2", false));
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/#recycle"), false));
    EXPECT_FALSE(IsThere(m_share + "/#recycle2"));
    EXPECT_FALSE(IsThere(Dst("/#recycle")));
}

TEST_F(RecycleBinTest, AMissingFileIsNoFailureWithoutABin) {
    EXPECT_EQ(0, m_bin.RemoveFile(Dst("/nothing"), false));
}

}  // namespace
