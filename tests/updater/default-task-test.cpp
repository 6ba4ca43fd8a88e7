#include "updater/default-task.h"

#include <sys/stat.h>

#include "db/task-db.h"
#include "filter/file-filter.h"
#include "updater/updater-fixture.h"

namespace fs = std::filesystem;

namespace {

constexpr char BOTH[] = "ferrix=\"yes\"\nsdferrix=\"yes\"\n";

class NewInstallTest : public UpdaterTest {
protected:
    // The task of a default device; the test fails when there is none.
    TaskInfo Task(const std::string& uuid, USBInfo& usb) const {
        TaskDB db;
        EXPECT_EQ(0, db.Init(m_task_db));
        EXPECT_EQ(1, db.GetUSBInfoByUUID(uuid, usb)) << uuid;
        std::list<TaskInfo> tasks;
        EXPECT_EQ(0, db.ListTaskInfoByUSB(usb.id, tasks));
        EXPECT_EQ(1U, tasks.size());
        return tasks.empty() ? TaskInfo() : tasks.front();
    }
    TaskInfo Task(const std::string& uuid) const {
        USBInfo usb;
        return Task(uuid, usb);
    }
};

TEST_F(NewInstallTest, AModelWithoutFrontPortsGetsNoRows) {
    EXPECT_EQ(0, Run());
    SetCapabilities("ferrix=\"no\"\nsdferrix=\"YES\"\n");
    EXPECT_EQ(0, Run());
    EXPECT_EQ(2, m_log.Count("[WARN] UpdaterCore: new install"));
    EXPECT_EQ(2, m_log.Count("[DBG] Not support 'ferrix'"));
    EXPECT_EQ(2, m_log.Count("[DBG] Not support 'sdferrix'"));
    EXPECT_EQ(std::vector<std::string>{}, FilesIn(m_repository));
}

TEST_F(NewInstallTest, EachFrontPortGetsItsDeviceAndItsTask) {
    SetCapabilities(BOTH);
    ASSERT_EQ(0, Run());
    USBInfo usb;
    const TaskInfo task = Task("FERRIX_DEFAULT_USB_UUID", usb);
    const USBInfo wanted_usb{usb.id, "FERRIX_DEFAULT_USB_UUID", false,
                             true,   "FERRIX_DEFAULT_PRODUCER", "FERRIX_DEFAULT_PRODUCT"};
    EXPECT_EQ(wanted_usb, usb);
    TaskInfo wanted;
    wanted.id = task.id;
    wanted.usb_id = usb.id;
    wanted.schedule_id = -1;
    wanted.is_enable = false;
    wanted.task_name = "Default Ferrix";
    wanted.task_type = 1;
    wanted.usb_folder_path = "/";
    wanted.copy_strategy = 1;
    wanted.keep_dir_structure = true;
    wanted.conflict_policy = 1;
    wanted.max_version_count = 256;
    wanted.rotation_policy = 1;
    EXPECT_EQ(wanted, task);
    EXPECT_EQ("Default SDFerrix", Task("FERRIX_DEFAULT_SD_UUID").task_name);
    EXPECT_EQ("2", Read("SELECT value FROM config_table WHERE key = 'version';"));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
}

TEST_F(NewInstallTest, OnlyTheKindThatTheModelHasIsPrepared) {
    SetCapabilities("sdferrix=\"yes\"\n");
    ASSERT_EQ(0, Run());
    EXPECT_EQ("FERRIX_DEFAULT_SD_UUID", Read("SELECT uuid FROM usb_info_table;"));
}

TEST_F(NewInstallTest, ATaskFolderHoldsTheThreeFilesOfItsFilter) {
    SetCapabilities("ferrix=\"yes\"\n");
    const mode_t saved = umask(0);
    ASSERT_EQ(0, Run());
    umask(saved);
    const std::string folder = InRepository("task/1");
    EXPECT_EQ("{\"user_defined_extensions\":[],\"user_defined_names\":[]}\n",
              ReadWholeFile(folder + "/user.config"));
    FileFilter::Strings names;
    FileFilter::Strings extensions;
    ASSERT_EQ(0, FileFilter::ReadBlackList(folder + "/blacklist.filter", names, extensions));
    EXPECT_EQ(FileFilter::Strings{".KeldoranFerrix.config"}, names);
    EXPECT_EQ(FileFilter::Strings{}, extensions);
    ASSERT_EQ(0, FileFilter::ReadWhiteList(folder + "/whitelist.filter", names, extensions));
    EXPECT_EQ(FileFilter::Strings{"*"}, names);
    EXPECT_EQ(FileFilter::Strings{"*"}, extensions);
    for (const auto& entry : fs::recursive_directory_iterator(folder)) {
        EXPECT_EQ(fs::perms::none, entry.status().permissions() & fs::perms::others_write);
    }
    EXPECT_EQ(fs::perms(0755), fs::status(folder).permissions());
    EXPECT_EQ(fs::perms(0600), fs::status(m_task_db).permissions());
}

struct FolderCase {
    const char* value;
    const char* share;
    const char* folder;
    bool is_enable;
};

TEST_F(NewInstallTest, TheOldCopyFolderLivesOn) {
    const FolderCase cases[] = {
        {"photos/in",        "photos",         "/in",     true },
        {"photos/in/box",    "photos",         "/in/box", true },
        {"photos",           "photos",         "/",       true },
        {"photos/",          "photos",         "/",       true },
        {"/photos//in/",     "photos",         "/in",     true },
        {"our 'photos' %/x", "our 'photos' %", "/x",      true },
        {"",                 "",               "",        false},
        {"///",              "",               "",        false},
    };
    for (const FolderCase& each : cases) {
        fs::remove_all(m_repository);
        fs::create_directories(m_repository + "/db");
        SetCapabilities(BOTH);
        SetSettings("before=\"1\"\nferrixfolder=\"" + std::string(each.value) +
                    "\"\nafter=\"2\"\n");
        ASSERT_EQ(0, Run()) << each.value;
        const TaskInfo task = Task("FERRIX_DEFAULT_USB_UUID");
        EXPECT_EQ(each.share, task.hub_share_name) << each.value;
        EXPECT_EQ(each.folder, task.hub_folder_path) << each.value;
        EXPECT_EQ(each.is_enable, task.is_enable) << each.value;
        EXPECT_FALSE(Task("FERRIX_DEFAULT_SD_UUID").is_enable);
        if (each.is_enable) {
            EXPECT_EQ("before=\"1\"\nafter=\"2\"\n", Settings());
        }
    }
}

TEST_F(NewInstallTest, EachKindHasAnOldKeyOfItsOwn) {
    SetCapabilities(BOTH);
    SetSettings("sdferrixfolder=\"cards/sd\"\nferrixfolder=\"sticks\"\n");
    ASSERT_EQ(0, Run());
    EXPECT_EQ("sticks", Task("FERRIX_DEFAULT_USB_UUID").hub_share_name);
    EXPECT_EQ("cards", Task("FERRIX_DEFAULT_SD_UUID").hub_share_name);
    EXPECT_EQ("", Settings());
}

TEST_F(NewInstallTest, ALongOldFolderIsCut) {
    SetCapabilities("ferrix=\"yes\"\n");
    SetSettings("ferrixfolder=\"s/" + std::string(600, 'x') + "\"\n");
    ASSERT_EQ(0, Run());
    EXPECT_EQ("/" + std::string(489, 'x'), Task("FERRIX_DEFAULT_USB_UUID").hub_folder_path);
}

TEST_F(NewInstallTest, SettingsThatCannotBeReadStopIt) {
    SetCapabilities(BOTH);
    m_fake.FailCall("KLIBCFileGetKeyValue");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to get old copy folder for key 'ferrixfolder'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare Ferrix default task"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare default task at '" + m_repository + "'"));
}

TEST_F(NewInstallTest, CapabilitiesThatCannotBeReadAreNotAModelWithoutFrontPorts) {
    SetCapabilities(BOTH);
    SetSettings("ferrixfolder=\"photos/in\"\n");
    for (const int skip : {0, 1}) {
        m_fake.FailCall("KLIBCFileCheckKeyValue", KELDERR_SYSTEM, 1, skip);
        EXPECT_EQ(-1, Run());
        EXPECT_FALSE(fs::exists(m_task_db));
        EXPECT_EQ(std::vector<std::string>{}, Leftovers());
        EXPECT_EQ("ferrixfolder=\"photos/in\"\n", Settings());
    }
    EXPECT_EQ(1, m_log.Count("[ERR] Failed to prepare Ferrix default task"));
    EXPECT_EQ(1, m_log.Count("[ERR] Failed to prepare SDFerrix default task"));
    EXPECT_FALSE(m_log.Contains("Not support"));
    EXPECT_EQ(0, Run());
    EXPECT_EQ("photos", Task("FERRIX_DEFAULT_USB_UUID").hub_share_name);
    EXPECT_EQ("", Task("FERRIX_DEFAULT_SD_UUID").hub_share_name);
}

// Numbers start again where a repository has lost its task database and not its folders.
TEST_F(NewInstallTest, WhatATaskOfTheSameNumberHadCopiedIsForgotten) {
    SetCapabilities("ferrix=\"yes\"\n");
    for (const char* part : {"", "-wal", "-shm", "-journal"}) {
        m_dir.Write("v1/@Ferrix/task/1/file-db.sqlite" + std::string(part), "left");
    }
    m_dir.Write("v1/@Ferrix/task/1/version-marks", "left");
    m_dir.Write("v1/@Ferrix/task/2/file-db.sqlite", "of no task yet");
    ASSERT_EQ(0, Run());
    EXPECT_EQ((std::vector<std::string>{"blacklist.filter", "user.config", "version-marks",
                                        "whitelist.filter"}),
              FilesIn(InRepository("task/1")));
    EXPECT_EQ("left", ReadWholeFile(InRepository("task/1/version-marks")));
    EXPECT_TRUE(fs::exists(InRepository("task/2/file-db.sqlite")));
}

TEST_F(NewInstallTest, WhatCannotBeForgottenIsNotTakenOver) {
    SetCapabilities("ferrix=\"yes\"\n");
    m_dir.MakeDir("v1/@Ferrix/task/1/file-db.sqlite");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare task config '1'"));
    EXPECT_FALSE(fs::exists(m_task_db));
}

TEST_F(NewInstallTest, AFailureLeavesNoDatabaseAndTheNextRunDoesAll) {
    SetCapabilities(BOTH);
    SetSettings("ferrixfolder=\"photos/in\"\nsdferrixfolder=\"cards\"\n");
    m_fake.FailCall("KLIBCFileGetKeyValue", KELDERR_SYSTEM, 1, 1);
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare SDFerrix default task"));
    EXPECT_FALSE(fs::exists(m_task_db));
    EXPECT_EQ(std::vector<std::string>{}, Leftovers());
    EXPECT_EQ("ferrixfolder=\"photos/in\"\nsdferrixfolder=\"cards\"\n", Settings());
    EXPECT_EQ(0, Run());
    EXPECT_EQ("photos", Task("FERRIX_DEFAULT_USB_UUID").hub_share_name);
    EXPECT_EQ("cards", Task("FERRIX_DEFAULT_SD_UUID").hub_share_name);
    EXPECT_EQ("", Settings());
}

TEST_F(NewInstallTest, ADatabaseThatCannotBeMadeIsTold) {
    SetCapabilities("ferrix=\"yes\"\n");
    fs::remove_all(InRepository("db"));
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to init task db at '" + m_task_db + ".new'"));
}

TEST_F(NewInstallTest, ATaskFolderThatCannotBeMadeIsTold) {
    SetCapabilities("ferrix=\"yes\"\n");
    fs::remove_all(InRepository("task"));
    m_dir.Write("v1/@Ferrix/task", "in the way");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create task folder '" + InRepository("task/1") + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare task config '1'"));
    EXPECT_TRUE(m_log.Has("[ERR] Faile to set default Ferrix task info"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to prepare ferrix default task 'Default Ferrix'"));
    EXPECT_FALSE(fs::exists(m_task_db));
    SetSettings("ferrixfolder=\"photos\"\n");
    EXPECT_EQ(-1, Run());
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to convert old ferrix config to default task 'Default Ferrix'"));
    EXPECT_EQ("ferrixfolder=\"photos\"\n", Settings());
}

TEST_F(NewInstallTest, FilesOfATaskThatCannotBeWrittenAreTold) {
    SetCapabilities("ferrix=\"yes\"\n");
    for (const auto& [file, text] : {
             std::pair{"user.config",      "Failed to open file '%'"       },
             std::pair{"blacklist.filter", "Failed to write black list '%'"},
             std::pair{"whitelist.filter", "Failed to write white list '%'"}
    }) {
        const std::string path = m_dir.MakeDir("v1/@Ferrix/task/1/" + std::string(file));
        EXPECT_EQ(-1, Run());
        std::string line = text;
        line.replace(line.find('%'), 1, path);
        EXPECT_TRUE(m_log.Has("[ERR] " + line));
        fs::remove_all(InRepository("task/1"));
    }
}

TEST_F(NewInstallTest, AJournalOfADatabaseThatIsGoneDoesNotMeetTheNewOne) {
    {
        RawDatabase open(m_dir / "open.db");
        open.Run(
            "PRAGMA journal_mode = WAL; CREATE TABLE config_table (key, value);"
            "INSERT INTO config_table VALUES ('version', 99);");
        fs::copy_file(m_dir / "open.db-wal", m_task_db + "-wal");
    }
    SetCapabilities("ferrix=\"yes\"\n");
    ASSERT_EQ(0, Run());
    EXPECT_EQ("2", Read("SELECT value FROM config_table WHERE key = 'version';"));
    EXPECT_EQ("FERRIX_DEFAULT_USB_UUID", Read("SELECT uuid FROM usb_info_table;"));
}

TEST_F(NewInstallTest, ADatabaseWithoutTablesCountsAsMissing) {
    SetCapabilities("ferrix=\"yes\"\n");
    m_dir.Write("v1/@Ferrix/db/task-db.sqlite", "");
    ASSERT_EQ(0, Run());
    EXPECT_TRUE(m_log.Has("[WARN] UpdaterCore: new install"));
    EXPECT_EQ("FERRIX_DEFAULT_USB_UUID", Read("SELECT uuid FROM usb_info_table;"));
}

TEST_F(NewInstallTest, ARepositoryInUseIsNotPreparedAgain) {
    SetCapabilities(BOTH);
    ASSERT_EQ(0, Run());
    RawDatabase(m_task_db).Run("PRAGMA recursive_triggers = ON; DELETE FROM usb_info_table;");
    m_log.Clear();
    EXPECT_EQ(0, Run());
    EXPECT_EQ("0", Read("SELECT COUNT(*) FROM usb_info_table;"));
    EXPECT_EQ(std::vector<std::string>{}, m_log.Lines());
}

}  // namespace
