// The updater is killed at each of its system calls in turn, as far as they touch the disk.
#include "support/kill-at-call.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

constexpr char SETTINGS[] = "ferrixfolder=\"photos/in\"\nkeep=\"1\"\n";

class UpdaterKillTest : public UpdaterTest {
protected:
    // A fresh repository: a copy of the prepared one.
    void Restore() {
        fs::remove_all(m_dir / "v1");
        fs::copy(m_dir / "master", m_dir / "v1", fs::copy_options::recursive);
        FakeKeld::Reset();
        SetSettings(SETTINGS);
    }
    void Keep() {
        fs::remove_all(m_dir / "master");
        fs::copy(m_dir / "v1", m_dir / "master", fs::copy_options::recursive);
    }
    std::map<std::string, std::string> Dumps() const {
        std::map<std::string, std::string> dumps;
        for (const std::string& path : DatabasesOf(m_repository)) {
            dumps[path] = DumpDatabase(InRepository(path));
        }
        return dumps;
    }
    KillResult KillAt(int nth) {
        return KillAtCall(nth, [this] { return Run(); });
    }
};

// A log that a killed daemon has left makes the way longer and more dangerous.
TEST_F(UpdaterKillTest, AnOldRepositoryIsOldOrNewWhereverItStops) {
    MakeOldRepository(m_repository);
    RawDatabase open(m_task_db);
    open.Run("UPDATE task_info_table SET task_name = 'From the log' WHERE id = 1;");
    Keep();
    Restore();
    const auto old_dumps = Dumps();
    ASSERT_EQ(0, Run());
    const auto new_dumps = Dumps();
    const auto files = FilesIn(m_repository);
    Restore();
    if (KillAt(1) == KillResult::CANNOT_TRACE) GTEST_SKIP() << "processes cannot be traced here";
    int killed = 0;
    for (;; ++killed) {
        Restore();
        const KillResult result = KillAt(killed + 1);
        if (result == KillResult::DONE) break;
        ASSERT_EQ(KillResult::KILLED, result);
        for (const auto& [path, dump] : Dumps()) {
            ASSERT_TRUE(dump == old_dumps.at(path) || dump == new_dumps.at(path))
                << path << " after call " << killed << ":\n"
                << dump;
        }
        ASSERT_EQ(old_dumps.size(), DatabasesOf(m_repository).size());
        FakeKeld::Reset();
        m_log.Clear();
        ASSERT_EQ(0, Run()) << "after call " << killed << ": "
                            << testing::PrintToString(m_log.Lines());
        ASSERT_EQ(new_dumps, Dumps()) << "after call " << killed;
        ASSERT_EQ(files, FilesIn(m_repository)) << "after call " << killed;
        ASSERT_EQ(SETTINGS, Settings()) << "after call " << killed;
    }
    EXPECT_GT(killed, 100);
    EXPECT_EQ(new_dumps, Dumps());
}

TEST_F(UpdaterKillTest, ANewRepositoryHasItsDefaultTasksOrNoDatabaseWhereverItStops) {
    SetCapabilities("ferrix=\"yes\"\nsdferrix=\"yes\"\n");
    Keep();
    Restore();
    ASSERT_EQ(0, Run());
    const auto wanted = Dumps();
    const auto files = FilesIn(m_repository);
    Restore();
    if (KillAt(1) == KillResult::CANNOT_TRACE) GTEST_SKIP() << "processes cannot be traced here";
    int killed = 0;
    for (;; ++killed) {
        Restore();
        const KillResult result = KillAt(killed + 1);
        if (result == KillResult::DONE) break;
        ASSERT_EQ(KillResult::KILLED, result);
        if (fs::exists(m_task_db)) {
            ASSERT_EQ(wanted, Dumps()) << "after call " << killed;
        } else {
            ASSERT_EQ(SETTINGS, Settings());
        }
        ASSERT_EQ(0, Run()) << "after call " << killed;
        ASSERT_EQ(wanted, Dumps()) << "after call " << killed;
        ASSERT_EQ(files, FilesIn(m_repository)) << "after call " << killed;
        ASSERT_EQ("keep=\"1\"\n", Settings()) << "after call " << killed;
    }
    EXPECT_GT(killed, 50);
    EXPECT_EQ("keep=\"1\"\n", Settings());
}

}  // namespace
