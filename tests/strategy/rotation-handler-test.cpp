// Rotation over real folders: what counts as a version, what is left alone, what is told.
#include "strategy/rotation-handler.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <random>

#include "db/log-db.h"
#include "db/task-info.h"
#include "filter/file-filter.h"
#include "listing-faults.h"
#include "naive-rotation.h"
#include "platform/utility.h"
#include "rotation-fixture.h"
#include "strategy/version-end.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

std::string NameAt(time_t seconds) {
    tm local{};
    std::string name;
    EXPECT_NE(nullptr, localtime_r(&seconds, &local));
    EXPECT_EQ(0, GetTimeString(local, "Ferrix Copy_%F_%H%M%S", name));
    return name;
}

class RotationHandlerTest : public RotationFixture {};

TEST_F(RotationHandlerTest, TheOldestVersionsGoAndEachIsLogged) {
    MakeMay({"01", "02", "03", "04"});
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")));
    EXPECT_THAT(RotatedRows(), ElementsAre("[\"holiday\",\"" + May("01") + "\"]",
                                           "[\"holiday\",\"" + May("02") + "\"]"));
    for (const std::string& line :
         {"[INFO] RotationHandler: set version list path '" + Dst() + "', [task: 7]",
          "[INFO] list info '" + Dst("/" + May("01")) + "'",
          std::string("[INFO] RotationHandler: count = '4', max_version_count = '2'"),
          "[INFO] RotationHandler: remove path '" + Dst("/" + May("01")) + "'"}) {
        EXPECT_TRUE(m_log.Has(line)) << line;
    }
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationHandlerTest, NoMoreThanTheCountNeedNoRotation) {
    MakeMay({"01", "02"});
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(2));
    EXPECT_TRUE(m_log.Has("[INFO] Don't need to do rotation"));
}

TEST_F(RotationHandlerTest, TheConditionalPolicyKeepsASpread) {
    m_task.rotation_policy = ROTATION_POLICY_CONDITIONAL;
    m_task.max_version_count = 4;
    for (const uint32_t age : {0U, 60U, 120U, 7200U, 86400U * 3}) MakeVersion(NameAt(NOW - age));
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(NameAt(NOW - 86400 * 3), NameAt(NOW - 7200),
                                        NameAt(NOW - 120), NameAt(NOW)));
    m_task.max_version_count = 3;
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(NameAt(NOW - 7200), NameAt(NOW - 120), NameAt(NOW)))
        << "of those that are worth keeping the newest";
}

TEST_F(RotationHandlerTest, BadVersionsGoFirst) {
    MakeMay({"01", "02", "03.Bad", "04", "05.Bad"});
    m_task.max_version_count = 3;
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("04"), May("05.Bad")));
}

TEST_F(RotationHandlerTest, WhatIsNoVersionIsNeitherCountedNorRemoved) {
    MakeMay({"01", "02"});
    const std::string others[] = {"Ferrix Copy_2024-03-09_141502.old", "mine",
                                  "Ferrix Copy_2024-13-09_141502", "ferrix copy_2024-03-09_141502"};
    for (const std::string& name : others) MakeVersion(name);
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(6));
    EXPECT_TRUE(
        m_log.Has("[DBG] Current version folder '/Ferrix Copy_2024-03-09_141502.old' is "
                  "not Ferrix Copy format, skipped"));
    m_task.max_version_count = 1;
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(5));
    EXPECT_FALSE(IsThere(Dst("/" + May("01"))));
}

TEST_F(RotationHandlerTest, ANameThatTellsATimeIsAVersionHoweverItIsWritten) {
    MakeMay({"01", "02"});
    MakeVersion("Ferrix Copy_2024-3-9_141502");
    MakeVersion("Ferrix Copy_2024-02-31_141502");  // the 2nd of March
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("01"), May("02")));
    EXPECT_THAT(RotatedRows(), ElementsAre("[\"holiday\",\"Ferrix Copy_2024-02-31_141502\"]",
                                           "[\"holiday\",\"Ferrix Copy_2024-3-9_141502\"]"));
}

TEST_F(RotationHandlerTest, AFileWithTheNameOfAVersionIsTreatedAlike) {
    MakeMay({"02", "03"});
    WriteDst("/" + May("01"), "a file");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03")));
}

TEST_F(RotationHandlerTest, WhatTheSystemFilterHidesIsNoVersion) {
    MakeMay({"01", "02", "03"});
    const std::string file = m_dir / "system.filter";
    ASSERT_EQ(0, FileFilter::WriteBlackList(file, {May("01")}, {}));
    ASSERT_EQ(0, m_task.system_filter->LoadBlackList(file));
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(3));
}

TEST_F(RotationHandlerTest, AMissingDestinationHasNoVersions) {
    ASSERT_EQ(0, rmdir(Dst().c_str()));
    m_task.max_version_count = 0;
    EXPECT_EQ(0, Rotate());
    EXPECT_TRUE(m_log.Has("[INFO] Don't need to do rotation"));
}

TEST_F(RotationHandlerTest, AnUnknownPolicyIsASystemError) {
    MakeMay({"01", "02", "03"});
    m_task.rotation_policy = 3;
    EXPECT_EQ(ERR_SYSTEM, Rotate());
    EXPECT_THAT(Versions(), SizeIs(3));
    EXPECT_TRUE(m_log.Has("[ERR] Unknown rotation policy = 3"));
    EXPECT_TRUE(m_log.Has("[ERR] Fail to do Rotation '" + Dst() + "', policy = '3', [ret: -3]"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to do rotation for path '" + Dst() + "', [task: 7]"));
}

// --- The clock ---

TEST_F(RotationHandlerTest, WhileTheClockIsNotSetAndThereAreLaterVersionsNothingGoes) {
    MakeMay({"01", "02", "03", "04"});
    for (const char* early : {"Ferrix Copy_1970-01-01_000100", "Ferrix Copy_1970-01-01_000200",
                              "Ferrix Copy_1970-01-01_000300"}) {
        MakeVersion(early);
    }
    m_task.max_version_count = 1;
    for (const int policy : {int{ROTATION_POLICY_OLDEST}, int{ROTATION_POLICY_CONDITIONAL}}) {
        m_task.rotation_policy = policy;
        for (const uint32_t now : {400U, 90000U, 1599999999U}) {
            m_log.Clear();
            EXPECT_EQ(0, Rotate(now));
            EXPECT_THAT(Versions(), SizeIs(7)) << policy << " at " << now;
            EXPECT_TRUE(m_log.Has("[WARN] The clock is not set, nothing of task '7' is removed"));
        }
    }
    EXPECT_TRUE(m_log.Has("[WARN] Invalid timestamp for task '7', path = '/" + May("04") +
                          "', timestamp = '1714816800', now = '1599999999'"));
}

TEST_F(RotationHandlerTest, AVersionOfTheFutureIsNotCounted) {
    MakeMay({"01", "02"});
    MakeVersion("Ferrix Copy_2030-01-01_000000");
    EXPECT_EQ(0, Rotate());
    EXPECT_TRUE(m_log.Has("[INFO] Don't need to do rotation")) << "two of two";
}

TEST_F(RotationHandlerTest, AVersionOfTheFutureIsLeftAloneWhileOthersGo) {
    MakeMay({"01", "02", "03"});
    MakeVersion("Ferrix Copy_2030-01-01_000000");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03"), "Ferrix Copy_2030-01-01_000000"));
}

TEST_F(RotationHandlerTest, AnUnsetClockRotatesWhatThereIsWhenNothingIsLater) {
    for (const char* name : {"Ferrix Copy_1970-01-01_000100", "Ferrix Copy_1970-01-01_000200",
                             "Ferrix Copy_1970-01-01_000300"}) {
        MakeVersion(name);
    }
    EXPECT_EQ(0, Rotate(90000));
    EXPECT_THAT(Versions(), SizeIs(2));
}

TEST_F(RotationHandlerTest, ABadVersionOfTheFutureIsLeftAloneAndSaysNothingAboutTheClock) {
    MakeMay({"01", "02", "03"});
    MakeVersion("Ferrix Copy_2030-01-01_000000.Bad");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03"), "Ferrix Copy_2030-01-01_000000.Bad"));
}

TEST_F(RotationHandlerTest, TimesOutsideThirtyTwoBitsAreNotWrapped) {
    MakeMay({"01", "02"});
    MakeVersion("Ferrix Copy_2200-01-01_000000.Bad");  // wrapped it would be of 2063
    MakeVersion("Ferrix Copy_1969-06-01_000000");
    MakeVersion("Ferrix Copy_1850-06-01_000000");
    m_task.max_version_count = 1;
    EXPECT_EQ(0, Rotate(4200000000U));
    EXPECT_THAT(Versions(),
                ElementsAre("Ferrix Copy_1850-06-01_000000", "Ferrix Copy_1969-06-01_000000",
                            May("02"), "Ferrix Copy_2200-01-01_000000.Bad"));
}

TEST_F(RotationHandlerTest, AVersionOfTheVeryFirstSecondIsAnError) {
    MakeMay({"01", "02", "03"});
    MakeVersion("Ferrix Copy_1970-01-01_000000");
    EXPECT_EQ(ERR_SYSTEM, Rotate());
    EXPECT_THAT(Versions(), SizeIs(4));
    EXPECT_TRUE(m_log.Has("[ERR] failed to parse time string '/Ferrix Copy_1970-01-01_000000'"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to parse timestamp for task '7', path = "
                  "'/Ferrix Copy_1970-01-01_000000'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetVersionList"));
}

TEST_F(RotationHandlerTest, OfTwoVersionsOfOneTimeTheBadOneIsTheOlder) {
    MakeMay({"01", "01.Bad"});
    m_task.max_version_count = 1;
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("01")));
}

TEST_F(RotationHandlerTest, ByDefaultThePresentIsTaken) {
    MakeVersion(NameAt(time(nullptr)));
    MakeVersion(NameAt(time(nullptr) - 86400));
    m_task.max_version_count = 1;
    RotationHandler rotation;
    rotation.Init(m_task);
    EXPECT_EQ(0, rotation.Run());
    EXPECT_THAT(Versions(), SizeIs(1));
}

// --- Removal ---

TEST_F(RotationHandlerTest, VersionsGoToTheRecycleBinOfTheShare) {
    EnableBin();
    MakeMay({"01", "02", "03"});
    EXPECT_EQ(0, Rotate());
    EXPECT_TRUE(IsThere(m_share + "/#recycle/copy/" + May("01") + "/file"));
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03")));
}

TEST_F(RotationHandlerTest, AFailedRemovalEndsTheRotation) {
    EnableBin();
    MakeMay({"01", "02", "03", "04"});
    m_fake.FailCall("KELDRecycleRmDirWithSharePath", KELDERR_IO, 1, 1);
    EXPECT_EQ(ERR_FILE_OPERATION, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03"), May("04")));
    const std::string path = Dst("/" + May("02"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + path + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] faile to DeleteVersionList '" + path + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to DeleteVersionList '" + Dst() + "', [ret: -10]"));
    EXPECT_THAT(RotatedRows(), SizeIs(1));
}

TEST_F(RotationHandlerTest, AVersionThatWentOnlyInPartIsNoGoodOne) {
    MakeMay({"01", "02", "03"});
    // Somebody fills the folder as fast as it is emptied.
    m_fake.OnCall("KELDEARemove", [this] { WriteDst("/" + May("01") + "/more", "x"); });
    EXPECT_EQ(ERR_FILE_OPERATION, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("01.Bad"), May("02"), May("03")));
    EXPECT_TRUE(m_log.Has("[INFO] Rename version for task '7', folder name '" +
                          Dst("/" + May("01.Bad")) + "'"));
    EXPECT_FALSE(IsThere(MarksPath()));
    EXPECT_THAT(RotatedRows(), IsEmpty());
}

TEST_F(RotationHandlerTest, AVersionOutsideEveryShareStaysAsItIs) {
    MakeMay({"01", "02", "03"});
    m_fake.FailCall("KELDShareNamePathGet", KELDERR_SYSTEM, FakeKeld::ALWAYS);
    EXPECT_EQ(ERR_FILE_OPERATION, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("01"), May("02"), May("03")));
}

TEST_F(RotationHandlerTest, ALogRowThatFailsIsASystemError) {
    MakeMay({"01", "02", "03", "04"});
    LogDB::GetInstance().Close();
    EXPECT_EQ(ERR_SYSTEM, Rotate());
    EXPECT_THAT(Versions(), SizeIs(3));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to add log info to log db for '7'"));
}

TEST_F(RotationHandlerTest, ADestinationThatIsGoneIsNotTakenForRemoved) {
    MakeExport();
    m_task.dst_dir_path = m_usb + "/data";
    MakeMay({"01", "02", "03", "04"});
    m_fake.OnCall("KELDShareNamePathGet", [this] { m_fake.Pull(m_usb); });
    EXPECT_EQ(ERR_DST_ROOT_MISS, Rotate());
    EXPECT_THAT(RotatedRows(), IsEmpty());
}

TEST_F(RotationHandlerTest, ADeviceThatIsGoneDoesNotMatterToAnImport) {
    MakeMay({"01", "02", "03"});
    m_fake.Pull(m_usb);
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), SizeIs(2));
}

TEST_F(RotationHandlerTest, AnAbortEndsItBeforeTheListAndBetweenVersions) {
    MakeMay({"01", "02", "03", "04"});
    m_abort = 1;
    EXPECT_EQ(ERR_INTERRUPTED, Rotate());
    EXPECT_TRUE(m_log.Has("[ERR] interrupted while get dst file list '" + Dst() + "'"));
    EXPECT_THAT(Versions(), SizeIs(4));
    m_abort = 0;
    m_fake.OnCall("KELDEARemove", [this] { m_abort = 1; });
    EXPECT_EQ(ERR_INTERRUPTED, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03"), May("04")))
        << "the version in hand is removed to its end";
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationHandlerTest, AnAbortEndsItBehindTheListing) {
    MakeMay({"01", "02", "03", "04"});
    // The marks, for which the repository is asked, are read behind the listing.
    m_fake.OnCall("KLIBCFileGetKeyValue", [this] { m_abort = 1; });
    EXPECT_EQ(ERR_INTERRUPTED, Rotate());
    EXPECT_TRUE(m_log.Has("[WARN] SetVersionList: user stopped"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetVersionList"));
    EXPECT_THAT(Versions(), SizeIs(4));
}

TEST_F(RotationHandlerTest, AFolderThatCannotBeListedToItsEndIsAnIoError) {
    MakeMay({"01", "02", "03", "04"});
    {
        const BreakListing broken(4);
        EXPECT_EQ(ERR_IO, Rotate()) << "and no interrupted run, which would be done again for ever";
    }
    EXPECT_TRUE(m_log.Has("[ERR] interrupted while get dst file list '" + Dst() + "'"));
    EXPECT_THAT(Versions(), SizeIs(4));
}

TEST_F(RotationHandlerTest, WithMarksThatCannotBeReadNothingGoes) {
    MakeMay({"01", "02", "03", "04"});
    fs::create_directory(MarksPath());
    EXPECT_EQ(ERR_SYSTEM, Rotate()) << "one of them may be the version that a run is filling";
    EXPECT_THAT(Versions(), SizeIs(4));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetVersionList"));
}

TEST_F(RotationHandlerTest, AVersionThatIsBeingFilledIsNoneYet) {
    MakeMay({"01", "02", "03"});
    m_task.version_dir = May("04");
    MakeMay({"04"});
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, {MakeVersionMark(m_task, VersionMark::FILLING)}));
    m_task.max_version_count = 1;
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("03"), May("04")))
        << "the last good one stays until the run has ended well";
}

TEST_F(RotationHandlerTest, ARemovalThatWasKilledLeavesNoHalfVersionThatLooksGood) {
    MakeMay({"01", "02", "03", "04.Bad", "05"});
    m_task.max_version_count = 1;
    // What the files and marks look like in the middle of the removal of the second good version.
    std::vector<VersionMark> marks;
    m_fake.OnCall("KELDEARemove", [&] {
        if (!IsThere(Dst("/" + May("01"))) && marks.empty()) marks = Marks();
    });
    EXPECT_EQ(0, Rotate());
    ASSERT_THAT(marks, SizeIs(3));
    MakeMay({"02", "03"});
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, marks));
    SettleVersionsAtLoad(m_task);
    EXPECT_THAT(Versions(), ElementsAre(May("02.Bad"), May("03"), May("05")))
        << "the third had not been touched";
    EXPECT_FALSE(IsThere(MarksPath()));
}

TEST_F(RotationHandlerTest, ARunLeavesTheMarksOfARemovalAlone) {
    MakeMay({"01"});
    m_task.version_dir = May("01");
    ASSERT_EQ(0, PutVersionMarks(TASK_ID, {MakeVersionMark(m_task, VersionMark::REMOVING)}));
    SettleUnfinishedVersions(m_task);
    EXPECT_THAT(Marks(), SizeIs(1)) << "another thread may be at it";
    EXPECT_TRUE(IsThere(Dst("/" + May("01"))));
}

TEST_F(RotationHandlerTest, WithARecycleBinNothingNeedsToBeMarked) {
    EnableBin();
    MakeMay({"01", "02", "03"});
    bool is_marked = false;
    m_fake.OnCall("KELDRecycleRmDirWithSharePath", [&] { is_marked |= IsThere(MarksPath()); });
    EXPECT_EQ(0, Rotate());
    EXPECT_FALSE(is_marked);
}

TEST_F(RotationHandlerTest, AVersionOfAnyDepthGoes) {
    MakeMay({"02", "03"});
    std::string path = Dst("/" + May("01"));
    ASSERT_EQ(0, mkdir(path.c_str(), 0755));
    fs::current_path(path);
    for (int n = 0; n < 2000; ++n) {
        ASSERT_EQ(0, mkdir("folder-of-a-deep-tree", 0755));
        ASSERT_EQ(0, chdir("folder-of-a-deep-tree"));
    }
    fs::current_path("/");
    EXPECT_EQ(0, Rotate());
    EXPECT_THAT(Versions(), ElementsAre(May("02"), May("03")));
}

// --- The rules twice, on real folders and across both changes of summer time ---

TEST_F(RotationHandlerTest, RandomHistoriesOnDiskAgreeWithTheNaiveRules) {
    const TimeZone zone("Europe/Berlin");
    std::mt19937 random(7);
    constexpr uint32_t SPRING = 1711846800;
    constexpr uint32_t AUTUMN = 1729990800;
    for (int n = 0; n < 120; ++n) {
        fs::remove_all(Dst());
        fs::create_directory(Dst());
        const uint32_t now = (n % 2 == 0 ? SPRING : AUTUMN) + random() % (3 * 86400);
        const uint32_t spans[] = {7200, 3 * 86400, 50 * 86400};
        std::vector<VersionInfo> versions;
        for (unsigned left = random() % 12; left > 0; --left) {
            VersionInfo version;
            version.timestamp = now - static_cast<uint32_t>(random() % spans[random() % 3]);
            version.is_bad = random() % 4 == 0;
            // The hour that comes twice has one name for two times: that is another test's matter.
            if (version.timestamp >= AUTUMN - 3600 && version.timestamp < AUTUMN) continue;
            const std::string name = NameAt(version.timestamp) + (version.is_bad ? ".Bad" : "");
            version.path = Dst("/" + name);
            if (IsThere(version.path)) continue;
            fs::create_directory(version.path);
            versions.push_back(version);
        }
        std::sort(versions.begin(), versions.end(), [](const auto& left, const auto& right) {
            return left.timestamp != right.timestamp ? left.timestamp > right.timestamp
                                                     : left.is_bad < right.is_bad;
        });
        m_task.max_version_count = random() % 6;
        m_task.rotation_policy = 1 + static_cast<int>(random() % 2);
        std::vector<std::string> expected;
        for (const std::string& path :
             NaiveRotation(versions, now, m_task.max_version_count, m_task.rotation_policy)) {
            expected.push_back("[INFO] RotationHandler: remove path '" + path + "'");
        }
        m_log.Clear();
        ASSERT_EQ(0, Rotate(now));
        std::vector<std::string> removed;
        for (const std::string& line : m_log.Lines()) {
            if (line.starts_with("[INFO] RotationHandler: remove path")) removed.push_back(line);
        }
        ASSERT_EQ(expected, removed) << "history " << n;
        ASSERT_EQ(versions.size() - removed.size(), Versions().size());
    }
}

}  // namespace
