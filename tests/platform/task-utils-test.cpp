#include "platform/task-utils.h"

#include <gtest/gtest.h>

#include "db/task-db.h"
#include "fake/fake-keld.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

// --- Kinds of tasks

TEST(TaskUtilsTest, OnlyAnExportIsAnExport) {
    for (int type = -1; type <= 4; ++type) EXPECT_EQ(type == 2, IsExportTask(type)) << type;
}

TEST(TaskUtilsTest, OnlyVersionTasksWithTheFlagNeedRotation) {
    for (int strategy = 0; strategy <= 4; ++strategy) {
        EXPECT_EQ(strategy == 1, NeedRotation(strategy, true)) << strategy;
        EXPECT_FALSE(NeedRotation(strategy, false)) << strategy;
    }
}

TEST(TaskUtilsTest, TwoUuidsStandForDefaultDevices) {
    EXPECT_TRUE(IsDefaultUUID("FERRIX_DEFAULT_USB_UUID"));
    EXPECT_TRUE(IsDefaultUUID("FERRIX_DEFAULT_SD_UUID"));
    for (const char* uuid : {"", "FERRIX_DEFAULT_USB_UUI", "FERRIX_DEFAULT_USB_UUID ",
                             "ferrix_default_sd_uuid", "1234-abcd"}) {
        EXPECT_FALSE(IsDefaultUUID(uuid)) << uuid;
    }
}

// --- Default tasks

class IsDefaultTaskTest : public testing::Test {
protected:
    IsDefaultTaskTest() { EXPECT_EQ(0, m_db.Init(m_dir / "task-db.sqlite")); }
    ~IsDefaultTaskTest() override { m_db.Close(); }

    uint64_t AddTask(const std::string& uuid) {
        USBInfo usb;
        usb.uuid = uuid;
        EXPECT_EQ(0, m_db.AddUSBInfo(usb, usb.id));
        TaskInfo task;
        task.usb_id = usb.id;
        EXPECT_EQ(0, m_db.AddTaskInfo(task, task.id));
        return task.id;
    }

    TempDir m_dir;
    TaskDB& m_db = TaskDB::GetInstance();
};

TEST_F(IsDefaultTaskTest, TaskOfADefaultDeviceIsOne) {
    AddTask("1234-abcd");
    EXPECT_TRUE(IsDefaultTask(AddTask("FERRIX_DEFAULT_USB_UUID")));
    EXPECT_TRUE(IsDefaultTask(AddTask("FERRIX_DEFAULT_SD_UUID")));
}

TEST_F(IsDefaultTaskTest, TaskOfAnotherDeviceIsNone) {
    const LogCapture log;
    EXPECT_FALSE(IsDefaultTask(AddTask("1234-abcd")));
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(IsDefaultTaskTest, InvalidIdIsNone) {
    const LogCapture log;
    EXPECT_FALSE(IsDefaultTask(0));
    EXPECT_EQ(std::vector<std::string>{"[ERR] Task id '0' is not valid"}, log.Lines());
}

TEST_F(IsDefaultTaskTest, UnknownTaskIsNone) {
    const LogCapture log;
    EXPECT_FALSE(IsDefaultTask(99));
    EXPECT_EQ(std::vector<std::string>{"[ERR] Failed to get task info for task '99'"}, log.Lines());
}

TEST_F(IsDefaultTaskTest, TaskWithoutItsDeviceIsNone) {
    TaskInfo task;
    task.usb_id = 77;
    ASSERT_EQ(0, m_db.AddTaskInfo(task, task.id));
    const LogCapture log;
    EXPECT_FALSE(IsDefaultTask(task.id));
    EXPECT_EQ(std::vector<std::string>{"[ERR] Failed to get usb info for usb id '77'"},
              log.Lines());
}

TEST_F(IsDefaultTaskTest, UnreadableDatabaseIsNone) {
    m_db.Close();
    const LogCapture log;
    EXPECT_FALSE(IsDefaultTask(1));
    EXPECT_TRUE(log.Has("[ERR] Failed to get task info for task '1'"));
}

// --- Paths

class TaskPathsTest : public testing::Test {
protected:
    TaskPathsTest() {
        FakeKeld::Reset().AddShare(
            {.name = "photos", .path = "/volume1/photos", .volume = "/volume1"});
    }

    static TaskInfo Task(int type, const std::string& hub_folder, const std::string& usb_folder) {
        TaskInfo task;
        task.task_type = type;
        task.hub_share_name = "photos";
        task.hub_folder_path = hub_folder;
        task.usb_folder_path = usb_folder;
        return task;
    }
};

TEST_F(TaskPathsTest, HubPathIsVolumeShareAndFolder) {
    const LogCapture log;
    std::string path;
    EXPECT_EQ(0, GetHubDirFullPath("photos", "/2024/a b", path));
    EXPECT_EQ("/volume1/photos/2024/a b", path);
    EXPECT_TRUE(log.Has("[DBG] hub_volume_path = /volume1, hub_share_name = photos"));
}

TEST_F(TaskPathsTest, RootFolderAddsNothing) {
    std::string path;
    EXPECT_EQ(0, GetHubDirFullPath("photos", "/", path));
    EXPECT_EQ("/volume1/photos", path);
    GetUSBDirFullPath("/volumeUSB1/usbshare", "/", path);
    EXPECT_EQ("/volumeUSB1/usbshare", path);
    EXPECT_EQ("/photos", GetHubDisplayPath(Task(1, "/", "/")));
}

TEST_F(TaskPathsTest, DevicePathIsTheDevicesShareAndTheFolder) {
    std::string path = "old";
    GetUSBDirFullPath("/volumeUSB1/usbshare", "/DCIM", path);
    EXPECT_EQ("/volumeUSB1/usbshare/DCIM", path);
}

TEST_F(TaskPathsTest, UnknownShareIsAFailure) {
    const LogCapture log;
    std::string path = "as it was";
    EXPECT_EQ(-1, GetHubDirFullPath("go%sne", "/", path));
    EXPECT_EQ("as it was", path);
    EXPECT_TRUE(log.Has("[ERR] Failed to open hub_share_name 'go%sne'"));
}

TEST_F(TaskPathsTest, ShareWhoseVolumeIsUnknownIsAFailure) {
    FakeKeld::Get().FailCall("VolumePathParseEx");
    const LogCapture log;
    std::string path = "as it was";
    EXPECT_EQ(-1, GetHubDirFullPath("photos", "/", path));
    EXPECT_EQ("as it was", path) << "never a path in the root file system";
    EXPECT_TRUE(log.Has("[ERR] Failed to open hub_share_name 'photos'"));
}

TEST_F(TaskPathsTest, ImportsReadFromTheDeviceAndExportsWriteToIt) {
    for (const int type : {0, 1, 2, 3, 4}) {
        const TaskInfo task = Task(type, "/2024", "/DCIM");
        std::string source;
        std::string destination;
        ASSERT_EQ(0, GetTaskFullPaths("/usb", task, source, destination)) << type;
        EXPECT_EQ(type == 2 ? "/volume1/photos/2024" : "/usb/DCIM", source) << type;
        EXPECT_EQ(type == 2 ? "/usb/DCIM" : "/volume1/photos/2024", destination) << type;
        GetTaskDisplayPaths(task, source, destination);
        EXPECT_EQ(type == 2 ? "/photos/2024" : "/DCIM", source) << type;
        EXPECT_EQ(type == 2 ? "/DCIM" : "/photos/2024", destination) << type;
    }
}

TEST_F(TaskPathsTest, DisplayPathOfTheDevicesRootIsASlash) {
    std::string source;
    std::string destination;
    GetTaskDisplayPaths(Task(1, "/", "/"), source, destination);
    EXPECT_EQ("/", source);
    EXPECT_EQ("/photos", destination);
}

TEST_F(TaskPathsTest, DeletedShareFailsAndLeavesBothOutsUnchanged) {
    FakeKeld::Get().RemoveShare("photos");
    for (const int type : {1, 2}) {
        std::string source = "s";
        std::string destination = "d";
        EXPECT_EQ(-1, GetTaskFullPaths("/usb", Task(type, "/", "/"), source, destination));
        EXPECT_EQ("s", source);
        EXPECT_EQ("d", destination);
    }
}

TEST_F(TaskPathsTest, NamesPassByteForByte) {
    const std::string name = "a\nb'\"%s\xff";
    FakeKeld::Get().AddShare({.name = name, .path = "/volume1/" + name, .volume = "/volume1"});
    std::string path;
    EXPECT_EQ(0, GetHubDirFullPath(name, "/" + name, path));
    EXPECT_EQ("/volume1/" + name + "/" + name, path);
}

}  // namespace
