#include "strategy/create-handler.h"

#include <gmock/gmock.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>

#include "db/task-info.h"
#include "strategy-fixture.h"
#include "utils/error-code.h"

namespace {

using testing::ElementsAre;
using testing::MatchesRegex;

class PlainCreate final : public CreateHandler {
public:
    int m_path_result = 0;

protected:
    int SetCreateFullPath() override {
        return m_path_result < 0 ? m_path_result : CreateHandler::SetCreateFullPath();
    }
};

class CreateHandlerTest : public StrategyFixture {
protected:
    int Create(const std::string& path) {
        return Handle(m_create, EV_CREATE, path, EVENT_FLAG_DIR);
    }
    void RenamePolicy() {
        m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
        m_task.conflict_policy = CONFLICT_POLICY_RENAME;
    }
    PlainCreate m_create;
};

TEST_F(CreateHandlerTest, AFolderIsMadeWithTheDateOfItsSource) {
    MakeSrcDir("/a/b");
    SetMtime(Src("/a/b"), 123456);
    EXPECT_EQ(0, Create("/a/b"));
    EXPECT_TRUE(IsThere(Dst("/a/b")));
    EXPECT_EQ(123456, MtimeOf(Dst("/a/b")));
    EXPECT_TRUE(m_log.Has("[INFO] CreateHandler: SetCreateFullPath = " + Dst("/a/b")));
}

TEST_F(CreateHandlerTest, WhatIsMadeBelongsToTheOwnerOfCopies) {
    if (geteuid() != 0) GTEST_SKIP() << "only root gives files away";
    MakeSrcDir("/a/b");
    EXPECT_EQ(0, Create("/a/b"));
    for (const char* path : {"/a", "/a/b"}) {
        struct stat info {};
        ASSERT_EQ(0, stat(Dst(path).c_str(), &info));
        EXPECT_EQ(1024U, info.st_uid);
        EXPECT_EQ(100U, info.st_gid);
    }
}

TEST_F(CreateHandlerTest, AFolderThatExistsGetsItsDateAgain) {
    MakeSrcDir("/a");
    SetMtime(Src("/a"), 5000);
    WriteDst("/a/inside", "kept");
    EXPECT_EQ(0, Create("/a"));
    EXPECT_EQ(5000, MtimeOf(Dst("/a")));
    EXPECT_EQ("kept", ReadWholeFile(Dst("/a/inside")));
}

TEST_F(CreateHandlerTest, ASourceFolderThatHasGoneGivesThePresentDate) {
    const time_t before = time(nullptr);
    EXPECT_EQ(0, Create("/gone"));
    EXPECT_GE(MtimeOf(Dst("/gone")), before);
}

TEST_F(CreateHandlerTest, AFileEventIsIgnored) {
    EXPECT_EQ(ERR_IGNORE, Handle(m_create, EV_CREATE, "/a", 0));
    EXPECT_TRUE(m_log.Has("[ERR] current event '/a' is not folder"));
    EXPECT_FALSE(IsThere(Dst("/a")));
}

TEST_F(CreateHandlerTest, ATaskWithoutAFilterIsASystemError) {
    m_task.task_filter.reset();
    EXPECT_EQ(ERR_SYSTEM, Create("/a"));
    EXPECT_TRUE(m_log.Has("[ERR] File Filter is NULL [task: 7]"));
}

TEST_F(CreateHandlerTest, AFolderThatFailsTheFilterIsIgnored) {
    MakeSrcDir("/secret");
    SetTaskFilterNames({"secret"});
    EXPECT_EQ(ERR_IGNORE, Create("/secret"));
    EXPECT_TRUE(m_log.Has("[WARN] file '/secret' fail to pass filter [reason: -261]"));
    EXPECT_FALSE(IsThere(Dst("/secret")));
}

TEST_F(CreateHandlerTest, AFailedChoiceOfThePathIsReturned) {
    m_create.m_path_result = ERR_INVALID_ARGUMENT;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, Create("/a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set create full path for event '/a' [ret = -4]"));
    EXPECT_TRUE(m_log.Has("[ERR] CreateHandler: failed to handle event '/a'"));
}

TEST_F(CreateHandlerTest, ASourceThatCannotBeAskedForIsAFileError) {
    const std::string name = "/" + std::string(300, 'n');
    EXPECT_EQ(ERR_FILE_OPERATION, Create(name));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to FSStat '" + Src(name) + "'."));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to run create for path '" + Dst(name) + "' [ret = -10]"));
}

TEST_F(CreateHandlerTest, AFileInTheWayIsRemovedAndTheEventRunsAgain) {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
    MakeSrcDir("/a");
    WriteDst("/a", "in the way");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Create("/a"));
    EXPECT_TRUE(m_log.Contains("[ERR] Failed to create folder '" + Dst("/a") + "' for task '7' ["));
    EXPECT_TRUE(
        m_log.Has("[INFO] File '" + Dst("/a") + "' conflict, apply conflict policy OVERWRITE"));
    EXPECT_TRUE(m_log.Has("[INFO] Conflict Policy is overwrite, remove '" + Dst("/a") +
                          "', try copy again."));
    EXPECT_EQ("in the way", ReadWholeFile(m_share + "/#recycle/copy/a"));
    EXPECT_EQ(0, Create("/a"));
}

TEST_F(CreateHandlerTest, WithThePolicyRenameAFileInTheWayIsMovedAside) {
    RenamePolicy();
    MakeSrcDir("/a");
    WriteDst("/a", "in the way");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Create("/a"));
    EXPECT_TRUE(
        m_log.Has("[INFO] File '" + Dst("/a") + "' conflict, apply conflict policy RENAME"));
    EXPECT_TRUE(m_log.Has("[INFO] Rename Destination file success, try copy again"));
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre(MatchesRegex("/a_Ferrix_[A-Za-z0-9-]+_TypeConflict=in the way")));
    EXPECT_EQ(0, Create("/a"));
}

TEST_F(CreateHandlerTest, ALinkInTheWayIsRemovedAndNeverFollowed) {
    m_dir.MakeDir("elsewhere");
    SetMtime(m_dir / "elsewhere", 77);
    MakeSrcDir("/a");
    ASSERT_EQ(0, symlink((m_dir / "elsewhere").c_str(), Dst("/a").c_str()));
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Create("/a"));
    EXPECT_EQ(0, Create("/a"));
    EXPECT_EQ(77, MtimeOf(m_dir / "elsewhere"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/a/"));
}

TEST_F(CreateHandlerTest, AFileInTheWayOfAParentIsNotThisFoldersConflict) {
    MakeSrcDir("/a/b");
    WriteDst("/a", "in the way");
    EXPECT_EQ(ERR_FILE_OPERATION, Create("/a/b"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Destination file does not exist '" + Dst("/a/b") + "', should retry."));
    EXPECT_EQ("in the way", ReadWholeFile(Dst("/a")));
}

TEST_F(CreateHandlerTest, AConflictIsNotRemovedOnceTheDeviceIsGone) {
    MakeSrcDir("/a");
    WriteDst("/a", "theirs");
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Create("/a"));
    EXPECT_EQ("theirs", ReadWholeFile(Dst("/a")));
}

TEST_F(CreateHandlerTest, AFolderThatAGoneDeviceRefusesIsNotRetried) {
    MakeSrcDir("/a/b");
    WriteDst("/a", "in the way of the parent");
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Create("/a/b"));
    EXPECT_TRUE(m_log.Has("[ERR] CreateHandler: failed to handle event '/a/b'"));
}

TEST_F(CreateHandlerTest, AFullDestinationIsToldSo) {
    if (geteuid() != 0) GTEST_SKIP() << "needs root to mount a small file system";
    if (mount("tmpfs", m_share.c_str(), "tmpfs", 0, "size=64k,nr_inodes=3") != 0) {
        GTEST_SKIP() << "a tmpfs cannot be mounted here";
    }
    MakeSrcDir("/a/b/c");
    EXPECT_EQ(ERR_DST_QUOTA_FULL, Create("/a/b/c"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create folder '" + Dst("/a/b/c") +
                          "' for task '7' [No space left on device]"));
    EXPECT_EQ(0, umount(m_share.c_str()));
}

TEST_F(CreateHandlerTest, MirrorFoldersLandAtTheEventsOwnPath) {
    MakeSrcDir("/a");
    EXPECT_EQ(0, HandleCreate("/a"));
    EXPECT_TRUE(m_log.Has("[INFO] Mirror: GetDstFullPath = " + Dst("/a")));
    EXPECT_TRUE(m_log.Has("[INFO] MirrorCreateHandler: SetCreateFullPath = " + Dst("/a")));
    EXPECT_EQ(0, HandleCreate("/")) << "the root lands at the root";
    EXPECT_TRUE(m_log.Has("[INFO] MirrorCreateHandler: SetCreateFullPath = " + Dst()));
}

}  // namespace
