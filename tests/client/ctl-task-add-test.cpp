// "ferrixctl task add", from the command line to what the daemon is asked.
#include "client/ctl-fixture.h"
#include "db/task-info.h"
#include "utils/file-op.h"

using testing::HasSubstr;

namespace {

class CtlTaskAddTest : public CtlTest {
protected:
    int Add(const std::string& options) { return Run("task add " + options); }
    // The request of a task that is added.
    PObject Added(const std::string& options) {
        TaskDaemon daemon(m_socket, {});
        EXPECT_EQ(EXIT_DONE, Add(options)) << m_errors;
        return daemon.Request();
    }
    // As the daemon does it: a destination has to be there, and then what `later` says.
    TaskDaemon::Refuse RefuseMissing(TaskDaemon::Refused later = {}) {
        return [this, later](const PObject& request) -> TaskDaemon::Refused {
            if (!FSExists(m_share + request["hub_folder_path"].AsString())) {
                return {10, "Import destination path does not exist."};
            }
            return later;
        };
    }
};

PObject TaskTo(const std::string& destination) {
    PObject task;
    task["id"] = 3;
    task["type"] = int{TASK_TYPE_IMPORT_GENERAL};
    task["task_name"] = "Camera";
    task["destination_path"] = destination;
    return task;
}

}  // namespace

TEST_F(CtlTaskAddTest, WhoNamesARotationGetsOne) {
    const PObject rotated = Added("--to photos --strategy version --rotation oldest");
    EXPECT_TRUE(rotated["enable_rotation"].AsBool());
    EXPECT_EQ(256U, rotated["max_version_count"].AsUInt64());
    EXPECT_EQ(int{ROTATION_POLICY_OLDEST}, rotated["rotation_policy"].AsInt32());
    const PObject counted = Added("--to photos --strategy version --rotation smart --versions 5");
    EXPECT_EQ(5U, counted["max_version_count"].AsUInt64());
    EXPECT_FALSE(Added("--to photos --strategy version")["enable_rotation"].AsBool());
}

TEST_F(CtlTaskAddTest, OptionsThatWouldDoNothingAreRefused) {
    TaskDaemon daemon(m_socket, {});
    for (const char* options :
         {"--strategy version --rename", "--strategy version --all-versions --rotation smart",
          "--strategy mirror --conflict rename", "--strategy mirror --versions 3", "--versions 3",
          "--rotation oldest", "--days mon", "--export --from photos --make-folder"}) {
        EXPECT_EQ(EXIT_USAGE, Add("--to photos " + std::string(options))) << options;
    }
    EXPECT_TRUE(daemon.Requests().empty());
}

TEST_F(CtlTaskAddTest, TheSourceIsAFolderOfTheDevice) {
    m_dir.MakeDir("usb/DCIM/100");
    for (const std::string& from : {std::string("DCIM/100"), std::string("/DCIM/100/"),
                                    m_stick + "/DCIM/100", m_stick + "//DCIM/./100"}) {
        EXPECT_EQ("/DCIM/100", Added("--to photos --from " + from)["usb_folder_path"].AsString());
    }
    EXPECT_EQ("/", Added("--to photos --from " + m_stick)["usb_folder_path"].AsString());
    EXPECT_EQ("/", Added("--to photos")["usb_folder_path"].AsString());
}

TEST_F(CtlTaskAddTest, ASourceThatIsNotThereIsRefused) {
    m_dir.Write("usb/file", "no folder");
    TaskDaemon daemon(m_socket, {});
    for (const std::string& from :
         {std::string("DCIM"), m_stick + "/DCIM", std::string("/file"), m_dir / "elsewhere"}) {
        EXPECT_EQ(EXIT_REFUSED, Add("--to photos --from " + from)) << from;
        EXPECT_THAT(m_errors, HasSubstr("has no folder")) << from;
        EXPECT_THAT(m_errors, HasSubstr("--from")) << from;
    }
    EXPECT_TRUE(daemon.Requests().empty());
}

TEST_F(CtlTaskAddTest, TheDestinationOfAnExportNeedNotBeThereYet) {
    for (const std::string& to :
         {std::string("backup/new"), std::string("/backup/new"), m_stick + "/backup/new"}) {
        const PObject request = Added("--export --from photos --to " + to);
        EXPECT_EQ("/backup/new", request["usb_folder_path"].AsString()) << to;
        EXPECT_EQ("photos", request["hub_share_name"].AsString());
    }
}

TEST_F(CtlTaskAddTest, AMissingFolderIsMade) {
    TaskDaemon daemon(m_socket, {}, RefuseMissing());
    EXPECT_EQ(EXIT_REFUSED, Add("--to photos/in/2026"));
    EXPECT_THAT(m_errors, HasSubstr("--make-folder"));
    EXPECT_EQ(EXIT_DONE, Add("--to photos/in/2026 --make-folder")) << m_errors;
    EXPECT_EQ("7\n", m_output);
    EXPECT_TRUE(FSExists(m_share + "/in/2026"));
    const size_t asked = daemon.Requests().size();
    EXPECT_EQ(EXIT_DONE, Add("--to photos/in/2026 --make-folder")) << m_errors;
    EXPECT_EQ(asked + 1, daemon.Requests().size()) << "it is there";
}

TEST_F(CtlTaskAddTest, WithoutTheDaemonNoFolderIsMade) {
    EXPECT_EQ(EXIT_NOT_REACHABLE, Add("--to photos/in --make-folder"));
    EXPECT_FALSE(FSExists(m_share + "/in"));
}

TEST_F(CtlTaskAddTest, ForATaskThatIsRefusedNoFolderStays) {
    m_dir.MakeDir("volume1/photos/old");
    {
        const TaskDaemon daemon(m_socket, {TaskTo("/photos/old")},
                                [](const PObject&) -> TaskDaemon::Refused {
                                    return {3, "USB info has already existed"};
                                });
        EXPECT_EQ(EXIT_REFUSED, Add("--to photos/in --make-folder"));
        EXPECT_FALSE(FSExists(m_share + "/in"));
    }
    TaskDaemon daemon(m_socket, {TaskTo("/photos/old")},
                      RefuseMissing({9, "Duplicated destination path"}));
    EXPECT_EQ(EXIT_REFUSED, Add("--to photos/old/in/2026 --make-folder"));
    EXPECT_THAT(m_errors, HasSubstr("Duplicated destination path"));
    EXPECT_EQ(2U, daemon.Requests().size());
    EXPECT_FALSE(FSExists(m_share + "/old/in"));
    EXPECT_TRUE(FSExists(m_share + "/old")) << "it was there before";
}

TEST_F(CtlTaskAddTest, TheFolderOfATaskThatStandsAllTheSameStays) {
    const TaskDaemon daemon(m_socket, {TaskTo("/photos/in")},
                            RefuseMissing({11, "Failed to CreateSchedule"}));
    EXPECT_EQ(EXIT_REFUSED, Add("--to photos/in --make-folder"));
    EXPECT_THAT(m_errors, HasSubstr("Failed to CreateSchedule"));
    EXPECT_TRUE(FSExists(m_share + "/in"));
}

TEST_F(CtlTaskAddTest, AShareThatIsNotThereIsCalledSo) {
    const TaskDaemon daemon(m_socket, {}, [](const PObject&) -> TaskDaemon::Refused {
        return {11, "Failed to resolve import destination path."};
    });
    EXPECT_EQ(EXIT_REFUSED, Add("--to nosuch/inbox --make-folder"));
    EXPECT_THAT(m_errors, HasSubstr("there is no such share"));
    EXPECT_THAT(m_errors, HasSubstr("ferrixctl share list"));
}

TEST_F(CtlTaskAddTest, AFolderThatCannotBeMadeIsCalledSo) {
    const TaskDaemon daemon(m_socket, {}, RefuseMissing());
    m_dir.Write("volume1/photos/file", "in the way");
    EXPECT_EQ(EXIT_REFUSED, Add("--to photos/file/in --make-folder"));
    EXPECT_THAT(m_errors, HasSubstr("could not be made"));
    FakeKeld::Get().LockShare("photos");
    EXPECT_EQ(EXIT_REFUSED, Add("--to photos/in --make-folder"));
    EXPECT_THAT(m_errors, HasSubstr("unlock it first"));
    EXPECT_FALSE(FSExists(m_share + "/in"));
}
