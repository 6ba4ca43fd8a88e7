// The settings of an older release go when they live on in a default task, and not before.
#include <sys/wait.h>
#include <unistd.h>

#include "db/task-db.h"
#include "updater/rename-faults.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

constexpr char BOTH_KEYS[] = "ferrixfolder=\"photos/in\"\nsdferrixfolder=\"cards\"\nkeep=\"1\"\n";

class OldKeyTest : public UpdaterTest {
protected:
    OldKeyTest() {
        SetCapabilities("ferrix=\"yes\"\nsdferrix=\"yes\"\n");
        SetSettings(BOTH_KEYS);
    }
    // Ends the process, as a crash would, when it is about to remove its first key. No lock of
    // another thread is held here.
    void RunUntilFirstRemoval() {
        const pid_t pid = fork();
        ASSERT_GE(pid, 0);
        if (pid == 0) {
            m_fake.OnCall("KLIBCFileRemoveKey", [] { _exit(7); });
            (void)!Run();
            _exit(1);
        }
        int status = 0;
        ASSERT_EQ(pid, waitpid(pid, &status, 0));
        ASSERT_TRUE(WIFEXITED(status));
        ASSERT_EQ(7, WEXITSTATUS(status));
    }
    // The two shares that the tasks lead to.
    [[nodiscard]] std::string Shares() const {
        return Read("SELECT hub_share_name FROM task_info_table ORDER BY id;");
    }
};

TEST_F(OldKeyTest, AStartThatWasKilledBeforeTheRemovalIsMadeUpFor) {
    RunUntilFirstRemoval();
    EXPECT_EQ("photos|cards", Shares());
    EXPECT_EQ(BOTH_KEYS, Settings());
    const std::string before = DumpDatabase(m_task_db);
    for (int start = 0; start < 2; ++start) {
        EXPECT_EQ(0, Run());
        EXPECT_EQ("keep=\"1\"\n", Settings());
        EXPECT_EQ(before, DumpDatabase(m_task_db));
    }
    EXPECT_EQ(2, m_fake.CallCount("KLIBCFileRemoveKey")) << "nothing is left for the second start";
}

TEST_F(OldKeyTest, OneThatCannotBeRemovedDoesNotKeepTheOther) {
    m_fake.FailCall("KLIBCFileRemoveKey");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove key'ferrixfolder'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare Ferrix default task"));
    EXPECT_FALSE(m_log.Has("[ERR] Failed to prepare SDFerrix default task"));
    EXPECT_EQ("photos|cards", Shares());
    EXPECT_EQ("ferrixfolder=\"photos/in\"\nkeep=\"1\"\n", Settings());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("keep=\"1\"\n", Settings());
    EXPECT_EQ("photos|cards", Shares());
}

// It does no harm, and the service has to start.
TEST_F(OldKeyTest, OneThatStillCannotBeRemovedIsToldAtEachStart) {
    RunUntilFirstRemoval();
    m_fake.FailCall("KLIBCFileRemoveKey", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove key'ferrixfolder'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove key'sdferrixfolder'"));
    EXPECT_EQ(BOTH_KEYS, Settings());
}

TEST_F(OldKeyTest, SettingsThatCannotBeReadAreForTheNextStart) {
    RunUntilFirstRemoval();
    m_fake.FailCall("KLIBCFileGetKeyValue");
    EXPECT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get old copy folder for key 'ferrixfolder'"));
    EXPECT_EQ("ferrixfolder=\"photos/in\"\nkeep=\"1\"\n", Settings());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("keep=\"1\"\n", Settings());
}

TEST_F(OldKeyTest, OneWhoseTaskIsNotThereStays) {
    SetCapabilities("ferrix=\"yes\"\n");
    RunUntilFirstRemoval();
    for (int start = 0; start < 2; ++start) {
        EXPECT_EQ(0, Run());
        EXPECT_EQ("sdferrixfolder=\"cards\"\nkeep=\"1\"\n", Settings());
    }
}

// It was not taken over.
TEST_F(OldKeyTest, OneThatNamesNoFolderStays) {
    SetSettings("ferrixfolder=\"//\"\nsdferrixfolder=\"\"\n");
    for (int start = 0; start < 2; ++start) {
        EXPECT_EQ(0, Run());
        EXPECT_EQ("ferrixfolder=\"//\"\nsdferrixfolder=\"\"\n", Settings());
    }
}

TEST_F(OldKeyTest, BothStayWhenTheDatabaseCannotBePutInItsPlace) {
    {
        const FailRename refuse("/task-db.sqlite", EIO);
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to put '" + m_task_db + "' in its place"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare default task at '" + m_repository + "'"));
    EXPECT_FALSE(fs::exists(m_task_db));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_EQ(BOTH_KEYS, Settings());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("photos|cards", Shares());
    EXPECT_EQ("keep=\"1\"\n", Settings());
}

TEST_F(OldKeyTest, BothStayAsLongAsAPowerCutCouldTakeTheDatabaseAway) {
    {
        const FailFlushAfterRename power_cut("/task-db.sqlite");
        EXPECT_EQ(-1, Run());
    }
    EXPECT_TRUE(m_log.Has("[ERR] Failed to put '" + m_task_db + "' in its place"));
    EXPECT_EQ("photos|cards", Shares());
    EXPECT_EQ(BOTH_KEYS, Settings());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("keep=\"1\"\n", Settings());
}

TEST_F(OldKeyTest, AFutureRepositoryIsNotLookedInto) {
    RunUntilFirstRemoval();
    RawDatabase(m_task_db).Run("UPDATE config_table SET value = 3 WHERE key = 'version';");
    EXPECT_EQ(0, Run());
    EXPECT_EQ(BOTH_KEYS, Settings());
}

}  // namespace
