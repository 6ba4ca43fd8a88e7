// What a rotation leaves when a removal fails, when the destination goes, and when another rotation
// is under way.
#include <gmock/gmock.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <filesystem>
#include <thread>

#include "flush-faults.h"
#include "rotation-fixture.h"
#include "strategy/rotation-handler.h"
#include "strategy/version-end.h"
#include "strategy/version-name.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using testing::SizeIs;

class RotationRemovalTest : public RotationFixture {
protected:
    static std::vector<std::string> MarkedNames() {
        std::vector<std::string> names;
        for (const VersionMark& mark : Marks()) names.push_back(mark.name);
        return names;
    }
    std::string Version(const std::string& day) const { return Dst("/" + May(day)); }
    static std::string Row(const std::string& day) { return "[\"holiday\",\"" + May(day) + "\"]"; }

    // Takes the device away, folders and all.
    void TakeDevice() {
        m_fake.Pull(m_usb);
        fs::rename(m_usb, m_usb + "-away");
    }
    void BringDevice() {
        m_fake.OnCall("KELDEARemove", nullptr);
        fs::rename(m_usb + "-away", m_usb);
        m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
    }
    // The names that the versions of the hour from this time on get when they are bad.
    std::vector<std::string> TakeBadNames(time_t start) const {
        std::vector<std::string> paths;
        for (int second = 0; second <= 3600; ++second) {
            std::string name;
            EXPECT_EQ(0, NameVersion(start + second, name));
            paths.push_back(Dst("/" + name + ".Bad"));
            fs::create_directories(paths.back() + "/in the way");
        }
        return paths;
    }
};

constexpr time_t FIRST_OF_MAY = 1714557600;  // 2024-05-01 10:00:00 UTC

// --- A destination that goes ---

TEST_F(RotationRemovalTest, AVersionWhoseDeviceGoesDuringItsRemovalIsNoGoodOneLater) {
    MakeExport();
    MakeMay({"01", "02", "03", "04"});
    m_fake.OnCall("KELDEARemove", [this] {
        if (IsThere(Version("02") + "/file")) return;
        if (IsThere(m_usb)) TakeDevice();
        // So that a part of it stays.
        m_dir.Write("usb-away/data/" + May("02") + "/more", "x");
    });
    EXPECT_EQ(ERR_FILE_OPERATION, Rotate());
    EXPECT_THAT(MarkedNames(), ElementsAre(May("01"), May("02")));
    EXPECT_TRUE(
        m_log.Has("[WARN] Removed versions of task '7' are looked at again when it is loaded"));
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(MarkedNames(), SizeIs(2)) << "the device is still away";
    BringDevice();
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(May("02.Bad"), May("03"), May("04")));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationRemovalTest, AVersionWhoseRemovalHasNotBegunKeepsItsNameWhenTheDeviceGoes) {
    MakeExport();
    MakeMay({"01", "02", "03", "04"});
    m_fake.OnCall("KELDEARemove", [this] {
        if (!IsThere(Version("01"))) TakeDevice();
    });
    EXPECT_EQ(ERR_DST_ROOT_MISS, Rotate());
    EXPECT_THAT(MarkedNames(), ElementsAre(May("01"))) << "its removal may not be on the disk";
    BringDevice();
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03"), May("04")));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationRemovalTest, AShareThatGoesTogetherWithTheDeviceIsNotTakenForEmpty) {
    MakeMay({"01", "02", "03"});
    m_fake.Pull(m_usb);
    m_fake.LockShare("photos");
    EXPECT_EQ(ERR_SHARE_NOT_MOUNTED, Rotate());
    EXPECT_THAT(Versions(), SizeIs(3));
    EXPECT_THAT(RotatedRows(), IsEmpty());
}

TEST_F(RotationRemovalTest, TheSourcesShareDoesNotMatterToAnExport) {
    MakeExport();
    MakeMay({"01", "02", "03"});
    m_fake.LockShare("photos");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(2));
}

// --- A version that cannot be removed ---

TEST_F(RotationRemovalTest, AHalfVersionThatCannotBeRenamedStaysOnRecord) {
    MakeMay({"01", "02", "03", "04"});
    std::vector<std::string> taken;
    m_fake.OnCall("KELDEARemove", [&] {
        if (taken.empty()) taken = TakeBadNames(FIRST_OF_MAY);
        WriteDst("/" + May("01") + "/more", "x");
    });
    EXPECT_EQ(ERR_FILE_OPERATION, Rotate());
    EXPECT_TRUE(m_log.Contains("Failed to rename bad version format for task '7'"));
    EXPECT_TRUE(IsThere(Version("01")));
    EXPECT_THAT(MarkedNames(), ElementsAre(May("01"))) << "the second was not touched";
    m_fake.OnCall("KELDEARemove", nullptr);
    for (const std::string& path : taken) fs::remove_all(path);
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(May("01.Bad"), May("02"), May("03"), May("04")));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationRemovalTest, AVersionThatIsGoneAlreadyIsDoneWithoutARow) {
    for (const bool has_bin : {false, true}) {
        if (has_bin) EnableBin();
        m_log.Clear();
        const size_t rows = RotatedRows().size();
        MakeMay({"01", "02", "03", "04"});
        // Somebody else removes the second while the first is being removed.
        for (const char* call : {"KELDEARemove", "KELDRecycleRmDirWithSharePath"}) {
            m_fake.OnCall(call, [this] { fs::remove_all(Version("02")); });
        }
        EXPECT_EQ(0, Rotate());
        EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")));
        ASSERT_THAT(RotatedRows(), SizeIs(rows + 1));
        EXPECT_EQ(Row("01"), RotatedRows().back());
        EXPECT_TRUE(m_log.Has("[INFO] Version '" + Version("02") + "' is gone already"));
        EXPECT_FALSE(IsThere(MarksPath()));
    }
}

TEST_F(RotationRemovalTest, AFileWithTheNameOfAVersionGoesToTheBin) {
    EnableBin();
    MakeMay({"02", "03", "04"});
    WriteDst("/" + May("01"), "a file");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")));
    EXPECT_THAT(m_fake.Recycled(), ElementsAre(Pair(m_share, "copy/" + May("01")),
                                               Pair(m_share, "copy/" + May("02"))));
    EXPECT_THAT(RotatedRows(), ElementsAre(Row("01"), Row("02")));
}

// --- Removed means on the disk ---

TEST_F(RotationRemovalTest, TheMarksGoWhenTheRemovalIsOnTheDisk) {
    MakeMay({"01", "02", "03", "04"});
    int flushes = 0;
    const OnFlush faults([&](const std::string& what) {
        if (!what.starts_with("fs:")) return 0;
        ++flushes;
        EXPECT_THAT(MarkedNames(), ElementsAre(May("01"), May("02")));
        EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")));
        return 0;
    });
    EXPECT_EQ(0, Rotate());
    EXPECT_EQ(1, flushes);
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationRemovalTest, TheMarksStayWhenTheFlushFails) {
    MakeMay({"01", "02", "03", "04"});
    {
        const OnFlush faults(
            [](const std::string& what) { return what.starts_with("fs:") ? EIO : 0; });
        EXPECT_EQ(0, Rotate());
    }
    EXPECT_THAT(MarkedNames(), ElementsAre(May("01"), May("02")));
    EXPECT_TRUE(
        m_log.Has("[WARN] Removed versions of task '7' are looked at again when it is loaded"));
    MakeMay({"02"});  // a part of it is back after a power cut
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(May("02.Bad"), May("03"), May("04")));
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationRemovalTest, NothingIsFlushedWhenNoGoodVersionIsRemovedInPieces) {
    int flushes = 0;
    const OnFlush faults([&](const std::string& what) {
        if (what.starts_with("fs:")) ++flushes;
        return 0;
    });
    MakeMay({"01.Bad", "02", "03"});
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(2));
    EXPECT_EQ(0, Rotate());
    EnableBin();
    MakeMay({"04"});
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(2));
    EXPECT_EQ(0, flushes);
}

// --- Two rotations at once ---

class RotationTurnTest : public RotationRemovalTest {
protected:
    RotationTurnTest() {
        MakeMay({"01", "02", "03", "04"});
        m_fake.OnCall("KELDEARemove", [this] {
            m_is_removing = true;
            while (m_is_held) usleep(1000);
        });
        m_first = std::thread([this] { EXPECT_EQ(0, Rotate()); });
        while (!m_is_removing) usleep(1000);
    }
    ~RotationTurnTest() override { Release(); }

    void Release() {
        m_is_held = false;
        if (m_first.joinable()) m_first.join();
    }
    int RotateToo() {
        RotationHandler rotation(NOW);
        rotation.Init(m_task);
        rotation.SetAbortFlag(&m_second_abort);
        return rotation.Run();
    }
    int Lists() {
        return m_log.Count("[INFO] RotationHandler: set version list path '" + Dst() +
                           "', [task: 7]");
    }

    std::atomic<bool> m_is_removing{false};
    std::atomic<bool> m_is_held{true};
    std::atomic<int> m_second_abort{0};
    std::thread m_first;
};

TEST_F(RotationTurnTest, ASecondRotationWaitsForTheFirst) {
    std::thread second([this] { EXPECT_EQ(0, RotateToo()); });
    usleep(100000);
    EXPECT_EQ(1, Lists());
    Release();
    second.join();
    EXPECT_EQ(2, Lists());
    EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")));
    EXPECT_THAT(RotatedRows(), ElementsAre(Row("01"), Row("02"))) << "each once";
}

TEST_F(RotationTurnTest, AnAbortEndsTheWait) {
    std::atomic<bool> is_ended{false};
    std::thread second([&] {
        EXPECT_EQ(ERR_INTERRUPTED, RotateToo());
        is_ended = true;
    });
    usleep(50000);
    m_second_abort = 1;
    for (int step = 0; step < 5000 && !is_ended; ++step) usleep(1000);
    EXPECT_TRUE(is_ended) << "with the first still at work";
    EXPECT_TRUE(
        m_log.Has("[WARN] RotationHandler: user stopped while waiting for another rotation"));
    EXPECT_EQ(1, Lists());
    Release();
    second.join();
}

}  // namespace
