// Runs ferrixctl, from the command line to what is shown, against a daemon that the test scripts.
#pragma once

#include <gmock/gmock.h>

#include <functional>
#include <iterator>
#include <mutex>
#include <sstream>
#include <string>
#include <vector>

#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/fake-box-admin.h"
#include "client/scripted-daemon.h"
#include "fake/fake-keld.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

// A daemon with these tasks, which keeps what it was asked.
class TaskDaemon {
public:
    struct Refused {
        int code = 0;  // 0: not refused
        std::string text;
    };
    // Called on the daemon's thread for all but "list_task".
    using Refuse = std::function<Refused(const PObject& request)>;

    TaskDaemon(const std::string& path, PObject::array_type tasks, Refuse refuse = {})
        : m_tasks(std::move(tasks)),
          m_refuse(std::move(refuse)),
          m_daemon(path, [this](const PObject& request) { return Answer(request); }) {}

    // All that was asked but "list_task", in its order.
    [[nodiscard]] std::vector<PObject> Requests() {
        const std::lock_guard lock(m_mutex);
        return m_requests;
    }
    // The only one; fails the running test when there is another number of them.
    [[nodiscard]] PObject Request() {
        const std::vector<PObject> requests = Requests();
        EXPECT_EQ(1U, requests.size());
        return requests.empty() ? PObject() : requests.back();
    }

private:
    PObject Answer(const PObject& request) {
        PObject answer;
        answer["ack"] = "ok";
        if (request["action"].AsString() == "list_task") {
            answer["task_list"] = m_tasks;
            return answer;
        }
        {
            const std::lock_guard lock(m_mutex);
            m_requests.push_back(request);
        }
        const Refused refused = m_refuse ? m_refuse(request) : Refused();
        if (refused.code == 0) {
            answer["task_id"] = 7;
        } else {
            answer["error_code"] = refused.code;
            answer["error"] = refused.text;
        }
        return answer;
    }

    PObject::array_type m_tasks;
    Refuse m_refuse;
    std::mutex m_mutex;
    std::vector<PObject> m_requests;
    ScriptedDaemon m_daemon;  // last: it ends first
};

// A box with the share "photos" and one plugged-in stick.
class CtlTest : public testing::Test {
protected:
    CtlTest() {
        FakeBoxAdmin::Reset();
        FakeKeld& fake = FakeKeld::Reset();
        fake.AddShare({.name = "photos", .path = m_share});
        m_dir.Write("usb/@eaDir/.KeldoranFerrix.config", "uuid=\"stick-01\"\n");
        fake.AddDevice({.mount_path = m_stick,
                        .dev_path = m_dir.Write("image", std::string(1 << 16, '\0')),
                        .disk = "sdzz"});
    }
    ~CtlTest() override { FakeBoxAdmin::Reset(); }

    // The exit status of "ferrixctl" with these words, which blanks part; what was shown is in
    // m_output and m_errors.
    int Run(const std::string& line) {
        const LogCapture log;
        const Ctl ctl{DaemonClient(m_socket), Terminal(-1)};
        const auto program = MakeCtlProgram(ctl);
        std::istringstream stream("ferrixctl " + line);
        const std::vector<std::string> words{std::istream_iterator<std::string>(stream), {}};
        std::vector<const char*> arguments;
        for (const std::string& word : words) arguments.push_back(word.c_str());
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int status =
            RunProgram(*program, static_cast<int>(arguments.size()), arguments.data());
        m_output = testing::internal::GetCapturedStdout();
        m_errors = testing::internal::GetCapturedStderr();
        return status;
    }

    TempDir m_dir;
    std::string m_share = m_dir.MakeDir("volume1/photos");
    std::string m_stick = m_dir.MakeDir("usb");
    std::string m_socket = m_dir / "socket";
    std::string m_output;
    std::string m_errors;
};
