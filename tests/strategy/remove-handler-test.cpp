#include "strategy/remove-handler.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include "strategy-fixture.h"
#include "utils/error-code.h"

namespace {

class RemoveHandlerTest : public StrategyFixture {};

TEST_F(RemoveHandlerTest, AMirrorRemovesTheEntryAtTheDestination) {
    WriteDst("/a/b.txt", "x");
    WriteDst("/d/e", "x");
    EXPECT_EQ(0, HandleRemove("/a/b.txt", false));
    EXPECT_EQ(0, HandleRemove("/d", true));
    EXPECT_TRUE(
        m_log.Has("[INFO] MirrorRemoveHandler: remove path '" + Dst("/a/b.txt") + "', [task: 7]"));
    EXPECT_THAT(NamesOf(Dst()), testing::ElementsAre("/a/"));
}

TEST_F(RemoveHandlerTest, AnEntryThatTheTaskFilterRefusesStays) {
    SetTaskFilterNames({"keep"});
    WriteDst("/keep", "x");
    WriteDst("/sub/keep/inside", "x");
    EXPECT_EQ(ERR_IGNORE, HandleRemove("/keep", false));
    EXPECT_EQ(ERR_IGNORE, HandleRemove("/sub/keep", true));
    EXPECT_TRUE(m_log.Has("[WARN] file '/keep' fail to pass filter [reason: -261]"));
    EXPECT_TRUE(IsThere(Dst("/keep")));
    EXPECT_TRUE(IsThere(Dst("/sub/keep/inside")));
}

TEST_F(RemoveHandlerTest, ATaskWithoutAFilterRemovesNothing) {
    WriteDst("/a", "x");
    m_task.task_filter.reset();
    EXPECT_EQ(ERR_SYSTEM, HandleRemove("/a", false));
    EXPECT_TRUE(m_log.Has("[ERR] File Filter is NULL [task: 7]"));
    EXPECT_TRUE(IsThere(Dst("/a")));
}

TEST_F(RemoveHandlerTest, AFailedRemovalIsAFileErrorAndTheFileStays) {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
    m_fake.FailCall("KELDRecycleUnlinkFileWithSharePath");
    WriteDst("/a", "x");
    EXPECT_EQ(ERR_FILE_OPERATION, HandleRemove("/a", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + Dst("/a") + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] RemoveHandler: Failed to remove '/a', is_dir '0'"));
    EXPECT_TRUE(IsThere(Dst("/a")));
}

TEST_F(RemoveHandlerTest, NothingIsRemovedOnceTheDeviceIsGone) {
    WriteDst("/a", "x");
    WriteDst("/d/e", "x");
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleRemove("/a", false));
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleRemove("/d", true));
    EXPECT_TRUE(IsThere(Dst("/a")));
    EXPECT_TRUE(IsThere(Dst("/d/e")));
}

TEST_F(RemoveHandlerTest, NothingIsRemovedFromAGoneDestinationDeviceOrForALockedShare) {
    MakeExport();
    WriteDst("/a", "x");
    m_fake.LockShare("photos");
    EXPECT_EQ(ERR_SHARE_NOT_MOUNTED, HandleRemove("/a", false));
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_DST_ROOT_MISS, HandleRemove("/a", false));
    EXPECT_TRUE(IsThere(Dst("/a")));
}

TEST_F(RemoveHandlerTest, NothingIsRemovedThroughALinkOnTheWay) {
    const std::string other = m_dir.Write("elsewhere/file", "untouched");
    ASSERT_EQ(0, symlink((m_dir / "elsewhere").c_str(), Dst("/d").c_str()));
    EXPECT_EQ(ERR_FILE_OPERATION, HandleRemove("/d/file", false));
    EXPECT_EQ("untouched", ReadWholeFile(other));
}

}  // namespace
