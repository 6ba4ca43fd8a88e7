// The commands below "ferrixctl share", from the command line to what is shown.
#include <gmock/gmock.h>
#include <json/value.h>

#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/fake-box-admin.h"
#include "client/scripted-daemon.h"
#include "db/task-info.h"
#include "fake/fake-keld.h"
#include "platform/json-util.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

using testing::HasSubstr;

namespace {

class CtlShareTest : public testing::Test {
protected:
    CtlShareTest() {
        FakeBoxAdmin::Reset();
        FakeKeld& fake = FakeKeld::Reset();
        FakeShare photos{.name = "photos", .path = m_dir.MakeDir("volume1/photos")};
        photos.recycle_bin = photos.recycle_bin_admin_only = true;
        FakeShare vault{.name = HOSTILE, .path = m_dir.MakeDir(std::string("volume1/") + HOSTILE)};
        vault.recycle_bin = vault.locked = vault.lockable = true;
        fake.AddShare(photos);
        fake.AddShare(vault);
        fake.AddShare({.name = "gone", .path = m_dir / "volume1/gone"});
        fake.AddDevice({.mount_path = m_dir.MakeDir("usb"), .dev_path = "/dev/sdb1"});
    }
    ~CtlShareTest() override { FakeBoxAdmin::Reset(); }

    // A daemon with one task, on the share "photos".
    static std::optional<PObject> Answer(const PObject& request) {
        PObject answer;
        answer["ack"] = "ok";
        if (request["action"].AsString() != "list_task") return answer;
        PObject task;
        task["id"] = 3;
        task["type"] = int{TASK_TYPE_EXPORT_GENERAL};
        task["task_name"] = "Camera";
        task["source_path"] = "/photos/out";
        task["destination_path"] = "/";
        answer["task_list"] = PObject::array_type{task};
        return answer;
    }

    // The exit status; what was shown is in m_output and m_errors.
    int Run(std::vector<const char*> arguments) {
        const LogCapture log;
        const Ctl ctl{DaemonClient(m_socket), Terminal(-1)};
        CLI::App program("", "ferrixctl");
        AddShareCommands(program, ctl);
        arguments.insert(arguments.begin(), {"ferrixctl", "share"});
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int status =
            RunProgram(program, static_cast<int>(arguments.size()), arguments.data());
        m_output = testing::internal::GetCapturedStdout();
        m_errors = testing::internal::GetCapturedStderr();
        return status;
    }
    // The object of one share in the listing.
    Json::Value Listed(const std::string& name) {
        EXPECT_EQ(EXIT_DONE, Run({"list", "--json"})) << m_errors;
        Json::Value list;
        EXPECT_EQ(0, ParseJson(m_output, list)) << m_output;
        for (const Json::Value& share : list) {
            if (share["name"].asString() == name) return share;
        }
        return {};
    }

    static constexpr const char* HOSTILE = "vault\033[2J";

    TempDir m_dir;
    std::string m_socket = m_dir / "socket";
    std::string m_output;
    std::string m_errors;
};

}  // namespace

TEST_F(CtlShareTest, EveryShareIsListedWithItsTasks) {
    const ScriptedDaemon daemon(m_socket, Answer);
    ASSERT_EQ(EXIT_DONE, Run({"list"})) << m_errors;
    EXPECT_THAT(m_output, testing::ContainsRegex("photos +/.*/volume1/photos +/.*/volume1 +mounted "
                                                 "+administrators +3 Camera\n"));
    EXPECT_THAT(m_output,
                testing::ContainsRegex("gone +/.*/gone +/.*/volume1 +missing +no +none\n"));
    EXPECT_THAT(m_output, testing::ContainsRegex("vault.x1b.2J +/.* +locked +yes +none\n"));
    EXPECT_THAT(m_output, testing::Not(HasSubstr("usb"))) << "a device is no share of the box";
    EXPECT_EQ("", m_errors);
}

TEST_F(CtlShareTest, TheListingAsJsonHoldsTheNamesAsTheyAre) {
    const ScriptedDaemon daemon(m_socket, Answer);
    const Json::Value photos = Listed("photos");
    EXPECT_EQ(m_dir / "volume1/photos", photos["path"].asString());
    EXPECT_EQ(m_dir / "volume1", photos["volume"].asString());
    EXPECT_EQ("mounted", photos["state"].asString());
    EXPECT_FALSE(photos["can_be_locked"].asBool());
    EXPECT_TRUE(photos["recycle_bin"].asBool());
    EXPECT_TRUE(photos["recycle_bin_admin_only"].asBool());
    ASSERT_EQ(1U, photos["task_ids"].size());
    EXPECT_EQ(3, photos["task_ids"][0].asInt());
    const Json::Value vault = Listed(HOSTILE);
    EXPECT_EQ("locked", vault["state"].asString());
    EXPECT_TRUE(vault["can_be_locked"].asBool());
    EXPECT_TRUE(vault["task_ids"].isArray() && vault["task_ids"].empty());
}

TEST_F(CtlShareTest, WithoutTheDaemonSharesAreListedAndTheirTasksAreNotKnown) {
    ASSERT_EQ(EXIT_DONE, Run({"list"})) << m_errors;
    EXPECT_THAT(m_output, testing::ContainsRegex("photos .* [?]\n"));
    EXPECT_THAT(m_output, HasSubstr("tasks are not known"));
    EXPECT_TRUE(Listed("photos")["task_ids"].isNull());
}

TEST_F(CtlShareTest, ABoxWithoutSharesSaysHowToMakeOne) {
    FakeKeld::Reset();
    ASSERT_EQ(EXIT_DONE, Run({"list"}));
    EXPECT_THAT(m_output, HasSubstr("share add --help"));
    ASSERT_EQ(EXIT_DONE, Run({"list", "--json"}));
    EXPECT_EQ("[]\n", m_output);
}

TEST_F(CtlShareTest, WhatCannotBeToldIsNotListed) {
    FakeBoxAdmin::Get().on_call = [](const std::string&) {
        throw CommandError(EXIT_REFUSED, "host.conf is broken");
    };
    EXPECT_EQ(EXIT_REFUSED, Run({"list"}));
    EXPECT_EQ("ferrixctl: host.conf is broken\n", m_errors);
    FakeBoxAdmin::Reset();
    FakeKeld::Get().FailCall("KELDShareDBEnumTypeMatched");
    EXPECT_EQ(EXIT_REFUSED, Run({"list", "--json"}));
    EXPECT_EQ("", m_output);
}

TEST_F(CtlShareTest, AddingWorksWithoutTheDaemon) {
    std::string asked;
    FakeBoxAdmin::Get().on_call = [&](const std::string& what) { asked = what; };
    ASSERT_EQ(EXIT_DONE, Run({"add", "films"})) << m_errors;
    EXPECT_EQ("add films", asked);
    EXPECT_EQ("The folder /volume1/films is a share now.\n", m_output);
}

TEST_F(CtlShareTest, RenamingAndRemovingGoThroughTheDaemon) {
    EXPECT_EQ(EXIT_NOT_REACHABLE, Run({"rename", "music", "noise"}));
    EXPECT_EQ(EXIT_NOT_REACHABLE, Run({"remove", "music"}));
    const ScriptedDaemon daemon(m_socket, Answer);
    EXPECT_EQ(EXIT_DONE, Run({"rename", "music", "noise"})) << m_errors;
    EXPECT_EQ("The share noise is the folder /volume1/noise.\n", m_output);
    EXPECT_EQ(EXIT_DONE, Run({"remove", "music"})) << m_errors;
    EXPECT_EQ("music is no share any more.\n", m_output);
    EXPECT_EQ(EXIT_REFUSED, Run({"remove", "photos"}));
    EXPECT_THAT(m_errors, HasSubstr("3 Camera"));
}

TEST_F(CtlShareTest, ACommandLineThatMakesNoSenseIsRefused) {
    EXPECT_EQ(EXIT_USAGE, Run({}));
    EXPECT_EQ(EXIT_USAGE, Run({"add"}));
    EXPECT_EQ(EXIT_USAGE, Run({"remove"}));
    EXPECT_EQ(EXIT_USAGE, Run({"rename", "photos"}));
    EXPECT_EQ(EXIT_USAGE, Run({"list", "photos"}));
    for (const char* command : {"list", "add", "remove", "rename"}) {
        EXPECT_EQ(EXIT_DONE, Run({command, "--help"}));
        EXPECT_THAT(m_output, HasSubstr("Example:\n"));
    }
}
