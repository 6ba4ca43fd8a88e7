#include "service/repository.h"

#include <sys/stat.h>

#include <chrono>

#include "service/service-fixture.h"

namespace fs = std::filesystem;

namespace {

class RepositoryTest : public ServiceTest {};

TEST_F(RepositoryTest, ItsFoldersAreMadeAndBelongToTheirOwnerAlone) {
    const mode_t saved = umask(0);
    EXPECT_EQ(0, MakeRepo(m_v1));
    umask(saved);
    for (const char* folder : {"/@Ferrix", "/@Ferrix/db", "/@Ferrix/task"}) {
        EXPECT_TRUE(fs::is_directory(m_v1 + folder));
        EXPECT_EQ(fs::perms(0755), fs::status(m_v1 + folder).permissions()) << folder;
    }
    m_dir.Write("v1/@Ferrix/db/task-db.sqlite", "rows");
    EXPECT_EQ(0, MakeRepo(m_v1));
    EXPECT_EQ("rows", ReadWholeFile(m_v1 + "/@Ferrix/db/task-db.sqlite"));
}

TEST_F(RepositoryTest, AVolumeThatIsNoFolderIsRefused) {
    const std::string file = m_dir.Write("file", "");
    for (const std::string& volume : {std::string(), std::string("v1"), m_dir / "none", file}) {
        EXPECT_EQ(-1, MakeRepo(volume));
        EXPECT_TRUE(m_log.Has("[ERR] invalid volume path [" + volume + "]."));
    }
    EXPECT_FALSE(fs::exists(m_dir / "none"));
}

TEST_F(RepositoryTest, EachFolderThatCannotBeMadeIsTold) {
    for (const auto& [name, kind] : {
             std::pair{"@Ferrix",      "repo"       },
             std::pair{"@Ferrix/db",   "db folder"  },
             std::pair{"@Ferrix/task", "task folder"}
    }) {
        fs::remove_all(m_v1 + "/@Ferrix");
        const std::string path = m_dir.Write("v1/" + std::string(name), "in the way");
        EXPECT_EQ(-1, MakeRepo(m_v1));
        EXPECT_TRUE(m_log.Has("[ERR] fail to create ferrix copy " + std::string(kind) + " [" +
                              path + "]."));
    }
}

TEST_F(RepositoryTest, AVolumeIsRegisteredInTheSettingsAndForThePackageManager) {
    EXPECT_EQ(0, RegisterVolume(m_v1));
    EXPECT_EQ(m_v1, GetRepoVolPath());
    EXPECT_EQ("[\"" + m_v1 + "\"]\n", VolumeList());
    EXPECT_EQ(fs::perms(0644), fs::status(m_dir / "p/etc/keldpkg_conf/reg_volume").permissions());
    EXPECT_EQ(0, RegisterVolume(""));
    EXPECT_EQ("", GetRepoVolPath());
    EXPECT_EQ("[]\n", VolumeList());
}

TEST_F(RepositoryTest, AVolumeThatCannotBeRegisteredIsAFailure) {
    m_fake.FailCall("KLIBCFileSetKeyValue");
    EXPECT_EQ(-1, RegisterVolume(m_v1));
    EXPECT_FALSE(fs::exists(m_dir / "p/etc/keldpkg_conf"));
    m_dir.Write("p/etc/keldpkg_conf", "in the way");
    EXPECT_EQ(-1, RegisterVolume(m_v1));
    EXPECT_TRUE(m_log.Contains("Failed to write"));
}

// Cut off by the settings, it would name another folder.
TEST_F(RepositoryTest, APathThatTheSettingsCannotHoldIsNotRegistered) {
    const std::string longest = "/" + std::string(62, 'v');
    EXPECT_TRUE(CanBeRegistered(longest));
    EXPECT_EQ(0, RegisterVolume(longest));
    EXPECT_EQ(longest, GetRepoVolPath());
    EXPECT_FALSE(CanBeRegistered(longest + "v"));
    EXPECT_EQ(-1, RegisterVolume(longest + "v"));
    EXPECT_EQ(longest, GetRepoVolPath());
    EXPECT_EQ("[\"" + longest + "\"]\n", VolumeList());
    EXPECT_TRUE(m_log.Has("[ERR] The path of volume '" + longest + "v' is too long"));
}

TEST_F(RepositoryTest, TheListIsAsciiWhateverTheVolumeIsCalled) {
    EXPECT_EQ(0, RegisterVolume("/v\xc3\xb6l \\1"));
    EXPECT_EQ("[\"/v\\u00f6l \\\\1\"]\n", VolumeList());
}

TEST_F(RepositoryTest, AListThatNamesAnotherVolumeIsWrittenAnew) {
    ASSERT_EQ(0, RegisterVolume(m_v1));
    UpdateVolumeList(m_v2);
    EXPECT_EQ("[\"" + m_v2 + "\"]\n", VolumeList());
    EXPECT_EQ(m_v1, GetRepoVolPath());
    const std::string path = m_dir / "p/etc/keldpkg_conf/reg_volume";
    fs::remove(path);
    UpdateVolumeList(m_v2);
    EXPECT_EQ("[\"" + m_v2 + "\"]\n", VolumeList());
    const auto written = fs::last_write_time(path) - std::chrono::hours(1);
    fs::last_write_time(path, written);
    UpdateVolumeList(m_v2);
    EXPECT_EQ(written, fs::last_write_time(path)) << "it was right";
}

}  // namespace
